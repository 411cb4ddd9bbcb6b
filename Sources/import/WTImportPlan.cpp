#include "WTImportPlan.h"

#include "DurationText.h"
#include "MoneyFormat.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTUndoManager.h"

#include <QCoreApplication>

#include <QSet>
#include <QTimeZone>

#include <algorithm>
#include <functional>
#include <map>

namespace WTImport {
namespace {

const QString kDefaultTask = QStringLiteral("Default Task");
// Where an entry of no project goes: a task needs one.
const QString kNoProject = QStringLiteral("No Project");

struct TaskNode {
  QString name;
  WTTask* existing = nullptr;
  WTTask* made = nullptr;
  std::vector<const WTImportRow*> rows;
  WTTask* task() const { return existing ? existing : made; }
};

struct ProjectNode {
  QString name;
  WTProject* existing = nullptr;
  WTProject* made = nullptr;
  std::map<QString, TaskNode> tasks;  // by folded name
  WTProject* project() const { return existing ? existing : made; }
};

struct ClientNode {
  QString name;  // empty: the projects have no client
  WTClient* existing = nullptr;
  WTClient* made = nullptr;
  std::map<QString, ProjectNode> projects;
  WTImportPlan::ClientTotal total;
  WTClient* client() const { return existing ? existing : made; }
};

template <class T>
T* named(const QList<T*>& candidates, const QString& name) {
  for (T* candidate : candidates)
    if (WTObject::sameName(candidate->name(), name)) return candidate;
  return nullptr;
}

// The time an entry covers, in whole minutes as Tessal counts them.
qint64 minutesOf(const Date& start, const Date& end) {
  return qint64(end.secondsSince1970() / 60) - qint64(start.secondsSince1970() / 60);
}

// The value `valueOf` gives every row of `rows` that has one, where they are all `alike`; none when no row
// has one or they differ, with `varies`.
template <class T, class ValueOf, class Alike>
std::optional<T> sharedValue(const std::vector<const WTImportRow*>& rows, bool& varies, ValueOf valueOf,
                             Alike alike) {
  std::optional<T> shared;
  varies = false;
  for (const WTImportRow* row : rows) {
    const std::optional<T> value = valueOf(*row);
    if (!value) continue;
    if (shared && !alike(*shared, *value)) varies = true;
    if (!shared) shared = value;
  }
  if (varies) return std::nullopt;
  return shared;
}

// The rate every billable row of `rows` that has one shares.
std::optional<Decimal> sharedRate(const std::vector<const WTImportRow*>& rows, bool& varies) {
  return sharedValue<Decimal>(
      rows, varies, [](const WTImportRow& row) { return row.billable ? row.rate : std::nullopt; },
      std::equal_to<Decimal>());
}

// The rate a record's own or its owners' stored rates put in force; none where only the preferences or the
// built-in rate would, which may change after the import and re-bill what it brought.
std::optional<Decimal> storedRateInForce(const WTObject* object) {
  if (!object || object->storedRate()) return object ? object->storedRate() : std::nullopt;
  if (object->entity() == WTEntity::Task)
    return storedRateInForce(static_cast<const WTTask*>(object)->project());
  if (object->entity() == WTEntity::Project)
    return storedRateInForce(static_cast<const WTProject*>(object)->client());
  return std::nullopt;
}

// Gives `object` the rate unless a stored rate puts it in force there already; a record the import did
// not make keeps its own rate, and the rate goes to the level below.
bool placeRate(WTObject* object, bool made, const Decimal& rate) {
  if (storedRateInForce(object) == rate) return true;
  if (!made) return false;
  object->setRate(rate);
  return true;
}

std::vector<const WTImportRow*> rowsOf(const ProjectNode& project) {
  std::vector<const WTImportRow*> rows;
  for (const auto& [key, task] : project.tasks) rows.insert(rows.end(), task.rows.begin(), task.rows.end());
  return rows;
}

std::vector<const WTImportRow*> rowsOf(const ClientNode& client) {
  std::vector<const WTImportRow*> rows;
  for (const auto& [key, project] : client.projects) {
    const std::vector<const WTImportRow*> more = rowsOf(project);
    rows.insert(rows.end(), more.begin(), more.end());
  }
  return rows;
}

// The rate of most of the rows: a task bills one rate for all its entries.
Decimal commonestRate(const std::vector<const WTImportRow*>& rows) {
  std::map<QString, std::pair<int, Decimal>> counts;
  for (const WTImportRow* row : rows) {
    if (!row->rate || !row->billable) continue;
    auto& [count, rate] = counts[row->rate->toString()];
    ++count;
    rate = *row->rate;
  }
  std::pair<int, Decimal> best{0, Decimal()};
  for (const auto& [text, entry] : counts)
    if (entry.first > best.first) best = entry;
  return best.second;
}

QString taskLabel(const WTImportRow& row) {
  return QStringLiteral("%1 › %2").arg(row.project.isEmpty() ? kNoProject : row.project,
                                       row.task.isEmpty() ? kDefaultTask : row.task);
}

// Walks `client`'s records top down with a value the file gives its rows (a rate, a rounding rule): the
// value all of a level's rows share, by `shared(rows, varies)`, is set there by `place(record, made,
// value)` unless it refuses, and the levels below are left alone; where neither client nor project takes
// one, each task's rows go to `atTask(task, value, varies)`.
template <class T, class Shared, class Place, class AtTask>
void placeAtHighestLevel(ClientNode& client, Shared shared, Place place, AtTask atTask) {
  bool varies = false;
  const std::optional<T> clientValue = shared(rowsOf(client), varies);
  if (!clientValue && !varies) return;
  if (clientValue && client.client() && place(client.client(), client.made, *clientValue)) return;
  for (auto& [projectKey, project] : client.projects) {
    const std::optional<T> projectValue = shared(rowsOf(project), varies);
    if (!projectValue && !varies) continue;
    if (projectValue && place(project.project(), project.made, *projectValue)) continue;
    for (auto& [taskKey, task] : project.tasks) {
      const std::optional<T> taskValue = shared(task.rows, varies);
      if (taskValue || varies) atTask(task, taskValue, varies);
    }
  }
}

// A rate as the preview's money reads: in the user's locale, with its currency where there is one (a
// file's rates may be in another currency than the client bills in).
QString rateText(const Decimal& rate, const QString& currency) {
  return MoneyFormat::formatRate(rate, currency) + (currency.isEmpty() ? QString() : u' ' + currency);
}

// The rates the file gives, each set at the highest level across which it holds.
void placeRates(ClientNode& client, WTImportPlan& plan) {
  placeAtHighestLevel<Decimal>(
      client, sharedRate, placeRate, [&](TaskNode& task, const std::optional<Decimal>& shared, bool varies) {
        const Decimal rate = shared ? *shared : commonestRate(task.rows);
        const QString label = taskLabel(*task.rows.front());
        const QString fileRate = rateText(rate, task.rows.front()->currency);
        if (varies)
          plan.notes.append(
              QStringLiteral("the entries of %1 have several rates; the task bills %2").arg(label, fileRate));
        if (!placeRate(task.task(), task.made, rate))
          plan.notes.append(QStringLiteral("%1 keeps its rate %2; the file gives %3")
                                .arg(label,
                                     rateText(task.task()->inheritedRate(), task.task()->billingCurrency()),
                                     fileRate));
      });
}

// The rounding rule every row of `rows` that names one bills by.
std::optional<WTRoundingRule> sharedRounding(const std::vector<const WTImportRow*>& rows, bool& varies) {
  return sharedValue<WTRoundingRule>(
      rows, varies, [](const WTImportRow& row) { return row.rounding; },
      [](const WTRoundingRule& a, const WTRoundingRule& b) { return a.billsLike(b); });
}

// Gives `record` the rule unless it bills by it already; a record the import did not make keeps its own.
bool placeRounding(WTBillingRecord* record, bool made, const WTRoundingRule& rule) {
  if (record->roundingRule().billsLike(rule)) return true;
  if (!made) return false;
  record->setRoundingMinutes(rule.minutes);
  record->setRoundingMode(WTRoundingRule::nameOfMode(rule.mode));
  return true;
}

// The rounding rules the file billed by, each set at the highest level across which it holds, so that
// the store bills the entries as the file did.
void placeRoundings(ClientNode& client, WTImportPlan& plan) {
  placeAtHighestLevel<WTRoundingRule>(
      client, sharedRounding, placeRounding,
      [&](TaskNode& task, const std::optional<WTRoundingRule>& shared, bool varies) {
        const QString label = taskLabel(*task.rows.front());
        if (varies) {
          plan.notes.append(QStringLiteral("the entries of %1 were billed by several rounding rules; the "
                                           "task bills by %2")
                                .arg(label, task.task()->roundingRule().toText()));
        } else if (!placeRounding(task.task(), task.made, *shared)) {
          plan.notes.append(QStringLiteral("%1 keeps its rounding (%2); the file's entries were billed by %3")
                                .arg(label, task.task()->roundingRule().toText(), shared->toText()));
        }
      });
}

// An entry of the same task over the same minutes is the same entry, whichever file brings it again:
// Tessal's own spreadsheet read back in (its entries carry no import id), or another tracker's export of
// work also tracked here.
QString sameEntryKey(const QString& client, const QString& project, const QString& task, const Date& start,
                     const Date& end) {
  return QStringList{client.toCaseFolded(), project.toCaseFolded(), task.toCaseFolded(),
                     QString::number(qint64(start.secondsSince1970() / 60)),
                     QString::number(qint64(end.secondsSince1970() / 60))}
      .join(u'\x1f');
}

QSet<QString> sameEntryKeys(const QList<WTTime*>& times) {
  QSet<QString> keys;
  for (const WTTime* time : times) {
    const WTTask* task = time->task();
    const WTProject* project = task ? task->project() : nullptr;
    if (!project || !time->startDate() || !time->endDate() || time->running()) continue;
    keys.insert(sameEntryKey(project->client() ? project->client()->name() : QString(), project->name(),
                             task->name(), *time->startDate(), *time->endDate()));
  }
  return keys;
}

QString notesFor(const WTImportRow& row) {
  QStringList lines;
  if (!row.notes.isEmpty()) lines.append(row.notes);
  if (!row.tags.isEmpty()) lines.append(QStringLiteral("Tags: %1").arg(row.tags.join(QStringLiteral(", "))));
  // Tessal bills every entry: the mark keeps what the other tracker knew.
  if (!row.billable) lines.append(QStringLiteral("Not billable"));
  return lines.join(u'\n');
}

WTImportPlan run(WTObjectContext& context, const WTImportFile& file, const Options& options, bool make) {
  WTImportPlan plan;
  const QList<WTTime*> times = context.fetch<WTTime>();
  QSet<QString> present;
  present.reserve(times.size() + qsizetype(file.rows.size()));
  for (const WTTime* time : times)
    if (!time->importId().isNull()) present.insert(time->importId());
  QSet<QString> tracked = sameEntryKeys(times);

  const QList<WTClient*> clients = context.fetch<WTClient>();
  const QList<WTProject*> loneProjects =
      context.fetch<WTProject>([](const WTProject* project) { return !project->client(); });
  // A project of a client the store has is looked for among its projects; without a client, among the
  // projects that have none.
  const auto existingProject = [&](WTClient* client, const QString& clientName, const QString& projectName) {
    if (client) return named(client->projects(), projectName);
    return clientName.isEmpty() ? named(loneProjects, projectName) : nullptr;
  };
  struct {
    QSet<const WTClient*> clients;
    QSet<const WTProject*> projects;
    QSet<const WTTask*> tasks;
  } found;  // of the store's records, those the file names
  std::map<QString, ClientNode> nodes;
  std::vector<ClientNode*> order;
  std::vector<std::pair<const WTImportRow*, TaskNode*>> entries;
  std::vector<WTImportRow> stopped;  // running rows given their end; never moved, as rows point into it
  stopped.reserve(
      size_t(std::count_if(file.rows.begin(), file.rows.end(), [](const auto& row) { return !row.end; })));
  for (const WTImportRow& original : file.rows) {
    const WTImportRow* row = &original;
    if (!row->end) {
      if (!options.stopRunning || !row->lastKnown) {
        plan.running.push_back(row);
        continue;
      }
      stopped.push_back(*row);
      stopped.back().end = std::max(*row->lastKnown, row->start);
      row = &stopped.back();
    }
    const QString projectName = row->project.isEmpty() ? kNoProject : row->project;
    const QString taskName = row->task.isEmpty() ? kDefaultTask : row->task;
    const QString sameEntry = sameEntryKey(row->client, projectName, taskName, row->start, *row->end);
    if (present.contains(row->importId) || tracked.contains(sameEntry)) {
      ++plan.alreadyThere;
      // A file imported again still names what it found: the records its entries are filed under.
      WTClient* client = row->client.isEmpty() ? nullptr : named(clients, row->client);
      WTProject* project = existingProject(client, row->client, projectName);
      WTTask* task = project ? named(project->tasks(), taskName) : nullptr;
      if (client) found.clients.insert(client);
      if (project) found.projects.insert(project);
      if (task) found.tasks.insert(task);
      continue;
    }
    present.insert(row->importId);
    tracked.insert(sameEntry);

    auto [clientIt, newClient] = nodes.try_emplace(row->client.toCaseFolded());
    ClientNode& client = clientIt->second;
    if (newClient) {
      client.name = row->client;
      client.total.client = row->client;
      if (!row->client.isEmpty()) client.existing = named(clients, row->client);
      order.push_back(&client);
    }
    auto [projectIt, newProject] = client.projects.try_emplace(projectName.toCaseFolded());
    ProjectNode& project = projectIt->second;
    if (newProject) {
      project.name = projectName;
      project.existing = existingProject(client.existing, row->client, projectName);
    }
    auto [taskIt, newTask] = project.tasks.try_emplace(taskName.toCaseFolded());
    TaskNode& task = taskIt->second;
    if (newTask) {
      task.name = taskName;
      if (project.existing) task.existing = named(project.existing->tasks(), taskName);
    }
    task.rows.push_back(row);
    entries.emplace_back(row, &task);

    const qint64 minutes = minutesOf(row->start, *row->end);
    client.total.minutes += minutes;
    client.total.priced = client.total.priced || (row->billable && (row->rate || row->amount));
    if (!row->billable) client.total.notBillable += minutes;
    // The file's own amount where it gives one (a rounding rule may have billed more than the minutes).
    if (row->billable && row->amount)
      client.total.money += *row->amount;
    else if (row->billable && row->rate)
      client.total.money +=
          Decimal::divide(*row->rate * Decimal(std::int64_t(minutes)), Decimal(60)).value_or(Decimal());
    if (client.total.currency.isEmpty()) client.total.currency = row->currency;
  }

  for (ClientNode* client : order) {
    plan.totals.push_back(client->total);
    if (client->existing)
      found.clients.insert(client->existing);
    else if (!client->name.isEmpty())
      ++plan.clients.created;
    for (auto& [projectKey, project] : client->projects) {
      if (project.existing)
        found.projects.insert(project.existing);
      else
        ++plan.projects.created;
      for (auto& [taskKey, task] : project.tasks) {
        if (task.existing)
          found.tasks.insert(task.existing);
        else
          ++plan.tasks.created;
      }
    }
  }
  plan.clients.reused = int(found.clients.size());
  plan.projects.reused = int(found.projects.size());
  plan.tasks.reused = int(found.tasks.size());
  plan.entries = int(entries.size());
  if (!make) return plan;

  for (ClientNode* client : order) {
    if (!client->name.isEmpty() && !client->existing) {
      client->made = WTClient::insertNewObject(&context);
      client->made->setName(client->name);
      if (!client->total.currency.isEmpty()) client->made->setCurrency(client->total.currency);
    }
    for (auto& [projectKey, project] : client->projects) {
      if (!project.existing) {
        project.made = WTProject::insertNewObject(&context);
        project.made->setName(project.name);
        project.made->setClient(client->client());
      }
      for (auto& [taskKey, task] : project.tasks) {
        if (task.existing) continue;
        task.made = WTTask::insertNewObject(&context);
        task.made->setName(task.name);
        task.made->setProject(project.project());
      }
    }
    placeRates(*client, plan);
    placeRoundings(*client, plan);
  }
  context.reserveForInsertions(WTEntity::Time, entries.size());
  for (const auto& [row, node] : entries) {
    auto* time = WTTime::insertNewObject(&context);
    time->setTask(node->task());
    time->setStartDate(row->start);
    time->setEndDate(row->end);
    if (!row->name.isEmpty()) time->setName(row->name);
    if (const QString notes = notesFor(*row); !notes.isEmpty()) time->setNotes(notes);
    time->setImportId(row->importId);
  }
  return plan;
}

QString counted(int count, const char* one, const char* many) {
  return QStringLiteral("%1 %2").arg(count).arg(QLatin1String(count == 1 ? one : many));
}

}  // namespace

WTImportPlan plan(const WTObjectContext& context, const WTImportFile& file, const Options& options) {
  // Nothing is made when planning: the context is only read.
  return run(const_cast<WTObjectContext&>(context), file, options, false);
}

WTImportPlan apply(WTObjectContext& context, const WTImportFile& file, const Options& options) {
  // Made in one turn of the event loop, the whole import is one step of the desktop's undo.
  const WTUndoManager::NamedStep step(context.undoManager(),
                                      QCoreApplication::translate("WTImport", "Import"));
  return run(context, file, options, true);
}

QString preview(const WTImportFile& file, const WTImportPlan& plan, const QTimeZone& zone) {
  QString out = QStringLiteral("A %1 file").arg(file.format);
  if (!file.mapping.isEmpty()) out += QStringLiteral(" (%1)").arg(file.mapping);
  out += QLatin1Char('\n');
  out += QStringLiteral("New: %1, %2, %3, %4\n")
             .arg(counted(plan.clients.created, "client", "clients"),
                  counted(plan.projects.created, "project", "projects"),
                  counted(plan.tasks.created, "task", "tasks"), counted(plan.entries, "entry", "entries"));
  out += QStringLiteral("Found: %1, %2, %3\n")
             .arg(counted(plan.clients.reused, "client", "clients"),
                  counted(plan.projects.reused, "project", "projects"),
                  counted(plan.tasks.reused, "task", "tasks"));
  out += QStringLiteral("Already there: %1\n").arg(counted(plan.alreadyThere, "entry", "entries"));
  for (const WTImportPlan::ClientTotal& total : plan.totals) {
    out += QStringLiteral("  %1  %2")
               .arg(total.client.isEmpty() ? QStringLiteral("(no client)") : total.client,
                    DurationText::stringWithMinutes(int(total.minutes)));
    if (total.priced) {
      // As the store's own figures are shown: in the user's locale, to the currency's minor unit.
      out += QStringLiteral("  %1%2").arg(
          MoneyFormat::format(total.money, total.currency),
          total.currency.isEmpty() ? QString() : QLatin1Char(' ') + total.currency);
    }
    // The file's money leaves that time out; what Tessal bills for it is not the file's to say.
    if (total.notBillable > 0) {
      out += QStringLiteral("; %1 of it marked not billable, which Tessal bills as well")
                 .arg(DurationText::stringWithMinutes(int(total.notBillable)));
    }
    out += QLatin1Char('\n');
  }
  for (const QString& note : plan.notes) out += QStringLiteral("Note: %1\n").arg(note);
  if (!plan.running.empty()) {
    out += QStringLiteral("Running when the file was written, left out (--stop-running imports them):\n");
    for (const WTImportRow* row : plan.running)
      out +=
          QStringLiteral("  line %1: %2, since %3\n")
              .arg(row->line)
              .arg(taskLabel(*row), row->start.toQDateTime().toTimeZone(zone).toString(u"yyyy-MM-dd HH:mm"));
  }
  if (!file.leftOut.empty()) {
    constexpr size_t kListed = 20;
    out += QStringLiteral("Left out, as only time entries are imported: %1\n")
               .arg(counted(int(file.leftOut.size()), "row", "rows"));
    for (size_t i = 0; i < std::min(kListed, file.leftOut.size()); ++i)
      out += QStringLiteral("  line %1: %2\n").arg(file.leftOut[i].line).arg(file.leftOut[i].reason);
    if (file.leftOut.size() > kListed)
      out += QStringLiteral("  and %1 more\n").arg(file.leftOut.size() - kListed);
  }
  if (!file.problems.empty()) {
    out += QStringLiteral("Rows that cannot be read:\n");
    for (const WTImportProblem& problem : file.problems)
      out += QStringLiteral("  line %1: %2\n").arg(problem.line).arg(problem.reason);
    if (file.moreProblems > 0) out += QStringLiteral("  and %1 more\n").arg(file.moreProblems);
  }
  return out;
}

}  // namespace WTImport
