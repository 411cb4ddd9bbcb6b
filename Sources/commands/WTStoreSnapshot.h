#pragma once

#include "UserDefaults.h"
#include "WTObjectContext.h"

#include <QList>
#include <QString>
#include <QTextStream>

#include <functional>
#include <memory>
#include <optional>

class QCommandLineParser;
class WTClient;
class WTProject;
class WTTask;

// The store as the reading commands see it: opened for reading only, so they work beside a desktop copy
// that is writing it and can never change it, with the user's settings for the default rate.
class WTStoreSnapshot {
 public:
  // Reads the user's store; on failure writes why to `err` as "tessal: MESSAGE" and gives none.
  // `tasks` as WTStore::loadAll takes them.
  static std::unique_ptr<WTStoreSnapshot> open(QTextStream& err,
                                               WTStore::Records which = WTStore::Records::All,
                                               const QStringList& tasks = {});
  // Reads the store at `path` with `defaults` (taken over).
  static Result<std::unique_ptr<WTStoreSnapshot>> open(const QString& path,
                                                       std::unique_ptr<UserDefaults> defaults,
                                                       WTStore::Records which = WTStore::Records::All,
                                                       const QStringList& tasks = {});
  ~WTStoreSnapshot();

  WTObjectContext& context() { return *context_; }

 private:
  WTStoreSnapshot() = default;
  std::unique_ptr<UserDefaults> defaults_;
  std::unique_ptr<WTObjectContext> context_;
};

// The projects a command names, one project or a client's (sorted by name), read with their own items
// and no others: the name is looked up among the owners first, then the store is read again for those
// projects' tasks alone. A large store's other items would take longer to read than the command takes.
struct WTNamedProjects {
  enum Kind { Project, Client };
  // On failure writes why to `err` as "tessal: MESSAGE" and gives none.
  // A project is looked for among the client's named `clientName` when that is not null (two clients
  // may each have a "Website").
  static std::optional<WTNamedProjects> read(QTextStream& err, Kind kind, const QString& name,
                                             const QString& clientName = {});

  std::unique_ptr<WTStoreSnapshot> snapshot;
  QList<WTProject*> projects;
  QString title;  // the project's or the client's name
};

// What a command reads when its "--project NAME" option (and "--client NAME", which says whose) narrows it:
// that project with its own items alone, or without the option the whole store (`project` null).
struct WTProjectScope {
  // On failure writes why to `err` as "tessal: MESSAGE" and gives none.
  static std::optional<WTProjectScope> read(QTextStream& err, const QCommandLineParser& options);

  std::unique_ptr<WTStoreSnapshot> snapshot;
  const WTProject* project = nullptr;
};

// Finding the one record a command names: names compare without regard to case, and of several so named
// the one spelt exactly as typed is meant. No match, or more than one, is an error naming what there is (at
// most a screenful).
namespace WTNamedRecords {

// Among the projects of clients named `clientName` when that is not null.
Result<WTProject*> project(const WTObjectContext& context, const QString& name,
                           const QString& clientName = {});
Result<WTClient*> client(const WTObjectContext& context, const QString& name);
// The task named `name` among those of projects named `projectName` and of clients named `clientName`;
// a null filter lets every task through. "PROJECT › TASK" (label()) names a task too. Of several tasks so
// named, the only one `preferred` passes is meant (stop means the one that runs).
Result<WTTask*> task(const WTObjectContext& context, const QString& name, const QString& projectName = {},
                     const QString& clientName = {},
                     const std::function<bool(const WTTask*)>& preferred = {});

// As task(), but a name that no task of the filters carries makes a task of that name, in the project
// `projectName` names (made, for the client `clientName` names, when missing; the client too), or without
// one in the only project there is (of that client). "PROJECT › TASK" names the project too. A name that
// is ambiguous stays an error. What was made is appended to `made`, one description each.
Result<WTTask*> taskMadeIfMissing(WTObjectContext& context, const QString& name, const QString& projectName,
                                  const QString& clientName, QStringList& made);

// The names a task that task() finds by `name` may carry: `name`, and for "PROJECT › TASK" the part after
// the separator.
QStringList taskNames(const QString& name);

// How the commands name a task: "PROJECT › TASK", "(untitled)" standing in for a missing name.
QString label(const WTTask& task);

}  // namespace WTNamedRecords
