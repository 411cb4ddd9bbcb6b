#include "WTReportGenerator.h"

#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"
#include "KeyPath.h"
#include "SettingsKeys.h"
#include "TessalLogging.h"
#include "UserDefaults.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTItemContainer.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTReportFilters.h"
#include "WTReportLevelMarker.h"
#include "WTReportPeriod.h"
#include "WTTask.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QStandardPaths>

#include <algorithm>
#include <exception>

namespace {

// Collects the errors with the line the engine had reached, and logs them.
class ErrorCollector : public GXTemplateEngineDelegate {
 public:
  ErrorCollector(std::vector<WTReportTemplateError>& errors, bool logs) : errors_(errors), logs_(logs) {}
  bool observesBlocks() const override { return false; }
  void templateEngineEncounteredError(GXTemplateEngine* engine, const GXTemplateError& error, bool) override {
    if (logs_)
      qCWarning(lcReport, "%s",
                qPrintable(QStringLiteral("Template error: %1").arg(error.localizedDescription)));
    const QString& contents = engine->templateContents();
    const GXRange remaining = engine->remainingRange();
    const qsizetype reached = std::clamp<qsizetype>(qsizetype(remaining.location), 0, contents.size());
    const int line = contents.isEmpty() ? 0 : int(QStringView(contents).left(reached).count(u'\n')) + 1;
    errors_.push_back({int(error.code), error.localizedDescription, line});
  }

 private:
  std::vector<WTReportTemplateError>& errors_;
  bool logs_;
};

}  // namespace

// The report's client as the template reads it: an address that is blank is none, so the head's
// `{% if client.address %}` holds only for a client with an address (a template takes any text, even an
// empty one, for true). Every other key is the client's own.
class WTReportGenerator::ClientVariable final : public KeyValueCoding {
 public:
  explicit ClientVariable(const KeyValueCoding* client) : client_(client) {}
  QVariant valueForKey(const QString& key) const override {
    QVariant value = client_->valueForKey(key);
    if (key == QLatin1String("address") && value.toString().trimmed().isEmpty()) return {};
    return value;
  }

 private:
  const KeyValueCoding* client_;
};

WTReportGenerator::WTReportGenerator() = default;

WTReportGenerator::WTReportGenerator(QList<WTProject*> projects, int mode)
    : projects_(std::move(projects)), mode_(mode) {}

WTReportGenerator::~WTReportGenerator() = default;

void WTReportGenerator::setPeriod(const std::optional<RZDate::Range>& period) {
  period_ = period;
  periodViews_.reset();
}

WTReportPeriod& WTReportGenerator::periodViews() const {
  if (!periodViews_) periodViews_ = std::make_unique<WTReportPeriod>(*period_);
  return *periodViews_;
}

QVariantMap WTReportGenerator::variables() const {
  WTClient* client = nullptr;  // any one project's
  for (WTProject* project : projects_) {
    if (project->client()) client = project->client();
  }
  QVariantList projects;
  const KeyValueCoding* clientRecord = client;
  if (period_) {
    periodViews_.reset();  // the records may have changed since the last render
    WTReportPeriod& views = periodViews();
    for (WTProject* project : projects_) {
      if (const KeyValueCoding* view = views.viewOfProject(project))
        projects.append(KeyPath::variantFromObject(view));
    }
    clientRecord = views.viewOfClient(client);
  } else {
    for (WTProject* project : projects_) projects.append(KeyPath::variantFromObject(project));
  }
  clientVariable_ = clientRecord ? std::make_unique<ClientVariable>(clientRecord) : nullptr;
  QVariantMap billing;
  const UserDefaults* defaults = projects_.isEmpty() || !projects_.first()->context()
                                     ? nullptr
                                     : projects_.first()->context()->userDefaults();
  for (const auto& [key, setting] : {std::pair{"name", SettingsKeys::kBillingName},
                                     {"address", SettingsKeys::kBillingAddress},
                                     {"taxNumber", SettingsKeys::kBillingTaxNumber},
                                     {"paymentTerms", SettingsKeys::kBillingPaymentTerms}}) {
    // None rather than an empty text, which a template's condition would take for a value.
    const QString text = defaults ? defaults->stringForKey(setting).trimmed() : QString();
    billing.insert(QLatin1String(key), text.isEmpty() ? QVariant() : QVariant(text));
  }
  // The client's, else the projects' (the preferences' without a client).
  const QVariant currency = client                ? QVariant(client->billingCurrency())
                            : projects_.isEmpty() ? QVariant()
                                                  : QVariant(projects_.first()->billingCurrency());
  return {{QStringLiteral("client"), KeyPath::variantFromObject(clientVariable_.get())},
          {QStringLiteral("projects"), projects},
          {QStringLiteral("mode"), mode_},
          {QStringLiteral("period"), period_ ? QVariant(periodViews_->variable()) : QVariant()},
          {QStringLiteral("billing"), billing},
          {QStringLiteral("currency"), currency}};
}

