#include "RZSyncTrack.h"

#include "Date.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QColor>
#include <QDir>
#include <QFile>

#include <nlohmann/json.hpp>

#include <sys/resource.h>
#include <csignal>

using synctest::compact;
using synctest::dec;
using Section = RZSyncTrack::Section;

namespace {

QByteArray readFile(const QString& path) {
  QFile file(path);
  return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
}
void writeFile(const QString& path, const QByteArray& bytes) {
  QFile file(path);
  ASSERT_TRUE(file.open(QIODevice::WriteOnly | QIODevice::Truncate));
  file.write(bytes);
}
constexpr const char* kEmpty = R"({"i":{},"u":{},"x":[]})";

}  // namespace

// Written pretty and read back the same; a write that fails half-way leaves the previous file alone.
TEST(RZSyncTrackFile, HoldsIterationAndTrackAndKeepsItThroughAFailedWrite) {
  QTemporaryDir dir;
  const QString path = dir.filePath("Tessal.sync");
  RZSyncTrack track;
  track.setIteration(12);
  track.insertValues({{"name", "Design"}, {"budget", synctest::money("12.30")}}, "T@WTTask");
  track.updateValues({{"endDate", QVariant::fromValue(Date::fromSeconds(1700000000.75))}}, "E@WTTime");
  track.deleteObjectWithId("N@WTNote");
  ASSERT_TRUE(track.writeToFile(path).ok());
  const QByteArray text = readFile(path);
  EXPECT_TRUE(text.contains("\n  \"track\": {") && text.contains("\"budget\": 12.30")) << text.toStdString();
  EXPECT_EQ(
      nlohmann::json::parse(text.toStdString()),
      nlohmann::json::parse(R"({"iteration":12,"track":{"i":{"T@WTTask":{"budget":12.30,"name":"Design"}},)"
                            R"("u":{"E@WTTime":{"endDate":1700000000}},"x":["N@WTNote"]}})"));
  RZSyncTrack loaded(path);
  EXPECT_EQ(loaded.iteration(), 12);
  EXPECT_EQ(compact(loaded.dictionary()), compact(track.dictionary()));
  EXPECT_TRUE(loaded.entry(Section::Inserted, "T@WTTask")
                  .value("budget")
                  .value<Decimal>()
                  .isIdenticalTo(dec("12.30")));

  track.insertValues({{"notes", QString(64 * 1024, u'x')}}, "B@WTTask");
  struct rlimit old {};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &old), 0);
  const auto oldHandler = std::signal(SIGXFSZ, SIG_IGN);
  struct rlimit small = old;
  small.rlim_cur = 4096;
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &small), 0);
  const Result<void> written = track.writeToFile(path);
  setrlimit(RLIMIT_FSIZE, &old);
  std::signal(SIGXFSZ, oldHandler);
  EXPECT_FALSE(written.ok());
  EXPECT_EQ(readFile(path), text);
  EXPECT_EQ(QDir(dir.path()).entryList(QDir::Files), QStringList{"Tessal.sync"});
  EXPECT_TRUE(track.entries(Section::Inserted).contains("B@WTTask"));  // memory unchanged
  EXPECT_TRUE(track.writeToFile(path).ok());
  EXPECT_FALSE(track.writeToFile(dir.filePath("missing/Tessal.sync")).ok());
}

