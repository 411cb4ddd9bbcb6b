#include "WTReportWindowController.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTCSVExport.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTRangePopUpButton.h"
#include "WTReportDocumentBuilder.h"
#include "WTReportPDF.h"
#include "WTSaveLocation.h"
#include "WTTask.h"

#include <QButtonGroup>
#include <QDesktopServices>
#include <QEvent>
#include <QFileInfo>
#include <QFileSystemWatcher>
#include <QHBoxLayout>
#include <QLabel>
#include <QMessageBox>
#include <QPrintDialog>
#include <QPrinter>
#include <QPushButton>
#include <QScrollBar>
#include <QShortcut>
#include <QTextBrowser>
#include <QTextDocument>
#include <QToolButton>
#include <QUrl>
#include <QVBoxLayout>

#include <algorithm>
#include <utility>

WTReportWindowController::WTReportWindowController(WTObjectContext* context, QWidget* parent)
    : QWidget(parent, Qt::Window), context_(context), chooseSaveLocation_(askForSaveLocation) {
  setObjectName(QStringLiteral("reportWindow"));
  buildInterface();
  resize(860, 900);
  if (context) {
    // Records a report holds live as long as their context; the window must not outlive it.
    connect(context, &QObject::destroyed, this, [this] {
      projects_.clear();
      client_ = nullptr;
      close();
    });
    connect(context, &WTObjectContext::objectsDidChange, this, &WTReportWindowController::objectsDidChange);
    if (UserDefaults* defaults = context->userDefaults()) {
      // A new default rate, currency or rounding rule changes what is billed without changing a record,
      // so no save follows it; the user's details show in the report's head.
      connect(defaults, &UserDefaults::valueChanged, this, [this](const QString& key) {
        static const QLatin1StringView shown[] = {
            SettingsKeys::kDefaultRate,      SettingsKeys::kCurrency,
            SettingsKeys::kRoundingMinutes,  SettingsKeys::kRoundingMode,
            SettingsKeys::kBillingName,      SettingsKeys::kBillingAddress,
            SettingsKeys::kBillingTaxNumber, SettingsKeys::kBillingPaymentTerms};
        if (std::find(std::begin(shown), std::end(shown), key) != std::end(shown)) refreshWhenSeen();
      });
    }
    connect(context, &WTObjectContext::didSave, this, [this] {
      if (std::exchange(changedSinceRender_, false)) refreshWhenSeen();
    });
  }
}

WTReportWindowController::~WTReportWindowController() = default;

namespace {

// The report windows open, so that asking again for one of them brings it forward.
QList<QPointer<WTReportWindowController>>& openReports() {
  static QList<QPointer<WTReportWindowController>> windows;
  windows.removeAll(nullptr);
  return windows;
}

}  // namespace

WTReportWindowController* WTReportWindowController::showReport(WTObjectContext* context,
                                                               const QList<WTProject*>& projects) {
  return shown(
      context,
      [&](WTReportWindowController& window) { return !window.client_ && window.projects_ == projects; },
      [&](WTReportWindowController& window) { window.setProjects(projects); });
}

WTReportWindowController* WTReportWindowController::showReport(WTObjectContext* context, WTClient* client) {
  return shown(
      context, [&](WTReportWindowController& window) { return window.client_ == client; },
      [&](WTReportWindowController& window) { window.setClient(client); });
}

WTReportWindowController* WTReportWindowController::shown(
    WTObjectContext* context, const std::function<bool(WTReportWindowController&)>& reports,
    const std::function<void(WTReportWindowController&)>& subject) {
  for (WTReportWindowController* window : openReports()) {
    if (window->context_ != context || !reports(*window)) continue;
    window->raise();
    window->activateWindow();
    return window;
  }
  auto* window = new WTReportWindowController(context);
  window->setAttribute(Qt::WA_DeleteOnClose);
  window->show();
  subject(*window);
  openReports().append(window);
  return window;
}

