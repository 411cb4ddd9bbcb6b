#include "WTStoreSnapshot.h"

#include "WTBackupCommand.h"
#include "WTClient.h"
#include "WTCommandArguments.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTStoreSetup.h"
#include "WTTask.h"

#include <QCommandLineParser>

#include <algorithm>

std::unique_ptr<WTStoreSnapshot> WTStoreSnapshot::open(QTextStream& err, WTStore::Records which,
                                                       const QStringList& tasks) {
  auto defaults = std::make_unique<UserDefaults>();
  WTStoreSetup::registerDefaults(*defaults);
  Result<std::unique_ptr<WTStoreSnapshot>> snapshot =
      open(WTStoreSetup::storePath(), std::move(defaults), which, tasks);
  if (!snapshot) {
    storeFailure(err, snapshot.error());
    return nullptr;
  }
  return std::move(snapshot.value());
}

Result<std::unique_ptr<WTStoreSnapshot>> WTStoreSnapshot::open(const QString& path,
                                                               std::unique_ptr<UserDefaults> defaults,
                                                               WTStore::Records which,
                                                               const QStringList& tasks) {
  // Reading cannot leave damage to show in a failed save later: the header's check is enough.
  Result<std::unique_ptr<WTStore>> store = WTStore::openReadOnly(path, WTStore::Check::Header);
  if (!store) return store.error();
  std::unique_ptr<WTStoreSnapshot> snapshot(new WTStoreSnapshot);
  snapshot->defaults_ = std::move(defaults);
  snapshot->context_ = std::make_unique<WTObjectContext>(snapshot->defaults_.get());
  const Result<void> loaded = snapshot->context_->attachStore(std::move(store.value()), which, tasks);
  if (!loaded) return loaded.error();
  WTObjectContext::setDefaultContext(snapshot->context_.get());
  return snapshot;
}

WTStoreSnapshot::~WTStoreSnapshot() {
  if (WTObjectContext::defaultContext() == context_.get()) WTObjectContext::setDefaultContext(nullptr);
}

namespace {

Result<WTNamedProjects> namedIn(std::unique_ptr<WTStoreSnapshot> snapshot, WTNamedProjects::Kind kind,
                                const QString& name, const QString& clientName) {
  WTNamedProjects named;
  if (kind == WTNamedProjects::Project) {
    const Result<WTProject*> project = WTNamedRecords::project(snapshot->context(), name, clientName);
    if (!project) return project.error();
    named.projects = {project.value()};
    named.title = project.value()->name();
  } else {
    const Result<WTClient*> client = WTNamedRecords::client(snapshot->context(), name);
    if (!client) return client.error();
    named.projects = client.value()->projects();
    std::sort(named.projects.begin(), named.projects.end(), [](const WTProject* a, const WTProject* b) {
      return WTCommandArguments::sortsBefore(a->name(), b->name());
    });
    named.title = client.value()->name();
  }
  named.snapshot = std::move(snapshot);
  return named;
}

}  // namespace

std::optional<WTNamedProjects> WTNamedProjects::read(QTextStream& err, Kind kind, const QString& name,
                                                     const QString& clientName) {
  std::unique_ptr<WTStoreSnapshot> owners = WTStoreSnapshot::open(err, WTStore::Records::ItemsOfTasks);
  if (!owners) return std::nullopt;
  Result<WTNamedProjects> found = namedIn(std::move(owners), kind, name, clientName);
  if (!found) {
    WTCommandArguments::failure(err, found.error().message);
    return std::nullopt;
  }
  QStringList tasks;
  for (const WTProject* project : found.value().projects) {
    for (const WTTask* task : project->tasks()) tasks.append(task->uuid());
  }
  found.value().snapshot.reset();
  std::unique_ptr<WTStoreSnapshot> scoped = WTStoreSnapshot::open(err, WTStore::Records::ItemsOfTasks, tasks);
  if (!scoped) return std::nullopt;
  // Looked up again in what was read: the desktop copy may have renamed something in between.
  Result<WTNamedProjects> read = namedIn(std::move(scoped), kind, name, clientName);
  if (!read) {
    WTCommandArguments::failure(err, read.error().message);
    return std::nullopt;
  }
  return std::move(read.value());
}

std::optional<WTProjectScope> WTProjectScope::read(QTextStream& err, const QCommandLineParser& options) {
  WTProjectScope scope;
  if (options.isSet(QStringLiteral("project"))) {
    const QString client =
        options.isSet(QStringLiteral("client")) ? options.value(QStringLiteral("client")) : QString();
    std::optional<WTNamedProjects> named = WTNamedProjects::read(
        err, WTNamedProjects::Project, options.value(QStringLiteral("project")), client);
    if (!named) return std::nullopt;
    scope.snapshot = std::move(named->snapshot);
    scope.project = named->projects.first();
  } else {
    scope.snapshot = WTStoreSnapshot::open(err);
    if (!scope.snapshot) return std::nullopt;
  }
  return scope;
}

