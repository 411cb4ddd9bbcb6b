#include "WTTrackCommand.h"

#include "DurationText.h"
#include "MoneyFormat.h"
#include "RZSyncTrack.h"
#include "UserDefaults.h"
#include "WTBackupCommand.h"
#include "WTClient.h"
#include "WTCommandArguments.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTRangePredicate.h"
#include "WTSingleInstanceClient.h"
#include "WTStore.h"
#include "WTStoreSetup.h"
#include "WTStoreSnapshot.h"
#include "WTStoreWriterLock.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTTimerCommands.h"

#include <QCommandLineParser>
#include <QDeadlineTimer>
#include <QDir>
#include <QFileInfo>
#include <QMap>
#include <QThread>

#include <algorithm>

namespace {

// How long a command waits for the store's writer: another command holds it for milliseconds, a desktop
// copy that is still opening a large store for well under a second.
constexpr int kWriterWaitMs = 10000;

int print(const WTCommandOutcome& outcome, QTextStream& out, QTextStream& err) {
  out << outcome.out;
  out.flush();
  err << outcome.err;
  err.flush();
  return outcome.status;
}

using WTCommandArguments::failure;

// The uuids of the tasks named `name` (or, for "PROJECT › TASK", the part after the separator), read from
// the running and named records alone: the tasks whose items a command needs besides the running ones.
Result<QStringList> tasksNamed(WTStore& store, const QString& name) {
  const QStringList names = WTNamedRecords::taskNames(name);
  QStringList uuids;
  const Result<void> read = store.loadAll(
      [&](WTStoreRecord&& record) {
        if (record.entity == QLatin1String("WTTask") &&
            std::any_of(names.begin(), names.end(),
                        [&](const QString& wanted) { return WTObject::sameName(record.name, wanted); }))
          uuids.append(record.uuid);
      },
      WTStore::Records::RunningAndNamed, names);
  if (!read) return read.error();
  return uuids;
}

// Carries a command that changes data out on the store itself, while this process holds its writer lock.
// Only the records the command needs are read; what changes is saved together with its sync journal
// entries, as the desktop copy would have done, so that the next sync sends it. A command that may make
// records makes the store when there is none, filled as the desktop copy fills a store it makes. Start and
// stop read first only the tasks of the name they are given and the running entries (`narrowed`), and
// everything only when that was not enough.
int runOnStore(const QString& storePath, const QString& command, const QStringList& arguments,
               QTextStream& out, QTextStream& err, bool narrowed = true) {
  const bool storeIsNew = !QFileInfo::exists(storePath);
  if (storeIsNew && !WTTimerCommands::createsRecords(command, arguments)) {
    // The read-only opening says what is missing in the words every command uses.
    return failure(err, WTStore::openReadOnly(storePath).error().message);
  }
  // A few records change and a failed save is reported at once: no need to read the whole file first.
  Result<std::unique_ptr<WTStore>> store =
      RZSyncTrack::openStore(storePath, nullptr, WTStore::Check::Header, WTStore::LogOnClose::KeepWhileShort);
  if (!store) return storeFailure(err, store.error());
  WTStore::Records which =
      WTTimerCommands::readsEveryRecord(command) ? WTStore::Records::All : WTStore::Records::Timers;
  QStringList tasks;
  const std::optional<QStringList> names =
      narrowed ? WTTimerCommands::namedTasksToRead(command, arguments) : std::nullopt;
  if (names) {
    which = WTStore::Records::RunningAndNamed;
    tasks = *names;
  } else if (const QString name = WTTimerCommands::taskWithItems(command, arguments); !name.isNull()) {
    Result<QStringList> named = tasksNamed(*store.value(), name);
    if (!named) return failure(err, named.error().message);
    which = WTStore::Records::ItemsOfTasks;
    tasks = named.value();
  }
  UserDefaults defaults;
  WTStoreSetup::registerDefaults(defaults);
  WTObjectContext context(&defaults);
  const Result<void> loaded = context.attachStore(std::move(store.value()), which, tasks);
  if (!loaded) return failure(err, loaded.error().message);
  // Nothing here is ever undone: an import of many entries would only hold every step in memory.
  context.undoManager().disableRegistration();
  if (storeIsNew) WTStoreSetup::fillNewStore(context);
  const WTCommandOutcome outcome = WTTimerCommands::run(context, command, arguments);
  if (names && outcome.status != 0) {
    // Every task of the name was read, so the command fails over every owner too; but what the failure
    // lists (the tasks there are) may take them all. Nothing was saved.
    context.closeStore();
    return runOnStore(storePath, command, arguments, out, err, false);
  }
  if (context.hasChanges()) {
    // The save journals what it saved, in its own transaction, reading only those records' entries.
    RZSyncTrack journal(context.store(), RZSyncTrack::Loading::OnDemand);
    context.setChangeJournal(&journal);
    const Result<void> saved = context.save();
    context.setChangeJournal(nullptr);
    if (!saved) return failure(err, saved.error().message);
  }
  context.setChangeJournal(nullptr);
  WTCommandArguments::endProcess(print(outcome, out, err), out, err, context);
}

int runChangingCommand(const QString& command, const QStringList& arguments, QTextStream& out,
                       QTextStream& err) {
  const QString storePath = WTStoreSetup::storePath();
  // What an import would make, told before there is any data: against none, and nothing is made.
  if (!QFileInfo::exists(storePath) && WTTimerCommands::readsEveryRecord(command) &&
      !WTTimerCommands::createsRecords(command, arguments)) {
    UserDefaults defaults;
    WTStoreSetup::registerDefaults(defaults);
    WTObjectContext context(&defaults);
    return print(WTTimerCommands::run(context, command, arguments), out, err);
  }
  // The lock lives beside the store: a command that may make the store makes its folder first.
  if (WTTimerCommands::createsRecords(command, arguments)) QDir().mkpath(QFileInfo(storePath).path());
  WTStoreWriterLock lock(storePath);
  const WTSingleInstanceClient desktop;
  const QDeadlineTimer deadline(kWriterWaitMs);
  do {
    if (lock.tryLock()) return runOnStore(storePath, command, arguments, out, err);
    // The writer is a desktop copy, which carries the command out, or another command, which soon lets go.
    const WTSingleInstanceClient::Forwarded forwarded =
        desktop.sendRequest(WTTimerCommands::request(command, arguments), kWriterWaitMs);
    if (forwarded.reached) {
      if (forwarded.reply) return print(WTCommandOutcome::fromJson(*forwarded.reply), out, err);
      return failure(err,
                     QStringLiteral("the running Tessal did not answer; the change may not have been made"));
    }
    if (!QFileInfo::exists(QFileInfo(storePath).path()))
      return failure(err, WTStore::openReadOnly(storePath).error().message);
    QThread::msleep(5);
  } while (!deadline.hasExpired());
  return failure(
      err, QStringLiteral("the data file is busy (%1 is held); nothing was changed").arg(lock.filePath()));
}

}  // namespace