void WTReportWindowController::buildInterface() {
  auto* layout = new QVBoxLayout(this);
  layout->setContentsMargins(0, 0, 0, 0);
  layout->setSpacing(0);

  auto* bar = new QWidget(this);
  bar->setObjectName(QStringLiteral("reportToolbar"));
  auto* barLayout = new QHBoxLayout(bar);
  barLayout->setContentsMargins(10, 8, 10, 8);
  barLayout->setSpacing(0);

  // Four buttons that touch and behave as one control: exactly one level of detail is chosen.
  segments_ = new QButtonGroup(this);
  segments_->setExclusive(true);
  const struct {
    const char* title;
    const char* tip;
  } levels[] = {
      {QT_TR_NOOP("Tasks"), QT_TR_NOOP("One line per task")},
      {QT_TR_NOOP("Items"), QT_TR_NOOP("Every item with a value")},
      {QT_TR_NOOP("Days"), QT_TR_NOOP("Items grouped by day")},
      {QT_TR_NOOP("Months"), QT_TR_NOOP("Items grouped by month")},
  };
  for (int mode = 0; mode < 4; ++mode) {
    auto* button = new QToolButton(bar);
    button->setObjectName(QStringLiteral("mode%1").arg(mode));
    button->setText(tr(levels[mode].title));
    button->setToolTip(tr(levels[mode].tip));
    button->setCheckable(true);
    button->setAutoRaise(false);
    button->setMinimumWidth(72);
    segments_->addButton(button, mode);
    barLayout->addWidget(button);
  }
  segments_->button(0)->setChecked(true);
  connect(segments_, &QButtonGroup::idClicked, this, [this] { refreshWebContent(); });
  barLayout->addSpacing(12);
  rangeButton_ = new WTRangePopUpButton(context_ ? context_->userDefaults() : nullptr, bar);
  rangeButton_->setToolTip(tr("The period the report covers"));
  rangeButton_->selectTag(WTRangePredicate::AnyDate);
  connect(rangeButton_, &WTRangePopUpButton::rangeChosen, this, [this] { refreshWebContent(); });
  barLayout->addWidget(rangeButton_);
  barLayout->addStretch(1);
  barLayout->setSpacing(6);

  auto addButton = [&](const QString& name, const QString& title, const QString& tip,
                       void (WTReportWindowController::*slot)()) {
    auto* button = new QPushButton(title, bar);
    button->setObjectName(name);
    button->setToolTip(tip);
    connect(button, &QPushButton::clicked, this, slot);
    barLayout->addWidget(button);
  };
  addButton(QStringLiteral("exportCSV"), tr("Export CSV…"), tr("Save the report's lines as a CSV file"),
            &WTReportWindowController::exportCSV);
  addButton(QStringLiteral("saveHTML"), tr("Save as HTML…"), tr("Save the report as a web page"),
            &WTReportWindowController::saveHTML);
  addButton(QStringLiteral("savePDF"), tr("Save as PDF…"), tr("Save the report as a PDF document"),
            &WTReportWindowController::savePDF);
  addButton(QStringLiteral("print"), tr("Print…"), tr("Print the report"), &WTReportWindowController::print);
  addButton(QStringLiteral("editTemplate"), tr("Edit Report Template…"),
            tr("Open your own copy of the report template in your text editor"),
            &WTReportWindowController::editReportTemplate);
  layout->addWidget(bar);

  errorBar_ = new QLabel(this);
  errorBar_->setObjectName(QStringLiteral("templateErrorBar"));
  errorBar_->setWordWrap(false);
  errorBar_->setTextInteractionFlags(Qt::TextSelectableByMouse);
  errorBar_->setContentsMargins(12, 6, 12, 6);
  errorBar_->setStyleSheet(
      QStringLiteral("QLabel { background: #fff4ce; color: #5c4400; "
                     "border-top: 1px solid #e6d28c; border-bottom: 1px solid #e6d28c; }"));
  errorBar_->hide();
  layout->addWidget(errorBar_);

  webView_ = new QTextBrowser(this);
  webView_->setObjectName(QStringLiteral("reportView"));
  webView_->setOpenExternalLinks(true);
  webView_->setFrameShape(QFrame::NoFrame);
  layout->addWidget(webView_, 1);
  documentBuilder_ = new WTReportDocumentBuilder(this);
  connect(documentBuilder_, &WTReportDocumentBuilder::documentReady, this,
          &WTReportWindowController::showDocument);

  setWindowTitle(tr("Report"));
  auto* closeShortcut = new QShortcut(QKeySequence::Close, this);
  connect(closeShortcut, &QShortcut::activated, this, &QWidget::close);
  auto* printShortcut = new QShortcut(QKeySequence::Print, this);
  connect(printShortcut, &QShortcut::activated, this, &WTReportWindowController::print);
}