// An unreadable journal is kept aside, byte for byte (an earlier copy too), and starts over.
TEST(RZSyncTrackFile, LoadsOrKeepsTheFileAside) {
  const struct {
    const char* text;  // null: no file
    qint64 iteration;
    const char* loaded;  // null: kept aside
  } rows[] = {
      {nullptr, 0, kEmpty},
      {R"({"iteration": 3, "track": {"u": {"A@WTTask": {"name": "a"}}}})", 3,
       R"({"i":{},"u":{"A@WTTask":{"name":"a"}},"x":[]})"},
      {"", 0, nullptr},
      {"{\"iteration\": 3, \"track\": {\"i\": {", 0, nullptr},  // cut short
      {"[1, 2]", 0, nullptr},
      {R"({"iteration": "7", "track": {}})", 0, nullptr},
      {R"({"iteration": 7, "track": []})", 0, nullptr},
      {R"({"iteration": 7, "track": {"i": {"A@WTTask": 5}}})", 0, nullptr},
      {R"({"iteration": 7, "track": {"x": ["A@WTTask", 5]}})", 0, nullptr},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.text ? row.text : "(no file)");
    QTemporaryDir folder;
    const QString file = folder.filePath("Tessal.sync");
    if (row.text) writeFile(file, row.text);
    LogCapture log;
    RZSyncTrack track(file);
    EXPECT_EQ(track.iteration(), row.iteration);
    EXPECT_EQ(compact(track.dictionary()), row.loaded ? row.loaded : kEmpty);
    EXPECT_EQ(log.contains("Can not parse json - "), !row.loaded);
    EXPECT_EQ(QFile::exists(file), row.loaded && row.text);
    EXPECT_EQ(readFile(file + ".corrupt"), row.loaded ? QByteArray() : QByteArray(row.text));
    EXPECT_EQ(QFile::exists(file + ".corrupt"), !row.loaded);
    if (row.loaded) continue;
    writeFile(file, "second");
    RZSyncTrack second(file);
    EXPECT_EQ(readFile(file + ".corrupt.2"), "second");
  }
}

// Values the other tests do not journal: dates before 1970 (toward zero), colours.
TEST(RZSyncTrackTransform, ValuesTakeTheirJSONForm) {
  const std::pair<QVariant, std::string> cases[] = {
      {QVariant::fromValue(Date::fromSeconds(-1.5)), "-1"},
      {QVariant(QColor(255, 0, 0, 128)), "\"#80ff0000\""},
  };
  for (const auto& [value, json] : cases)
    EXPECT_EQ(compact(RZSyncTrack::transformedValue(value).value()), json);
}

// Changes combine per record, logged only for a developer who asks, and leave once confirmed.
TEST(RZSyncTrackSections, ChangesCombinePerRecord) {
  RZSyncTrack track;
  LogCapture quiet;
  track.insertValues({{"name", "q"}}, "Q@WTTask");
  EXPECT_TRUE(quiet.lines.isEmpty()) << quiet.lines.join('\n').toStdString();
  track.resetChanges();
  LogCapture log(QStringLiteral("tessal.sync.debug=true"));
  track.insertValues({{"name", "a"}, {"notes", "n"}}, "A@WTTask");
  track.updateValues({{"name", "b"}, {"rate", 50}}, "A@WTTask");
  track.updateValues({{"name", "a"}}, "D@WTTask");
  track.deleteObjectWithId("D@WTTask");
  track.deleteObjectWithId("D@WTTask");
  track.deleteObjectWithId({});
  track.updateValues({{"items", QVariant::fromValue(WTUnorderedRelationship{})}}, "B@WTTask");
  track.updateValues({{"rate", synctest::money("5")}}, "C@WTTask");
  track.updateValues({{"rate", QVariant()}}, "C@WTTask");
  EXPECT_EQ(compact(track.dictionary()),
            R"({"i":{"A@WTTask":{"name":"b","notes":"n","rate":50}},)"
            R"("u":{"B@WTTask":{},"C@WTTask":{"rate":null},"D@WTTask":{"name":"a"}},"x":["D@WTTask"]})");
  EXPECT_TRUE(log.contains("INSERT(A@WTTask) {\"name\":\"a\",\"notes\":\"n\"}") &&
              log.contains("DELETE(D@WTTask)"))
      << log.lines.join('\n').toStdString();
  EXPECT_TRUE(track.isPendingDeletion("D@WTTask"));
  track.updateValues({{"name", "b"}}, "D@WTTask");
  EXPECT_FALSE(track.isPendingDeletion("D@WTTask"));
  track.resetChanges();
  EXPECT_FALSE(track.hasChanges());

  // A confirmed save forgets what it carried and nothing the user did while it was on its way.
  track.insertValues({{"name", "new"}, {"rate", synctest::money("12.3")}}, "N@WTTask");
  track.updateValues({{"name", "kept"}, {"notes", "old"}}, "U@WTTask");
  track.updateValues({{"name", "sent"}}, "E@WTTask");
  track.deleteObjectWithId("D@WTNote");
  const QVariantMap sent = track.dictionary();
  track.updateValues({{"rate", synctest::money("12.30")}}, "N@WTTask");  // same value, other text
  track.updateValues({{"notes", "newer"}, {"archived", true}}, "U@WTTask");
  track.deleteObjectWithId("L@WTNote");
  track.removeSentChanges(sent);
  EXPECT_EQ(
      compact(track.dictionary()),
      R"({"i":{},"u":{"N@WTTask":{"rate":12.30},"U@WTTask":{"archived":true,"notes":"newer"}},"x":["L@WTNote"]})");
  // Without edits in between, nothing is left, an entry without keys included.
  track.updateValues({{"items", QVariant::fromValue(WTUnorderedRelationship{})}}, "E@WTTask");
  track.removeSentChanges(track.dictionary());
  EXPECT_FALSE(track.hasChanges());
}