int runTrackCommand(const QString& command, const QStringList& arguments, QTextStream& out,
                    QTextStream& err) {
  if (std::optional<WTCommandOutcome> problem = WTTimerCommands::checkArguments(command, arguments))
    return print(*problem, out, err);
  if (WTTimerCommands::changesData(command)) return runChangingCommand(command, arguments, out, err);
  // Status tells of the running entries alone.
  std::unique_ptr<WTStoreSnapshot> snapshot = WTStoreSnapshot::open(err, WTStore::Records::RunningAndNamed);
  if (!snapshot) return 1;
  WTCommandArguments::endProcess(
      print(WTTimerCommands::run(snapshot->context(), command, arguments), out, err), out, err,
      snapshot->context());
}

int runListCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  constexpr char kUsage[] =
      "usage: tessal list tasks|projects|clients [--project NAME] [--client NAME] [--qualified]\n";
  QCommandLineParser parser;
  parser.setSingleDashWordOptionMode(QCommandLineParser::ParseAsLongOptions);
  parser.addOption(QCommandLineOption(QStringLiteral("project"), QString(), QStringLiteral("name")));
  parser.addOption(QCommandLineOption(QStringLiteral("client"), QString(), QStringLiteral("name")));
  parser.addOption(QCommandLineOption(QStringLiteral("qualified")));
  static const QStringList kinds = {QStringLiteral("tasks"), QStringLiteral("projects"),
                                    QStringLiteral("clients")};
  QString problem;
  if (!parser.parse(QStringList{QStringLiteral("tessal")} + arguments))
    problem = parser.errorText();
  else if (parser.positionalArguments().size() != 1 || !kinds.contains(parser.positionalArguments().first()))
    problem = QStringLiteral("name what to list: tasks, projects or clients");
  if (!problem.isEmpty()) return WTCommandArguments::usage(err, kUsage, problem);
  std::unique_ptr<WTStoreSnapshot> snapshot = WTStoreSnapshot::open(err, WTStore::Records::Timers);
  if (!snapshot) return 1;
  const QString kind = parser.positionalArguments().first();
  const bool byProject = parser.isSet(QStringLiteral("project"));
  const bool byClient = parser.isSet(QStringLiteral("client"));
  auto named = [](const WTObject* object, const QString& name) {
    return object && object->name().compare(name, Qt::CaseInsensitive) == 0;
  };
  auto projectPasses = [&](const WTProject* project) {
    return (!byProject || named(project, parser.value(QStringLiteral("project")))) &&
           (!byClient || (project && named(project->client(), parser.value(QStringLiteral("client")))));
  };
  const WTObjectContext& context = snapshot->context();
  // A filter that names nothing is a mistake to say, not an empty list (completion drops what it says).
  const auto unknown = [&](const auto& records, const QString& option, const auto& find) {
    if (!parser.isSet(option)) return false;
    const QString name = parser.value(option);
    const auto isNamed = [&](const WTObject* record) { return named(record, name); };
    if (std::any_of(records.begin(), records.end(), isNamed)) return false;
    err << "tessal: " << find(context, name).error().message << '\n';
    return true;
  };
  const auto project = [](const WTObjectContext& in, const QString& name) {
    return WTNamedRecords::project(in, name);
  };
  if (unknown(context.fetch<WTProject>(), QStringLiteral("project"), project) ||
      unknown(context.fetch<WTClient>(), QStringLiteral("client"), WTNamedRecords::client))
    return 1;
  QStringList names;
  if (kind == QLatin1String("tasks")) {
    // Qualified, every task has a name of its own that start and stop take back: what a picker needs.
    const bool qualified = parser.isSet(QStringLiteral("qualified"));
    for (const WTTask* task : context.fetch<WTTask>())
      if (projectPasses(task->project()))
        names.append(qualified ? WTNamedRecords::label(*task) : task->name());
  } else if (kind == QLatin1String("projects")) {
    for (const WTProject* project : context.fetch<WTProject>())
      if (projectPasses(project)) names.append(project->name());
  } else {
    for (const WTClient* client : context.fetch<WTClient>()) names.append(client->name());
  }
  names.removeAll(QString());
  std::sort(names.begin(), names.end(), WTCommandArguments::sortsBefore);
  names.erase(std::unique(names.begin(), names.end()), names.end());
  for (const QString& name : names) {
    // One name a line: a line break inside a name would read as two.
    QString line = name;
    out << line.replace(u'\n', u' ') << '\n';
  }
  out.flush();
  return 0;
}