namespace WTNamedRecords {
namespace {

constexpr qsizetype kNamesShown = 20;
const QString kSeparator = QStringLiteral(" › ");

QString quoted(const QString& name) {
  return QStringLiteral("“%1”").arg(name);
}

// The one record of `all` named `name`; `kinds` names what `all` holds ("projects", "tasks of “Atlas”").
// Of several so named, the only one `preferred` passes, else the only one spelt exactly as typed.
template <class T>
Result<T*> named(const QList<T*>& all, const QString& name, const char* kind, const QString& kinds,
                 const std::function<QString(const T*)>& describe,
                 const std::function<bool(const T*)>& preferred = {}) {
  QList<T*> matches;
  for (T* record : all) {
    if (record->name().compare(name, Qt::CaseInsensitive) == 0) matches.append(record);
  }
  const auto onlyOne = [&](const std::function<bool(const T*)>& passes) -> T* {
    const auto count = passes ? std::count_if(matches.begin(), matches.end(), passes) : 0;
    return count == 1 ? *std::find_if(matches.begin(), matches.end(), passes) : nullptr;
  };
  if (matches.size() == 1) return matches.first();
  if (T* only = onlyOne(preferred)) return only;
  if (T* exact = onlyOne([&](const T* record) { return record->name() == name; })) return exact;
  const QList<T*>& listed = matches.isEmpty() ? all : matches;
  QStringList names;
  for (T* record : listed) names.append(describe(record));
  std::sort(names.begin(), names.end(), WTCommandArguments::sortsBefore);
  const qsizetype more = names.size() - kNamesShown;
  if (more > 0) {
    names.resize(kNamesShown);
    names.append(QStringLiteral("and %1 more").arg(more));
  }
  QString message;
  if (!matches.isEmpty()) {
    message = QStringLiteral("%1 %2 are named %3: %4")
                  .arg(matches.size())
                  .arg(kinds, quoted(name), names.join(QStringLiteral(", ")));
  } else if (all.isEmpty()) {
    message = QStringLiteral("no %1 is named %2, and there are no %3")
                  .arg(QLatin1String(kind), quoted(name), kinds);
  } else {
    message = QStringLiteral("no %1 is named %2; the %3 are: %4")
                  .arg(QLatin1String(kind), quoted(name), kinds, names.join(QStringLiteral(", ")));
  }
  return Error{1, message};
}

QString describeProject(const WTProject* project) {
  // Projects of the same name are told apart by their clients.
  return project->client() ? QStringLiteral("%1 (%2)").arg(quoted(project->name()), project->client()->name())
                           : quoted(project->name());
}

bool sameName(const QString& a, const QString& b) {
  return WTObject::sameName(a, b);
}

// Whether `project` is one of a client named `clientName`; a null name lets every project through.
bool ofClient(const WTProject* project, const QString& clientName) {
  return clientName.isNull() ||
         (project && project->client() && sameName(project->client()->name(), clientName));
}

}  // namespace

Result<WTProject*> project(const WTObjectContext& context, const QString& name, const QString& clientName) {
  const QList<WTProject*> candidates =
      context.fetch<WTProject>([&](const WTProject* project) { return ofClient(project, clientName); });
  const QString kinds = clientName.isNull() ? QStringLiteral("projects")
                                            : QStringLiteral("projects of %1").arg(quoted(clientName));
  return named<WTProject>(candidates, name, "project", kinds, describeProject);
}

Result<WTClient*> client(const WTObjectContext& context, const QString& name) {
  return named<WTClient>(context.fetch<WTClient>(), name, "client", QStringLiteral("clients"),
                         [](const WTClient* client) { return quoted(client->name()); });
}

Result<WTTask*> task(const WTObjectContext& context, const QString& name, const QString& projectName,
                     const QString& clientName, const std::function<bool(const WTTask*)>& preferred) {
  const QList<WTTask*> candidates = context.fetch<WTTask>([&](const WTTask* task) {
    const WTProject* project = task->project();
    if (!projectName.isNull() && !(project && sameName(project->name(), projectName))) return false;
    return ofClient(project, clientName);
  });
  // "PROJECT › TASK", the way status and `list tasks --qualified` name a task, names it too, unless a task
  // is called that. Either name may hold the separator itself: the first split that finds a task is meant.
  const bool anyNamed = std::any_of(candidates.begin(), candidates.end(),
                                    [&](const WTTask* task) { return sameName(task->name(), name); });
  const qsizetype first = name.indexOf(kSeparator);
  if (!anyNamed && first > 0 && projectName.isNull()) {
    for (qsizetype at = first; at > 0; at = name.indexOf(kSeparator, at + 1)) {
      if (Result<WTTask*> found = task(context, name.mid(at + 3), name.left(at), clientName, preferred))
        return found;
    }
    return task(context, name.mid(first + 3), name.left(first), clientName, preferred);
  }
  QString kinds = QStringLiteral("tasks");
  if (!projectName.isNull()) kinds += QStringLiteral(" of projects named %1").arg(quoted(projectName));
  if (!clientName.isNull())
    kinds +=
        QStringLiteral("%1 of clients named %2").arg(projectName.isNull() ? "" : ",", quoted(clientName));
  return named<WTTask>(
      candidates, name, "task", kinds,
      [](const WTTask* task) {
        return task->project()
                   ? QStringLiteral("%1 in %2").arg(quoted(task->name()), describeProject(task->project()))
                   : quoted(task->name());
      },
      preferred);
}

Result<WTTask*> taskMadeIfMissing(WTObjectContext& context, const QString& name, const QString& projectName,
                                  const QString& clientName, QStringList& made) {
  const Result<WTTask*> found = task(context, name, projectName, clientName);
  if (found) return found;
  auto passes = [&](const WTProject* project, const QString& wantedProject) {
    return project && (wantedProject.isNull() || sameName(project->name(), wantedProject)) &&
           ofClient(project, clientName);
  };
  auto carried = [&](const QString& taskName, const QString& wantedProject) {
    const QList<WTTask*> tasks = context.fetch<WTTask>([&](const WTTask* task) {
      return sameName(task->name(), taskName) &&
             ((wantedProject.isNull() && clientName.isNull()) || passes(task->project(), wantedProject));
    });
    return !tasks.isEmpty();
  };
  QString taskName = name;
  QString wantedProject = projectName;
  const qsizetype separator = name.indexOf(QStringLiteral(" › "));
  if (projectName.isNull() && separator > 0 && !carried(name, {})) {
    taskName = name.mid(separator + 3);
    wantedProject = name.left(separator);
  }
  // Tasks of that name there are, only not one alone: which one is meant stays the user's to say.
  if (carried(taskName, wantedProject)) return found.error();

  WTClient* client = nullptr;
  if (!clientName.isNull()) {
    const QList<WTClient*> clients =
        context.fetch<WTClient>([&](const WTClient* client) { return sameName(client->name(), clientName); });
    if (clients.size() > 1) return WTNamedRecords::client(context, clientName).error();
    if (clients.isEmpty()) {
      client = WTClient::insertNewObject(&context);
      client->setName(clientName);
      made.append(QStringLiteral("client %1").arg(clientName));
    } else {
      client = clients.first();
    }
  }
  QList<WTProject*> projects = context.fetch<WTProject>([&](const WTProject* project) {
    return passes(project, wantedProject) && (!client || project->client() == client);
  });
  WTProject* project = nullptr;
  if (projects.size() == 1) {
    project = projects.first();
  } else if (!wantedProject.isNull() && projects.isEmpty()) {
    project = WTProject::insertNewObject(&context);
    project->setName(wantedProject);
    project->setClient(client);
    made.append(QStringLiteral("project %1").arg(wantedProject));
  } else if (!wantedProject.isNull()) {
    return named<WTProject>(projects, wantedProject, "project", QStringLiteral("projects"), describeProject)
        .error();
  } else {
    QStringList names;
    for (const WTProject* candidate : projects) names.append(describeProject(candidate));
    std::sort(names.begin(), names.end(), WTCommandArguments::sortsBefore);
    if (names.size() > kNamesShown) {
      const qsizetype more = names.size() - kNamesShown;
      names.resize(kNamesShown);
      names.append(QStringLiteral("and %1 more").arg(more));
    }
    return Error{
        1, projects.isEmpty()
               ? QStringLiteral("no task is named %1 and there is no project to make it in; name one with "
                                "--project")
                     .arg(quoted(taskName))
               : QStringLiteral("no task is named %1; name the project to make it in with --project: %2")
                     .arg(quoted(taskName), names.join(QStringLiteral(", ")))};
  }
  auto* created = WTTask::insertNewObject(&context);
  created->setName(taskName);
  created->setProject(project);
  made.append(QStringLiteral("task %1").arg(label(*created)));
  return created;
}

QStringList taskNames(const QString& name) {
  QStringList names(name);
  for (qsizetype at = name.indexOf(kSeparator); at > 0; at = name.indexOf(kSeparator, at + 1))
    names.append(name.mid(at + 3));
  return names;
}

QString label(const WTTask& task) {
  const QString project = task.project() && !task.project()->name().isEmpty() ? task.project()->name()
                                                                              : QStringLiteral("(untitled)");
  return QStringLiteral("%1 › %2").arg(project,
                                       task.name().isEmpty() ? QStringLiteral("(untitled)") : task.name());
}

}  // namespace WTNamedRecords