// Saves fill the journal; unordered sides are left out and cleared values go out as null.
TEST(RZSyncTrackContext, SavesReportInsertionsUpdatesAndDeletions) {
  QTemporaryDir dir;
  WTObjectContext context;
  auto store = WTStore::open(dir.filePath("Tessal.sqlite"));
  ASSERT_TRUE(store.ok() && context.attachStore(std::move(store.value())).ok());
  RZSyncTrack track;
  context.setChangeJournal(&track);
  const auto make = [&]<class T>(T*, const char* id) {
    T* object = context.insertNewObject<T>();
    object->setUuid(QString::fromLatin1(id) + u'@' + object->entityName());
    return object;
  };
  const auto saved = [&] {  // what the save journaled, starting the journal afresh
    EXPECT_TRUE(context.save().ok());
    const std::string journaled = compact(track.dictionary());
    track.resetChanges();
    return journaled;
  };
  auto* project = make((WTProject*)nullptr, "P");
  project->setName("Site");
  project->setClient(make((WTClient*)nullptr, "C"));
  auto* task = make((WTTask*)nullptr, "T");
  task->setProject(project);
  task->setName("Draft");
  task->setName("Design");  // changed before the save: still one insertion
  task->setBudget(dec("120.50"));
  auto* expense = make((WTExpense*)nullptr, "E");
  expense->setTask(task);
  expense->setStartDate(Date::fromSeconds(1700000000.5));
  expense->setExpense(dec("12.30"));
  EXPECT_EQ(saved(),
            R"({"i":{"C@WTClient":{"archived":false,"uuid":"C@WTClient"},"E@WTExpense":{"archived":false,)"
            R"("expense":12.30,"startDate":1700000000,"task":"T@WTTask","uuid":"E@WTExpense"},)"
            R"("P@WTProject":{"archived":false,"client":"C@WTClient","name":"Site","tasks":["T@WTTask"],)"
            R"("uuid":"P@WTProject"},"T@WTTask":{"archived":false,"budget":120.50,"name":"Design",)"
            R"("project":"P@WTProject","uuid":"T@WTTask"}},"u":{},"x":[]})");
  auto* second = make((WTTask*)nullptr, "S");
  second->setProject(project);
  project->moveTask(second, 0);
  expense->setExpense(dec("7.05"));
  EXPECT_EQ(saved(),
            R"({"i":{"S@WTTask":{"archived":false,"project":"P@WTProject","uuid":"S@WTTask"}},"u":{)"
            R"("E@WTExpense":{"expense":7.05},"P@WTProject":{"tasks":["S@WTTask","T@WTTask"]}},"x":[]})");
  task->setBudget(std::nullopt);
  project->setClient(nullptr);
  expense->setNotes("n");
  EXPECT_EQ(saved(),
            R"({"i":{},"u":{"C@WTClient":{},"E@WTExpense":{"notes":"n"},"P@WTProject":{"client":null},)"
            R"("T@WTTask":{"budget":null}},"x":[]})");
  context.deleteObject(expense);
  EXPECT_EQ(saved(), R"({"i":{},"u":{"T@WTTask":{}},"x":["E@WTExpense"]})");
}