QList<WTProject*> WTReportWindowController::projects() const {
  return liveProjects();
}

void WTReportWindowController::setProjects(const QList<WTProject*>& projects) {
  projects_ = projects;
  client_ = nullptr;
  refreshWebContent();
}

void WTReportWindowController::setClient(WTClient* client) {
  client_ = client;
  projects_.clear();
  refreshWebContent();
}

QList<WTProject*> WTReportWindowController::liveProjects() const {
  if (!context_) return {};
  // A record deleted while its report is open leaves the report (undo brings it back). Deleted records
  // stay in memory for undo, so the context's identity map says which ones still count.
  auto live = [this](WTObject* object) { return context_->objectWithUUID(object->uuid()) == object; };
  if (client_ && !live(client_)) return {};
  QList<WTProject*> projects;
  for (WTProject* project : client_ ? client_->projects() : projects_) {
    if (live(project)) projects.append(project);
  }
  return projects;
}

namespace {

// Reports longer than this (in characters of HTML; some 25 ms of reading) are read into their document on
// another thread.
constexpr qsizetype kReadAtOnce = 64 * 1024;

// Changes what `view` shows and puts the reader back where they were: a save while reading must not
// throw them back to the top.
template <class Change>
void keepingThePlace(QTextBrowser* view, Change change) {
  QScrollBar* vertical = view->verticalScrollBar();
  QScrollBar* horizontal = view->horizontalScrollBar();
  const int top = vertical->value();
  const int left = horizontal->value();
  change();
  vertical->setValue(top);
  horizontal->setValue(left);
}

const WTObject* ownerOf(const WTObject* object) {
  switch (object->entity()) {
    case WTEntity::Client:
      return nullptr;
    case WTEntity::Project:
      return static_cast<const WTProject*>(object)->client();
    case WTEntity::Task:
      return static_cast<const WTTask*>(object)->project();
    default:
      return static_cast<const WTItem*>(object)->task();
  }
}

}  // namespace

bool WTReportWindowController::concernsReport(const WTObject* object) const {
  // A change reaches the report through the owner chain: an item's task, a task's project. Moves and
  // deletions mark the old owner changed as well, so what leaves the report is seen through the owner it
  // left, and a project joining or leaving a client marks the client.
  const QList<WTProject*> projects = client_ ? client_->projects() : projects_;
  if (object->entity() == WTEntity::Client) {
    // A template may show a project's client; a client's other projects are none of the report's.
    return object == client_ ||
           std::any_of(projects.begin(), projects.end(),
                       [object](const WTProject* project) { return project->client() == object; });
  }
  for (const WTObject* level = object; level; level = ownerOf(level)) {
    if (level->entity() == WTEntity::Project) return projects.contains(level);
  }
  return false;
}

void WTReportWindowController::objectsDidChange(const QList<WTObject*>& inserted,
                                                const QList<WTObject*>& updated,
                                                const QList<WTObject*>& deleted) {
  if (changedSinceRender_) return;
  for (const QList<WTObject*>* list : {&updated, &inserted, &deleted}) {
    for (const WTObject* object : *list) {
      if (concernsReport(object)) {
        changedSinceRender_ = true;
        return;
      }
    }
  }
}

void WTReportWindowController::refreshWhenSeen() {
  if (isVisible() && !isMinimized()) {
    refreshWebContent();
  } else {
    renderWhenSeen_ = true;
  }
}

void WTReportWindowController::showEvent(QShowEvent* event) {
  QWidget::showEvent(event);
  if (std::exchange(renderWhenSeen_, false)) refreshWebContent();
}