QVariant WTReportGenerator::filteredItemsForTask(WTTask* task, int mode) {
  if (!task || mode < 1 || mode > 3) return {};
  const QList<WTItem*> items =
      period_ ? periodViews().filtered(task->valuableItems()) : task->valuableItems();
  if (mode == 1) {
    QVariantList list;
    for (WTItem* item : items) list.append(KeyPath::variantFromObject(item));
    return list;
  }
  QVariantList list;
  for (auto& group : WTItemContainer::containersByKeyPath(
           mode == 2 ? QStringLiteral("startDate.midnight") : QStringLiteral("startDate.beginOfMonth"),
           items)) {
    list.append(KeyPath::variantFromObject(group.get()));
    groups_.push_back(std::move(group));
  }
  return list;
}

QString WTReportGenerator::userTemplatePath() {
  return QStandardPaths::writableLocation(QStandardPaths::GenericDataLocation) +
         QStringLiteral("/Tessal2/report.txt");
}

QString WTReportGenerator::builtInTemplatePath() {
  return QStringLiteral(":/report.txt");
}

QString WTReportGenerator::templatePath() {
  const QString user = userTemplatePath();
  return QFileInfo::exists(user) ? user : builtInTemplatePath();
}

Result<QString> WTReportGenerator::copyBuiltInTemplateToUserFolder() {
  const QString user = userTemplatePath();
  if (QFileInfo::exists(user)) return user;
  if (!QDir().mkpath(QFileInfo(user).absolutePath())) {
    return Error{1, QStringLiteral("%1: cannot create the folder").arg(QFileInfo(user).absolutePath())};
  }
  QFile builtIn(builtInTemplatePath());
  if (!builtIn.open(QIODevice::ReadOnly)) return Error{1, QStringLiteral("the built-in template is missing")};
  const QByteArray data = builtIn.readAll();
  // NewOnly: a file that appeared meanwhile is still never replaced.
  QFile out(user);
  if (!out.open(QIODevice::WriteOnly | QIODevice::NewOnly)) {
    if (QFileInfo::exists(user)) return user;
    return Error{1, QStringLiteral("%1: %2").arg(user, out.errorString())};
  }
  if (out.write(data) != data.size()) return Error{1, QStringLiteral("%1: %2").arg(user, out.errorString())};
  // The resource is read-only; the user's copy must be editable.
  out.setPermissions(QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ReadGroup |
                     QFileDevice::ReadOther);
  return user;
}

WTReport WTReportGenerator::render(const QString& path) {
  const QString chosen = path.isEmpty() ? templatePath() : path;
  return run(&chosen, nullptr);
}

WTReport WTReportGenerator::renderText(const QString& templateText) {
  return run(nullptr, &templateText);
}

WTReport WTReportGenerator::run(const QString* path, const QString* text) {
  groups_.clear();
  WTReport report;
  GXTemplateEngine engine;
  ErrorCollector collector(report.errors, logsErrors_);
  engine.setDelegate(&collector);
  engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
  loadReportFilters(engine);
  engine.loadMarker(std::make_shared<WTReportLevelMarker>(&engine, mode_));
  QString html;
  // Every task's totals are read again for its project's subtotal and the grand total.
  const WTTask::TotalsMemo totals;
  try {
    html = path ? engine.processTemplateInFileAtPath(*path, variables())
                : engine.processTemplate(*text, variables());
  } catch (const std::exception& exception) {
    // A pattern the regex library refuses stops the run; it is the template's error like any other.
    const QString message = QString::fromUtf8(exception.what());
    if (logsErrors_) qCWarning(lcReport, "%s", qPrintable(QStringLiteral("Template error: %1").arg(message)));
    report.errors.push_back({-1, message, 0});
    html = QLatin1String("");
  }
  report.templateRead = !html.isNull();
  report.html = html.isNull() ? QString() : html;
  return report;
}
