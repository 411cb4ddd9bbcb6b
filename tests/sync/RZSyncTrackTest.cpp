#include "RZSyncTrack.h"

#include "Date.h"
#include "Decimal.h"
#include "KeyPath.h"
#include "RZSyncJSON.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTNote.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"
#include "WTTime.h"

#include <gtest/gtest.h>

#include <QColor>
#include <QDir>
#include <QFile>
#include <QTemporaryDir>

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

class RZSyncTrackTest : public ::testing::Test {
 protected:
  QString path() const { return dir.filePath(QStringLiteral("Tessal.sync")); }
  QTemporaryDir dir;
};

}  // namespace

TEST_F(RZSyncTrackTest, FileHoldsIterationAndTrackAndReadsBack) {
  RZSyncTrack track;
  track.setIteration(12);
  track.insertValues({{"name", "Design"}, {"budget", QVariant::fromValue(dec("12.30"))}}, "T@WTTask");
  track.updateValues({{"endDate", QVariant::fromValue(Date::fromSeconds(1700000000.75))}}, "E@WTTime");
  track.deleteObjectWithId("N@WTNote");
  ASSERT_TRUE(track.writeToFile(path()).ok());

  const QByteArray text = readFile(path());
  EXPECT_TRUE(text.contains("\n  \"track\": {")) << text.toStdString();   // pretty-printed
  EXPECT_TRUE(text.contains("\"budget\": 12.30")) << text.toStdString();  // the money token as written
  EXPECT_EQ(
      nlohmann::json::parse(text.toStdString()),
      nlohmann::json::parse(R"({"iteration":12,"track":{"i":{"T@WTTask":{"budget":12.30,"name":"Design"}},)"
                            R"("u":{"E@WTTime":{"endDate":1700000000}},"x":["N@WTNote"]}})"));

  RZSyncTrack loaded(path());
  EXPECT_EQ(loaded.iteration(), 12);
  EXPECT_EQ(compact(loaded.dictionary()), compact(track.dictionary()));
  EXPECT_TRUE(loaded.entry(Section::Inserted, "T@WTTask")
                  .value("budget")
                  .value<Decimal>()
                  .isIdenticalTo(dec("12.30")));
  // Nothing but the journal is left in the folder.
  EXPECT_EQ(QDir(dir.path()).entryList(QDir::Files), QStringList{"Tessal.sync"});
}

// Missing sections load empty; an unreadable journal is kept aside, byte for byte, and starts over.
TEST(RZSyncTrackFile, LoadsOrKeepsTheFileAside) {
  const struct {
    const char* text;  // null: no file
    qint64 iteration;
    const char* loaded;  // null: kept aside
  } rows[] = {
      {nullptr, 0, R"({"i":{},"u":{},"x":[]})"},
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
    const QString file = folder.filePath(QStringLiteral("Tessal.sync"));
    if (row.text) writeFile(file, row.text);
    LogCapture log;
    RZSyncTrack track(file);
    EXPECT_EQ(track.iteration(), row.iteration);
    EXPECT_EQ(compact(track.dictionary()), row.loaded ? row.loaded : R"({"i":{},"u":{},"x":[]})");
    EXPECT_EQ(log.contains(QStringLiteral("Can not parse json - ")), !row.loaded);
    EXPECT_EQ(QFile::exists(file), row.loaded && row.text);
    EXPECT_EQ(readFile(file + QStringLiteral(".corrupt")), row.loaded ? QByteArray() : QByteArray(row.text));
    EXPECT_EQ(QFile::exists(file + QStringLiteral(".corrupt")), !row.loaded);
  }
}

TEST_F(RZSyncTrackTest, AnEarlierCorruptCopyIsNotOverwritten) {
  writeFile(path(), "first");
  RZSyncTrack first(path());
  writeFile(path(), "second");
  RZSyncTrack second(path());
  EXPECT_EQ(readFile(path() + QStringLiteral(".corrupt")), "first");
  EXPECT_EQ(readFile(path() + QStringLiteral(".corrupt.2")), "second");
}