void WTReportWindowController::changeEvent(QEvent* event) {
  QWidget::changeEvent(event);
  if (event->type() == QEvent::WindowStateChange && !isMinimized() && isVisible() &&
      std::exchange(renderWhenSeen_, false)) {
    refreshWebContent();
  }
}

std::optional<RZDate::Range> WTReportWindowController::period() const {
  return WTRangePredicate::boundsForTag(rangeButton_->selectedTag(), rangeButton_->customRangeBegin(),
                                        rangeButton_->customRangeEnd());
}

int WTReportWindowController::mode() const {
  return segments_->checkedId();
}

void WTReportWindowController::setMode(int mode) {
  if (QAbstractButton* button = segments_->button(mode)) {
    button->setChecked(true);
    refreshWebContent();
  }
}

QString WTReportWindowController::reportSubject() const {
  if (client_) return client_->name();
  const QList<WTProject*> projects = liveProjects();
  return projects.size() == 1 ? projects.constFirst()->name() : QString();
}

QString WTReportWindowController::windowTitleForProjects() const {
  const QString subject = reportSubject();
  return subject.isEmpty() ? tr("Report") : tr("Report — %1").arg(subject);
}

void WTReportWindowController::refreshWebContent() {
  if (!context_) return;
  renderWhenSeen_ = false;
  generator_.setProjects(liveProjects());
  generator_.setMode(mode());
  generator_.setPeriod(period());
  const WTReport report = generator_.render();
  html_ = report.html;
  showTemplateErrors(report);
  setWindowTitle(windowTitleForProjects());
  watchUserTemplate();
  emit reportRendered();

  if (html_.size() > kReadAtOnce) {
    documentBuilder_->build(html_, *webView_->document());
    return;
  }
  documentBuilder_->cancel();  // a long report still being read is older than this one
  keepingThePlace(webView_, [this] { webView_->setHtml(html_); });
  emit reportShown();
}

void WTReportWindowController::showDocument(QTextDocument* document) {
  keepingThePlace(webView_, [this, document] {
    const QPointer<QTextDocument> previous = webView_->document();
    document->setParent(webView_);
    webView_->setDocument(document);
    // The view deletes a replaced document only when it is the view's own child.
    if (previous && previous->parent() == webView_) delete previous.data();
  });
  emit reportShown();
}

bool WTReportWindowController::isBuildingDocument() const {
  return documentBuilder_->isBuilding();
}

void WTReportWindowController::showTemplateErrors(const WTReport& report) {
  // A report its template failed is not one to send: as `tessal report`, the window writes none.
  sendable_ = report.templateRead && report.errors.empty();
  for (const char* name : {"saveHTML", "savePDF", "print"})
    findChild<QPushButton*>(QLatin1String(name))->setEnabled(sendable_);
  if (!report.templateRead) {
    errorBar_->setText(
        tr("The report template could not be read: %1").arg(WTReportGenerator::templatePath()));
    errorBar_->show();
    return;
  }
  if (report.errors.empty()) {
    errorBar_->clear();
    errorBar_->hide();
    return;
  }
  const WTReportTemplateError& first = report.errors.front();
  QString text = first.line > 0 ? tr("Template error on line %1: %2").arg(first.line).arg(first.message)
                                : tr("Template error: %1").arg(first.message);
  if (report.errors.size() > 1)
    text += QLatin1Char(' ') + tr("(and %n more)", "", int(report.errors.size() - 1));
  text += QStringLiteral(" — ") + tr("saving and printing wait until it is mended");
  errorBar_->setText(text);
  errorBar_->setToolTip(WTReportGenerator::templatePath());
  errorBar_->show();
}

void WTReportWindowController::watchUserTemplate() {
  // Editors save by writing a new file over the old one, which ends a watch on the file itself; the
  // folder's watch sees the new file arrive and the file is watched again.
  const QString path = WTReportGenerator::userTemplatePath();
  const QString folder = QFileInfo(path).absolutePath();
  if (!templateWatcher_) {
    templateWatcher_ = new QFileSystemWatcher(this);
    auto changed = [this] { refreshWhenSeen(); };
    connect(templateWatcher_, &QFileSystemWatcher::fileChanged, this, changed);
    connect(templateWatcher_, &QFileSystemWatcher::directoryChanged, this, [this, path, changed] {
      if (QFileInfo::exists(path) && !templateWatcher_->files().contains(path)) changed();
    });
  }
  if (QFileInfo::exists(folder) && !templateWatcher_->directories().contains(folder)) {
    templateWatcher_->addPath(folder);
  }
  if (QFileInfo::exists(path) && !templateWatcher_->files().contains(path)) templateWatcher_->addPath(path);
}

