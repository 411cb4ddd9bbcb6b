#include "WTTemplateCommand.h"

#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"
#include "WTReportFilters.h"

#include <QFile>
#include <QFileInfo>

#include <nlohmann/json.hpp>

#include <exception>
#include <limits>
#include <optional>
#include <vector>

namespace {

const QString kCommand = QStringLiteral("tessal template");

class ErrorPrinter : public GXTemplateEngineDelegate {
 public:
  explicit ErrorPrinter(QTextStream& err) : err_(err) {}
  bool observesBlocks() const override { return false; }
  void templateEngineEncounteredError(GXTemplateEngine*, const GXTemplateError& error, bool) override {
    err_ << "error " << int(error.code) << ": " << error.localizedDescription << '\n';
    err_.flush();
    reported_ = true;
  }
  bool reported() const { return reported_; }

 private:
  QTextStream& err_;
  bool reported_ = false;
};

// Builds variants straight from the parser's events, so a number with a fraction keeps the digits it was
// written with (a Decimal from its text, never through a double).
class VariantBuilder : public nlohmann::json_sax<nlohmann::json> {
 public:
  bool null() override { return add(QVariant()); }
  bool boolean(bool value) override { return add(value); }
  bool number_integer(number_integer_t value) override { return add(qlonglong(value)); }
  bool number_unsigned(number_unsigned_t value) override {
    if (value <= number_unsigned_t(std::numeric_limits<qlonglong>::max())) return add(qlonglong(value));
    return add(QVariant::fromValue(Decimal::fromString(QString::number(value)).value_or(Decimal())));
  }
  bool number_float(number_float_t value, const string_t& text) override {
    if (std::optional<Decimal> decimal = Decimal::fromString(QString::fromStdString(text))) {
      return add(QVariant::fromValue(*decimal));
    }
    if (std::optional<Decimal> decimal = Decimal::fromDouble(value))
      return add(QVariant::fromValue(*decimal));
    return add(value);
  }
  bool string(string_t& value) override { return add(QString::fromStdString(value)); }
  bool binary(binary_t&) override { return false; }
  bool start_object(std::size_t) override {
    stack_.push_back(Container{true, {}, {}, {}});
    return true;
  }
  bool key(string_t& key) override {
    stack_.back().pendingKey = QString::fromStdString(key);
    return true;
  }
  bool end_object() override { return close(); }
  bool start_array(std::size_t) override {
    stack_.push_back(Container{false, {}, {}, {}});
    return true;
  }
  bool end_array() override { return close(); }
  bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception& error) override {
    message_ = QString::fromUtf8(error.what());
    return false;
  }

  const QVariant& root() const { return root_; }
  const QString& message() const { return message_; }

 private:
  struct Container {
    bool isObject;
    QVariantMap map;
    QVariantList list;
    QString pendingKey;
  };

  bool add(const QVariant& value) {
    if (stack_.empty()) {
      root_ = value;
    } else if (stack_.back().isObject) {
      // null is absent: the key is left out.
      if (value.isValid()) stack_.back().map.insert(stack_.back().pendingKey, value);
    } else {
      stack_.back().list.append(value);
    }
    return true;
  }

  bool close() {
    Container done = std::move(stack_.back());
    stack_.pop_back();
    return add(done.isObject ? QVariant(done.map) : QVariant(done.list));
  }

  std::vector<Container> stack_;
  QVariant root_;
  QString message_;
};

// The variables of a JSON file, or none with the reason in `error`.
std::optional<QVariantMap> readVariables(const QString& path, QString& error) {
  QFile file(path);
  if (!file.exists()) {
    error = QStringLiteral("%1: %2: no such file").arg(kCommand, path);
    return std::nullopt;
  }
  if (!file.open(QIODevice::ReadOnly)) {
    error = QStringLiteral("%1: %2: %3").arg(kCommand, path, file.errorString());
    return std::nullopt;
  }
  const QByteArray data = file.readAll();
  VariantBuilder builder;
  if (!nlohmann::json::sax_parse(data.constBegin(), data.constEnd(), &builder)) {
    error = QStringLiteral("%1: %2: bad JSON: %3").arg(kCommand, path, builder.message());
    return std::nullopt;
  }
  if (builder.root().typeId() != QMetaType::QVariantMap) {
    error = QStringLiteral("%1: %2: bad JSON: the variables must be one object").arg(kCommand, path);
    return std::nullopt;
  }
  return builder.root().toMap();
}

void printUsage(QTextStream& err) {
  err << "usage: tessal template TEMPLATE_FILE [--vars VARS.json]\n";
  err.flush();
}

}  // namespace

int runTemplateCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  QString templatePath;
  QString variablesPath;
  for (qsizetype i = 0; i < arguments.size(); ++i) {
    const QString& argument = arguments[i];
    if (argument == QLatin1String("--vars") && i + 1 < arguments.size() && variablesPath.isNull()) {
      variablesPath = arguments[++i];
    } else if (!argument.startsWith(QLatin1String("--")) && templatePath.isNull()) {
      templatePath = argument;
    } else {
      printUsage(err);
      return 2;
    }
  }
  if (templatePath.isEmpty()) {
    printUsage(err);
    return 2;
  }
  if (!QFileInfo::exists(templatePath)) {
    err << kCommand << ": " << templatePath << ": no such file\n";
    err.flush();
    return 2;
  }
  QVariantMap variables;
  if (!variablesPath.isNull()) {
    QString error;
    const std::optional<QVariantMap> read = readVariables(variablesPath, error);
    if (!read) {
      err << error << '\n';
      err.flush();
      return 2;
    }
    variables = *read;
  }

  GXTemplateEngine engine;
  ErrorPrinter printer(err);
  engine.setDelegate(&printer);
  engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
  loadReportFilters(engine);
  QString result;
  try {
    result = engine.processTemplateInFileAtPath(templatePath, variables);
  } catch (const std::exception& exception) {
    err << kCommand << ": " << templatePath << ": " << QString::fromUtf8(exception.what()) << '\n';
    err.flush();
    return 1;
  }
  if (result.isNull()) {
    err << kCommand << ": " << templatePath << ": could not be read as text\n";
    err.flush();
    return 1;
  }
  out << result;
  out.flush();
  return printer.reported() ? 1 : 0;
}
