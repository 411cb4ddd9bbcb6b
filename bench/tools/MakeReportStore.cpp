// Writes the store of the whole-process report benchmark and the same year of intervals as Timewarrior
// data: 100,000 items over 2021–2025, of which the client "Northwind" has exactly 20,000 time entries in
// 2025 (one every 25 minutes, never overlapping) and nothing else, the rest spread over the other clients
// and the five years.
//
// With --rules every client bills time entries rounded up to 15 minutes.
//
//   tessal_make_report_store STORE_PATH TIMEWARRIOR_DB_FOLDER [--rules]
#include "Date.h"
#include "Decimal.h"
#include "WTStore.h"

#include <QByteArray>
#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QMap>
#include <QTextStream>
#include <QTimeZone>

#include <cstdio>
#include <vector>

namespace {

constexpr int kItems = 100000;
constexpr int kNorthwindEntries = 20000;
constexpr int kProjects = 40;
constexpr int kTasks = 400;

WTStoreRecord named(const QString& uuid, const QString& entity, const QString& name) {
  WTStoreRecord record;
  record.uuid = uuid;
  record.entity = entity;
  record.name = name;
  return record;
}

}  // namespace

int main(int argc, char** argv) {
  const bool rules = argc == 4 && QByteArray(argv[3]) == "--rules";
  if (argc != 3 && !rules) {
    std::fputs("usage: tessal_make_report_store STORE_PATH TIMEWARRIOR_DB_FOLDER [--rules]\n", stderr);
    return 2;
  }
  const QString storePath = QString::fromLocal8Bit(argv[1]);
  const QString timewFolder = QString::fromLocal8Bit(argv[2]);
  QFile::remove(storePath);
  auto store = WTStore::open(storePath);
  if (!store) {
    std::fprintf(stderr, "%s\n", qPrintable(store.error().message));
    return 1;
  }

  std::vector<WTStoreRecord> records;
  records.reserve(kItems + kProjects + kTasks + 10);
  // Client 0 is Northwind with projects 0–3 (tasks 0–39); the others share the rest.
  for (int c = 0; c < 5; ++c) {
    WTStoreRecord client = named(QStringLiteral("C%1@WTClient").arg(c), QStringLiteral("WTClient"),
                                 c == 0 ? QStringLiteral("Northwind") : QStringLiteral("Client %1").arg(c));
    client.rate = Decimal::fromString(u"90");
    if (rules) {
      client.roundingMinutes = 15;
      client.roundingMode = QStringLiteral("up");
    }
    records.push_back(client);
  }
  for (int p = 0; p < kProjects; ++p) {
    WTStoreRecord project = named(QStringLiteral("P%1@WTProject").arg(p), QStringLiteral("WTProject"),
                                  QStringLiteral("Project %1").arg(p));
    project.clientUuid = QStringLiteral("C%1@WTClient").arg(p < 4 ? 0 : 1 + p % 4);
    records.push_back(project);
  }
  for (int t = 0; t < kTasks; ++t) {
    WTStoreRecord task = named(QStringLiteral("T%1@WTTask").arg(t), QStringLiteral("WTTask"),
                               QStringLiteral("Task %1").arg(t));
    task.projectUuid = QStringLiteral("P%1@WTProject").arg(t / 10);
    task.position = t % 10;
    records.push_back(task);
  }

  // Northwind's 2025: 20,000 entries of 20 minutes, 25 minutes apart from 1 January on, tasks in turn.
  const QDateTime yearStart(QDate(2025, 1, 1), QTime(0, 0), Qt::UTC);
  QMap<QString, QString> timewMonths;  // "2025-01" -> lines
  for (int i = 0; i < kNorthwindEntries; ++i) {
    const QDateTime start = yearStart.addSecs(qint64(i) * 25 * 60);
    const QDateTime end = start.addSecs(20 * 60);
    const int task = i % 40;
    WTStoreRecord time = named(QStringLiteral("N%1@WTTime").arg(i), QStringLiteral("WTTime"), QString());
    time.taskUuid = QStringLiteral("T%1@WTTask").arg(task);
    time.startDate = Date::fromQDateTime(start);
    time.endDate = Date::fromQDateTime(end);
    records.push_back(time);
    timewMonths[start.toString(u"yyyy-MM")] += QStringLiteral("inc %1 - %2 # \"Task %3\"\n")
                                                   .arg(start.toString(u"yyyyMMdd'T'HHmmss'Z'"),
                                                        end.toString(u"yyyyMMdd'T'HHmmss'Z'"))
                                                   .arg(task);
  }
  // Everything else: the other clients' items over five years.
  const char* kinds[] = {"WTTime", "WTTime", "WTFlat", "WTExpense", "WTNote"};
  const QDateTime fiveYearsStart(QDate(2021, 1, 1), QTime(8, 0), Qt::UTC);
  for (int i = 0; i < kItems - kNorthwindEntries; ++i) {
    const QString kind = QLatin1String(kinds[i % 5]);
    // The other clients' tasks (40 on), through all five years.
    const int task = 40 + i % (kTasks - 40);
    const qint64 span = qint64(5 * 365) * 86400;
    const QDateTime start = fiveYearsStart.addSecs((qint64(i) * 7919 * 60) % span);
    WTStoreRecord item = named(QStringLiteral("I%1@%2").arg(i).arg(kind), kind, QStringLiteral("Item %1").arg(i));
    item.taskUuid = QStringLiteral("T%1@WTTask").arg(task);
    item.startDate = Date::fromQDateTime(start);
    if (kind == QLatin1String("WTTime")) item.endDate = item.startDate->addingSeconds(45 * 60);
    if (kind == QLatin1String("WTFlat")) item.minutes = 30;
    if (kind == QLatin1String("WTExpense")) item.expense = Decimal::fromString(u"12.30");
    records.push_back(item);
  }
  if (const Result<void> saved = store.value()->save(records, {}); !saved) {
    std::fprintf(stderr, "%s\n", qPrintable(saved.error().message));
    return 1;
  }

  QDir().mkpath(timewFolder + QStringLiteral("/data"));
  for (auto month = timewMonths.cbegin(); month != timewMonths.cend(); ++month) {
    QFile file(timewFolder + QStringLiteral("/data/") + month.key() + QStringLiteral(".data"));
    if (!file.open(QIODevice::WriteOnly)) return 1;
    file.write(month.value().toUtf8());
  }
  QFile config(timewFolder + QStringLiteral("/timewarrior.cfg"));
  if (!config.open(QIODevice::WriteOnly)) return 1;
  std::printf("%d records, %d Timewarrior intervals in %lld months\n", int(records.size()), kNorthwindEntries,
              static_cast<long long>(timewMonths.size()));
  return 0;
}
