#pragma once

#include "RZDate.h"
#include "Result.h"

#include <QList>
#include <QString>
#include <QVariant>

#include <memory>
#include <optional>
#include <vector>

class WTItemContainer;
class WTProject;
class WTReportPeriod;
class WTTask;

// One error of a template run: the engine's code, its message and the template line it was met on
// (1-based; 0 when the engine reported it before reading any of the template).
struct WTReportTemplateError {
  int code = 0;
  QString message;
  int line = 0;
};

// What a render gives: the HTML (empty when the template could not be read) and the template's errors
// in the order met.
struct WTReport {
  QString html;
  std::vector<WTReportTemplateError> errors;
  bool templateRead = false;
};

// The widget-free heart of the report window: the variables a report template receives, its items per
// task at each level of detail, where the template is found, and the render itself.
//
// Levels (`mode`): 0 one line per task (no items), 1 every item with a value, 2 those items grouped by
// day, 3 grouped by month. With a billing period, the report covers only the items that start in it
// (see WTReportPeriod): the template receives views of the clients, projects and tasks whose lists and
// totals hold only those. Without one (the default) it receives the records themselves. The groups and
// views handed out stay valid as long as this generator lives and is not rendered again.
class WTReportGenerator {
 public:
  WTReportGenerator();
  WTReportGenerator(QList<WTProject*> projects, int mode);
  ~WTReportGenerator();
  WTReportGenerator(const WTReportGenerator&) = delete;
  WTReportGenerator& operator=(const WTReportGenerator&) = delete;

  const QList<WTProject*>& projects() const { return projects_; }
  void setProjects(QList<WTProject*> projects) { projects_ = std::move(projects); }
  int mode() const { return mode_; }
  void setMode(int mode) { mode_ = mode; }

  // The period reported on: from bounds[0] (included) to bounds[1] (excluded); none for every item.
  const std::optional<RZDate::Range>& period() const { return period_; }
  void setPeriod(const std::optional<RZDate::Range>& period);

  // "client" (the client of any one of the projects; null without projects or client), "projects" (all of
  // them; with a period, those with a valued item in it), "mode", "period" (null without one, else
  // {begin, end}: its first and last day), "billing" (the user's details from the settings of the
  // projects' store: name, address, taxNumber, paymentTerms; each null when not set) and "currency" (the
  // client's billing currency, else the first project's; null without projects). Each call makes the
  // period's views afresh.
  QVariantMap variables() const;

  // The items of `task` at `mode`: null at 0, the valuable items at 1, day groups at 2, month groups at 3;
  // with a period, only those in it.
  QVariant filteredItemsForTask(WTTask* task, int mode);
  QVariant filteredItemsForTask(WTTask* task) { return filteredItemsForTask(task, mode_); }

  // $XDG_DATA_HOME/Tessal2/report.txt, whether it exists or not.
  static QString userTemplatePath();
  // The built-in template, compiled into the program.
  static QString builtInTemplatePath();
  // The user's template when the file exists, otherwise the built-in one.
  static QString templatePath();
  // Copies the built-in template to userTemplatePath() unless a file is already there (never
  // overwritten); returns the user's path either way, or why the copy failed.
  static Result<QString> copyBuiltInTemplateToUserFolder();

  // Whether render() logs each error as "Template error: MESSAGE" (on by default; a caller that shows the
  // errors itself, such as the command line, turns it off).
  void setLogsErrors(bool logs) { logsErrors_ = logs; }

  // Renders the template at `path` (templatePath() when empty) with variables() and the filters
  // "digiclock", "decimal", "money", "html" and "item_kind".
  WTReport render(const QString& path = QString());
  // The same with the template's text.
  WTReport renderText(const QString& templateText);

 private:
  WTReport run(const QString* path, const QString* text);

  // The views of the period, made on first need after the last call of variables().
  WTReportPeriod& periodViews() const;
  class ClientVariable;

  QList<WTProject*> projects_;
  int mode_ = 0;
  std::optional<RZDate::Range> period_;
  mutable std::unique_ptr<WTReportPeriod> periodViews_;
  mutable std::unique_ptr<ClientVariable> clientVariable_;
  bool logsErrors_ = true;
  std::vector<std::shared_ptr<WTItemContainer>> groups_;
};