int runLogCommand(const QStringList& arguments, QTextStream& out, QTextStream& err) {
  constexpr char kUsage[] = "usage: tessal log [--range RANGE] [--project NAME [--client NAME]]\n";
  QCommandLineParser parser;
  QString problem = WTCommandArguments::parse(
      parser, arguments, {QStringLiteral("range"), QStringLiteral("project"), QStringLiteral("client")});
  if (problem.isEmpty()) problem = WTCommandArguments::clientWithoutProject(parser);
  const QString rangeWord =
      parser.isSet(QStringLiteral("range")) ? parser.value(QStringLiteral("range")) : QStringLiteral("today");
  // A billing period, as a report takes it: consecutive ranges never list an entry twice.
  const Result<std::optional<RZDate::Range>> period = WTRangePredicate::boundsForRangeWord(rangeWord);
  if (problem.isEmpty() && !period) problem = period.error().message;
  if (!problem.isEmpty()) return WTCommandArguments::usage(err, kUsage, problem);

  // One project's entries need only that project's items read.
  const std::optional<WTProjectScope> scope = WTProjectScope::read(err, parser);
  if (!scope) return 1;
  WTObjectContext& context = scope->snapshot->context();
  const WTProject* project = scope->project;
  QList<WTTime*> times =
      WTRangePredicate::timesMatching(context, WTRangePredicate::predicateForPeriod(period.value()), project);
  std::sort(times.begin(), times.end(), [](const WTTime* a, const WTTime* b) {
    return a->startDate().value_or(Date()) < b->startDate().value_or(Date());
  });
  // Each amount is what the entry bills, in its client's currency; a total is the sum of its lines.
  const auto money = [](const Decimal& amount, const QString& currency) {
    return MoneyFormat::format(amount, currency) + u' ' + currency;
  };
  // The minutes as they ran, and those a rounding rule bills beside them where they differ.
  const auto duration = [](int minutes, int billedMinutes) {
    return DurationText::stringWithMinutes(minutes) +
           (billedMinutes == minutes
                ? QString()
                : QStringLiteral("  billed %1").arg(DurationText::stringWithMinutes(billedMinutes)));
  };
  int minutes = 0, billedMinutes = 0;
  QMap<QString, Decimal> billed;
  for (const WTTime* time : times) {
    const QDateTime start = time->startDate() ? time->startDate()->toQDateTime().toLocalTime() : QDateTime();
    const QString end = time->running()   ? QStringLiteral("now  ")
                        : time->endDate() ? time->endDate()->toQDateTime().toLocalTime().toString(u"HH:mm")
                                          : QStringLiteral("     ");
    const QString task = time->task() ? WTNamedRecords::label(*time->task()) : QStringLiteral("(no task)");
    const Decimal amount = time->billedCost();
    const QString currency = time->billingCurrency();
    out << (start.isValid() ? start.toString(u"yyyy-MM-dd  HH:mm") : QStringLiteral("(no date)         "))
        << "–" << end << "  " << task << "  " << duration(time->duration(), time->billedDuration()) << "  "
        << money(amount, currency) << '\n';
    minutes += time->duration();
    billedMinutes += time->billedDuration();
    billed[currency] += amount;
  }
  // Nothing to bill still says in what: the project's currency, which its client may choose.
  if (billed.isEmpty())
    billed[project ? project->billingCurrency() : context.billingDefaults().currency] = Decimal();
  QStringList totals;
  for (const auto& [currency, amount] : billed.asKeyValueRange()) totals << money(amount, currency);
  out << "Total: " << times.size() << (times.size() == 1 ? " entry  " : " entries  ")
      << duration(minutes, billedMinutes) << "  " << totals.join(QStringLiteral(", ")) << '\n';
  out.flush();
  return 0;
}