// A write that fails half-way leaves the previous journal in place and no stray file.
TEST_F(RZSyncTrackTest, FailedWriteKeepsThePreviousFile) {
  RZSyncTrack track;
  track.insertValues({{"name", "small"}}, "A@WTTask");
  ASSERT_TRUE(track.writeToFile(path()).ok());
  const QByteArray before = readFile(path());

  track.insertValues({{"notes", QString(64 * 1024, u'x')}}, "B@WTTask");
  // The kernel refuses to grow any file beyond 4 KiB while the limit holds.
  struct rlimit old {};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &old), 0);
  const auto oldHandler = std::signal(SIGXFSZ, SIG_IGN);
  struct rlimit small = old;
  small.rlim_cur = 4096;
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &small), 0);
  const Result<void> written = track.writeToFile(path());
  setrlimit(RLIMIT_FSIZE, &old);
  std::signal(SIGXFSZ, oldHandler);

  EXPECT_FALSE(written.ok());
  EXPECT_EQ(readFile(path()), before);
  EXPECT_EQ(QDir(dir.path()).entryList(QDir::Files), QStringList{"Tessal.sync"});
  EXPECT_TRUE(track.entries(Section::Inserted).contains("B@WTTask"));  // memory unchanged
  EXPECT_TRUE(track.writeToFile(path()).ok());
  EXPECT_FALSE(track.writeToFile(dir.filePath(QStringLiteral("missing/Tessal.sync"))).ok());
}