Result<void> WTReportWindowController::exportCSVToFile(const QString& path) const {
  return WTCSVExport::writeTextAtomically(path, WTCSVExport::reportCSV(liveProjects(), mode(), period()));
}

Result<void> WTReportWindowController::saveHTMLToFile(const QString& path) const {
  return WTCSVExport::writeTextAtomically(path, html_);
}

std::unique_ptr<QTextDocument> WTReportWindowController::printableDocument() const {
  auto document = std::make_unique<QTextDocument>();
  document->setDefaultFont(webView_->document()->defaultFont());
  document->setDefaultStyleSheet(webView_->document()->defaultStyleSheet());
  document->setHtml(html_);
  document->setMetaInformation(QTextDocument::DocumentTitle, windowTitleForProjects());
  return document;
}

void WTReportWindowController::printToDevice(QPagedPaintDevice* device) const {
  // QTextDocument breaks an unpaginated document into the device's pages itself, never inside a line,
  // and numbers the pages at their foot.
  printableDocument()->print(device);
}

Result<void> WTReportWindowController::savePDFToFile(const QString& path) const {
  return WTReportPDF::write(*printableDocument(), windowTitleForProjects(), path);
}

void WTReportWindowController::saveWith(const QString& title, const QString& filter, const QString& suffix,
                                        Result<void> (WTReportWindowController::*write)(const QString&)
                                            const) {
  const QString path = chooseSaveLocation_(
      this,
      {title, filter, suffix,
       suggestedFileName(reportSubject().isEmpty() ? tr("Report") : reportSubject(), period(), suffix)});
  if (path.isEmpty()) return;
  // A running timer has moved on since the report was shown, unsaved: what is written is rendered now
  // (the view follows), unless its template broke meanwhile.
  refreshWebContent();
  if (!sendable_) return;
  const Result<void> written = (this->*write)(path);
  if (!written) QMessageBox::warning(this, title, written.error().message);
}

void WTReportWindowController::exportCSV() {
  saveWith(tr("Export CSV"), tr("CSV files (*.csv)"), QStringLiteral("csv"),
           &WTReportWindowController::exportCSVToFile);
}

void WTReportWindowController::saveHTML() {
  saveWith(tr("Save as HTML"), tr("Web pages (*.html *.htm)"), QStringLiteral("html"),
           &WTReportWindowController::saveHTMLToFile);
}

void WTReportWindowController::savePDF() {
  saveWith(tr("Save as PDF"), tr("PDF documents (*.pdf)"), QStringLiteral("pdf"),
           &WTReportWindowController::savePDFToFile);
}

void WTReportWindowController::print() {
  QPrinter printer(QPrinter::HighResolution);
  printer.setPageSize(WTReportPDF::localPageSize());
  printer.setDocName(windowTitleForProjects());
  QPrintDialog dialog(&printer, this);
  if (dialog.exec() != QDialog::Accepted) return;
  refreshWebContent();  // as a save
  if (sendable_) printToDevice(&printer);
}

void WTReportWindowController::editReportTemplate() {
  const Result<QString> copied = WTReportGenerator::copyBuiltInTemplateToUserFolder();
  if (!copied) {
    QMessageBox::warning(this, tr("Edit Report Template"), copied.error().message);
    return;
  }
  watchUserTemplate();
  // The user's copy now stands in for the built-in one; it is the same text until they change it.
  refreshWebContent();
  if (!QDesktopServices::openUrl(QUrl::fromLocalFile(copied.value()))) {
    QMessageBox::information(
        this, tr("Edit Report Template"),
        tr("No editor could be opened. Your report template is at:\n%1").arg(copied.value()));
  }
}
