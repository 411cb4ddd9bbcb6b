#pragma once

#include "Result.h"
#include "WTReportGenerator.h"
#include "WTSaveLocation.h"

#include <QList>
#include <QPointer>
#include <QWidget>

#include <functional>

class QAbstractButton;
class QButtonGroup;
class QFileSystemWatcher;
class QLabel;
class QPagedPaintDevice;
class QTextBrowser;
class QTextDocument;
class WTClient;
class WTObject;
class WTObjectContext;
class WTProject;
class WTRangePopUpButton;
class WTReportDocumentBuilder;

// The report of a set of projects, as the client would receive it: the report template rendered to HTML
// at one of four levels of detail (whole tasks, every item with a value, items by day, items by month)
// over a billing period chosen as the export chooses its range (any date by default), saved as HTML or
// PDF, printed, or exported as the report's own CSV.
//
// The report follows the data: a save of the store that changed something the report shows renders it
// again, keeping the place the reader scrolled to, and so do a new default rate and a change to the user's
// own template file. A window nobody can see renders when it is seen again, and a long report is read
// into its document on another thread (WTReportDocumentBuilder): a year of entries takes seconds to show,
// and the application must not stall for that. Template errors are logged and the first of them is named,
// with its line, in a bar above the report until the next render.
class WTReportWindowController : public QWidget {
  Q_OBJECT
 public:
  // `context` is not owned; the window closes when it goes.
  explicit WTReportWindowController(WTObjectContext* context, QWidget* parent = nullptr);
  ~WTReportWindowController() override;

  // Opens a window of its own on the report of `projects` (or of every project of `client`), deleted
  // when closed; brings forward the one open on that report already.
  static WTReportWindowController* showReport(WTObjectContext* context, const QList<WTProject*>& projects);
  static WTReportWindowController* showReport(WTObjectContext* context, WTClient* client);

  QList<WTProject*> projects() const;
  // Reports on these projects (renders at once when there are any).
  void setProjects(const QList<WTProject*>& projects);
  // Reports on the client's projects, read again at each render, so a project added later appears.
  void setClient(WTClient* client);

  // The level of detail 0–3, as the segmented control shows it.
  int mode() const;
  void setMode(int mode);

  // The billing period chosen, read at the present instant; none for "Any date" (and for a custom range
  // without both dates).
  std::optional<RZDate::Range> period() const;

  // Renders again and shows the result, keeping the scroll position.
  void refreshWebContent();
  // Whether a long report is still being read into a document for the view.
  bool isBuildingDocument() const;

  QString html() const { return html_; }
  QTextBrowser* webView() const { return webView_; }
  QButtonGroup* segmentedControl() const { return segments_; }
  WTRangePopUpButton* rangeButton() const { return rangeButton_; }
  // The bar naming the last render's first template error; hidden when there was none.
  QLabel* errorBar() const { return errorBar_; }

  // The outputs, to a chosen path; each is written whole or not at all.
  Result<void> exportCSVToFile(const QString& path) const;
  Result<void> saveHTMLToFile(const QString& path) const;
  Result<void> savePDFToFile(const QString& path) const;
  // Lays the report out on `device`'s pages with page numbers; rows are never cut between pages.
  void printToDevice(QPagedPaintDevice* device) const;

  // Asks for a location, then writes; a failure is shown in a message box.
  void exportCSV();
  void saveHTML();
  void savePDF();
  // The system's print dialog, then the printer.
  void print();
  // Copies the built-in template to the user's data folder unless one is there, and opens it in the
  // desktop's editor; the report renders again whenever the file changes.
  void editReportTemplate();

  void setSaveLocationChooser(WTSaveLocationChooser chooser) { chooseSaveLocation_ = std::move(chooser); }

 signals:
  // After each render.
  void reportRendered();
  // Once the view shows the newest render: at once for a short report, while a long one is read into a
  // document away from the window's thread (the view shows the previous one meanwhile).
  void reportShown();

 protected:
  void showEvent(QShowEvent* event) override;
  void changeEvent(QEvent* event) override;

 private:
  // The open window that `reports` says shows the report asked for, brought forward; else a new one,
  // given its `subject`.
  static WTReportWindowController* shown(WTObjectContext* context,
                                         const std::function<bool(WTReportWindowController&)>& reports,
                                         const std::function<void(WTReportWindowController&)>& subject);
  void objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>& updated,
                        const QList<WTObject*>& deleted);
  // Whether a change to `object` may change what the report shows.
  bool concernsReport(const WTObject* object) const;
  // Renders now when the window can be seen, or else once it is.
  void refreshWhenSeen();
  // Puts `document` in the view in the previous one's place, keeping the reader's place.
  void showDocument(QTextDocument* document);
  void buildInterface();
  QList<WTProject*> liveProjects() const;
  void showTemplateErrors(const WTReport& report);
  void watchUserTemplate();
  std::unique_ptr<QTextDocument> printableDocument() const;
  void saveWith(const QString& title, const QString& filter, const QString& suffix,
                Result<void> (WTReportWindowController::*write)(const QString&) const);
  QString windowTitleForProjects() const;
  // The client or the one project reported on; empty for several projects.
  QString reportSubject() const;

  QPointer<WTObjectContext> context_;
  QList<WTProject*> projects_;
  WTClient* client_ = nullptr;
  WTReportGenerator generator_;
  QString html_;
  bool sendable_ = false;  // the last render's template was read and ran without errors
  QTextBrowser* webView_ = nullptr;
  WTReportDocumentBuilder* documentBuilder_ = nullptr;
  QButtonGroup* segments_ = nullptr;
  WTRangePopUpButton* rangeButton_ = nullptr;
  QLabel* errorBar_ = nullptr;
  QFileSystemWatcher* templateWatcher_ = nullptr;
  WTSaveLocationChooser chooseSaveLocation_;
  bool changedSinceRender_ = false;  // something the report shows changed and awaits the save
  bool renderWhenSeen_ = false;      // a render waits for the window to be seen
};