TEST(RZSyncTrackTransform, ValuesTakeTheirJSONForm) {
  WTObjectContext context;
  auto* project = context.insertNewObject<WTProject>();
  auto* first = context.insertNewObject<WTTask>();
  auto* second = context.insertNewObject<WTTask>();
  struct Case {
    const char* what;
    QVariant value;
    QString json;  // empty: not journaled
  };
  const Case cases[] = {
      {"date, fraction dropped", QVariant::fromValue(Date::fromSeconds(1700000000.999)), "1700000000"},
      {"date before 1970, toward zero", QVariant::fromValue(Date::fromSeconds(-1.5)), "-1"},
      {"record", KeyPath::variantFromObject(project), QString("\"%1\"").arg(project->uuid())},
      {"ordered relationship", QVariant::fromValue(WTOrderedRelationship{{second, first}}),
       QString("[\"%1\",\"%2\"]").arg(second->uuid(), first->uuid())},
      {"unordered relationship", QVariant::fromValue(WTUnorderedRelationship{{first}}), ""},
      {"decimal", QVariant::fromValue(dec("-0.50")), "-0.50"},
      {"colour", QVariant(QColor(255, 0, 0, 128)), "\"#80ff0000\""},
      {"string", QVariant(QStringLiteral("a\"b")), "\"a\\\"b\""},
      {"boolean", QVariant(true), "true"},
      {"integer", QVariant(90), "90"},
      {"cleared value", QVariant(), "null"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const std::optional<QVariant> transformed = RZSyncTrack::transformedValue(c.value);
    EXPECT_EQ(transformed ? compact(*transformed) : "", c.json.toStdString());
  }
}

// An update of a pending insertion stays one; writing a deleted record undoes the deletion; a cleared
// value is null, one not journaled still leaves an entry.
TEST(RZSyncTrackSections, ChangesCombinePerRecord) {
  RZSyncTrack track;
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
  EXPECT_TRUE(track.isPendingDeletion("D@WTTask"));
  track.updateValues({{"name", "b"}}, "D@WTTask");
  EXPECT_FALSE(track.isPendingDeletion("D@WTTask"));
  EXPECT_TRUE(track.hasChanges());
  track.resetChanges();
  EXPECT_FALSE(track.hasChanges());
}

// Every change is logged for a developer who asks, and for nobody else.
TEST(RZSyncTrackSections, LogLinesOnlyWhenAskedFor) {
  RZSyncTrack track;
  {
    LogCapture quiet;
    track.insertValues({{"name", "Quiet"}}, "Q@WTTask");
    EXPECT_TRUE(quiet.lines.isEmpty()) << quiet.lines.join('\n').toStdString();
  }
  LogCapture log(QStringLiteral("tessal.sync.debug=true"));
  track.insertValues({{"name", "Design"}}, "A@WTTask");
  track.deleteObjectWithId("A@WTTask");
  EXPECT_TRUE(log.contains(QStringLiteral("INSERT(A@WTTask) {\"name\":\"Design\"}")))
      << log.lines.join('\n').toStdString();
  EXPECT_TRUE(log.contains(QStringLiteral("DELETE(A@WTTask)")));
}

// A confirmed save forgets what it carried and nothing the user did while it was on its way.
TEST(RZSyncTrackSections, ConfirmedSaveForgetsOnlyWhatItSentUnchanged) {
  RZSyncTrack track;
  track.insertValues({{"name", "new"}, {"rate", QVariant::fromValue(dec("12.3"))}}, "N@WTTask");
  track.updateValues({{"name", "kept"}, {"notes", "old"}}, "U@WTTask");
  track.updateValues({{"name", "sent"}}, "E@WTTask");
  track.deleteObjectWithId("D@WTNote");
  const QVariantMap sent = track.dictionary();

  // Edits while the request is in flight.
  track.updateValues({{"rate", QVariant::fromValue(dec("12.30"))}}, "N@WTTask");  // same value, other text
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

// The journal as saves of a real context fill it.
class RZSyncTrackContextTest : public ::testing::Test {
 protected:
  void SetUp() override {
    auto store = WTStore::open(dir.filePath(QStringLiteral("Tessal.sqlite")));
    ASSERT_TRUE(store.ok());
    ASSERT_TRUE(context.attachStore(std::move(store.value())).ok());
    context.setChangeJournal(&track);
  }
  template <class T>
  T* make(const char* id) {
    T* object = context.insertNewObject<T>();
    object->setUuid(QString::fromLatin1(id) + u'@' + object->entityName());
    return object;
  }
  // Saves and gives what the save journaled, starting the journal afresh.
  std::string saved() {
    EXPECT_TRUE(context.save().ok());
    const std::string journaled = compact(track.dictionary());
    track.resetChanges();
    return journaled;
  }

  QTemporaryDir dir;
  WTObjectContext context;
  RZSyncTrack track;
};

TEST_F(RZSyncTrackContextTest, SavesReportInsertionsUpdatesAndDeletions) {
  auto* project = make<WTProject>("P");
  project->setName(QStringLiteral("Site"));
  project->setClient(make<WTClient>("C"));
  auto* task = make<WTTask>("T");
  task->setProject(project);
  task->setName(QStringLiteral("Draft"));
  task->setName(QStringLiteral("Design"));  // changed before the save: still one insertion
  task->setBudget(dec("120.50"));
  auto* expense = make<WTExpense>("E");
  expense->setTask(task);
  expense->setStartDate(Date::fromSeconds(1700000000.5));
  expense->setExpense(dec("12.30"));
  // The unordered sides (a task's items, a client's projects) are never journaled.
  EXPECT_EQ(saved(),
            R"({"i":{"C@WTClient":{"archived":false,"uuid":"C@WTClient"},"E@WTExpense":{"archived":false,)"
            R"("expense":12.30,"startDate":1700000000,"task":"T@WTTask","uuid":"E@WTExpense"},)"
            R"("P@WTProject":{"archived":false,"client":"C@WTClient","name":"Site","tasks":["T@WTTask"],)"
            R"("uuid":"P@WTProject"},"T@WTTask":{"archived":false,"budget":120.50,"name":"Design",)"
            R"("project":"P@WTProject","uuid":"T@WTTask"}},"u":{},"x":[]})");
  auto* second = make<WTTask>("S");
  second->setProject(project);
  project->moveTask(second, 0);
  expense->setExpense(dec("7.05"));
  EXPECT_EQ(saved(),
            R"({"i":{"S@WTTask":{"archived":false,"project":"P@WTProject","uuid":"S@WTTask"}},"u":{)"
            R"("E@WTExpense":{"expense":7.05},"P@WTProject":{"tasks":["S@WTTask","T@WTTask"]}},"x":[]})");
  // Cleared values go out as null, so the other devices clear them too.
  task->setBudget(std::nullopt);
  project->setClient(nullptr);
  expense->setNotes(QStringLiteral("n"));
  EXPECT_EQ(saved(),
            R"({"i":{},"u":{"C@WTClient":{},"E@WTExpense":{"notes":"n"},"P@WTProject":{"client":null},)"
            R"("T@WTTask":{"budget":null}},"x":[]})");
  context.deleteObject(expense);
  EXPECT_EQ(saved(), R"({"i":{},"u":{"T@WTTask":{}},"x":["E@WTExpense"]})");
}
