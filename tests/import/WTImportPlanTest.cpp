#include "ModelFixture.h"
#include "WTCSVExport.h"
#include "WTImportPlan.h"

#include <QBuffer>
#include <QFile>

namespace {

class ImportPlanTest : public ModelTest {
 protected:
  static WTImportFile read(QIODevice& device) {
    WTImportFormats::Options options;
    options.zone = QTimeZone("Europe/Berlin");
    Result<WTImportFile> file = WTImportFormats::read(device, options);
    EXPECT_TRUE(file.ok()) << file.error().message.toStdString();
    return file.ok() ? file.value() : WTImportFile();
  }
  static WTImportFile sample(const char* name) {
    QFile file(QStringLiteral(TESSAL_TEST_DATA_DIR "/import/") + QLatin1String(name));
    EXPECT_TRUE(file.open(QIODevice::ReadOnly));
    return read(file);
  }
  WTTime* entryNamed(const QString& name) {
    const QList<WTTime*> times =
        context->fetch<WTTime>([&](const WTTime* time) { return time->name() == name; });
    return times.size() == 1 ? times.first() : nullptr;
  }
  // "client/project/task|notes|minutes", "|running" while it runs; "none" unless one entry has the name.
  std::string entry(const char* name) {
    const WTTime* time = entryNamed(QString::fromUtf8(name));
    if (!time) return "none";
    const WTProject* project = time->task()->project();
    return QStringLiteral("%1/%2/%3|%4|%5%6")
        .arg(project->client() ? project->client()->name() : QString(), project->name(), time->task()->name(),
             time->notes(), QString::number(time->duration()), time->running() ? "|running" : "")
        .toStdString();
  }
};

TEST_F(ImportPlanTest, ReusesRecordsByNameAndASecondImportAddsNothingAndKeepsEdits) {
  makeTask(makeProject(QStringLiteral("website"), makeClient(QStringLiteral("ACME"))),
           QStringLiteral("design"));
  saveAndReopen();

  const WTImportFile file = sample("toggl.csv");
  const WTImportPlan plan = WTImport::plan(*context, file, {});
  EXPECT_FALSE(context->hasChanges());
  EXPECT_EQ(
      std::tuple(plan.clients.created, plan.clients.reused, plan.projects.created, plan.projects.reused,
                 plan.tasks.created, plan.tasks.reused, plan.entries, plan.alreadyThere, plan.running.size()),
      std::tuple(0, 1, 0, 1, 1, 1, 2, 0, size_t(1)));
  ASSERT_EQ(plan.totals.size(), size_t(1));
  EXPECT_EQ(std::pair(plan.totals[0].minutes, plan.totals[0].money), std::pair(qint64(225), Decimal(150)));

  WTImport::apply(*context, file, {});
  // One step of undo takes the whole import back, and redo brings it again.
  WTUndoManager& undo = context->undoManager();
  undo.closeGroup();
  EXPECT_EQ(undo.undoActionName(), QStringLiteral("Import"));
  undo.undo();
  EXPECT_TRUE(context->fetch<WTTime>().isEmpty());
  EXPECT_EQ(context->fetch<WTTask>().size(), 1);
  undo.redo();
  saveAndReopen();
  ASSERT_EQ(context->fetch<WTClient>().size(), 1);
  EXPECT_EQ(entry("Call\nwith client"), "ACME/website/Default Task|Not billable|45");
  ASSERT_EQ(entry("Header, \"hero\" image"), "ACME/website/design|Tags: web, design|180");
  entryNamed(QStringLiteral("Header, \"hero\" image"))->setName(QStringLiteral("Edited here"));
  saveAndReopen();

  // Again, now with the running entry stopped where it had got to: only that one is new.
  const WTImportPlan again = WTImport::apply(*context, file, {.stopRunning = true});
  EXPECT_EQ(std::tuple(again.entries, again.alreadyThere, again.tasks.created, again.projects.created),
            std::tuple(1, 2, 1, 1));
  saveAndReopen();
  EXPECT_TRUE(entryNamed(QStringLiteral("Edited here")));
  EXPECT_EQ(context->fetch<WTTime>().size(), 3);
  EXPECT_EQ(entry("Running thing"), "/Internal/Default Task||30");

  WTImport::apply(*context, file, {.stopRunning = true});
  EXPECT_FALSE(context->hasChanges());
}

// Tessal's spreadsheet of a store, imported into an empty store, gives the same entries: names and notes
// with commas, quotes and line breaks, a project without client, entries past midnight. Read back into
// the store it came from, it adds none.
TEST_F(ImportPlanTest, ASpreadsheetExportImportsIntoAnEmptyStoreAsTheSameEntries) {
  auto* client = makeClient(QStringLiteral("ACME, \"West\""));
  auto* site = makeProject(QStringLiteral("Site; new"), client);
  auto* lone = makeProject(QStringLiteral("Internal"));
  // Billed by their rounding rules, which the file carries: the same money in the other store.
  client->setRoundingMinutes(15);
  client->setRoundingMode("up");
  lone->setRoundingMinutes(30);
  lone->setRoundingMode("down");
  const auto add = [&](WTTask* task, const char* name, const char* notes, Date start, int minutes) {
    WTTime* time = makeTime(task, start, start.addingSeconds(minutes * 60.0));
    time->setName(QString::fromUtf8(name));
    if (*notes) time->setNotes(QString::fromUtf8(notes));
  };
  add(makeTask(site, QStringLiteral("design")), "Header, \"hero\"", "", berlin(2024, 3, 9, 9), 90);
  add(site->tasks().first(), "Call\nwith client", "line one\nline, two", berlin(2024, 3, 9, 23, 30), 44);
  add(makeTask(lone, QStringLiteral("admin")), "=SUM(A1:A2)", "+49 30 1234", berlin(2024, 10, 27, 14, 5), 1);
  add(lone->tasks().first(), "left running over the weekend", "", berlin(2024, 3, 8, 20, 31), 54 * 60);
  const auto entriesOf = [](const WTObjectContext& records) {
    QStringList found;
    for (const WTTime* time : records.fetch<WTTime>()) {
      const WTProject* project = time->task()->project();
      found.append(QStringList{project->client() ? project->client()->name() : QString(), project->name(),
                               time->task()->name(), time->name(), time->notes(),
                               QString::number(qint64(time->startDate()->secondsSince1970())),
                               QString::number(qint64(time->endDate()->secondsSince1970())),
                               QString::number(time->billedDuration())}
                       .join(u'|'));
    }
    found.sort();
    return found.join(u'\n').toStdString();
  };
  QList<WTItem*> items;
  for (WTTime* time : context->fetch<WTTime>()) items.append(time);
  QByteArray exported = WTCSVExport::spreadsheetCSV(items).toUtf8();
  QBuffer buffer(&exported);
  buffer.open(QIODevice::ReadOnly);
  const WTImportFile file = read(buffer);
  EXPECT_EQ(file.format, QStringLiteral("tessal"));
  const WTImportPlan back = WTImport::plan(*context, file, {});
  EXPECT_EQ(std::pair(back.entries, back.alreadyThere), std::pair(0, 4));

  WTObjectContext empty(defaults.get());
  auto store = WTStore::open(dir.filePath(QStringLiteral("empty.sqlite")));
  ASSERT_TRUE(store.ok() && empty.attachStore(std::move(store.value())).ok());
  WTImport::apply(empty, file, {});
  ASSERT_TRUE(empty.save().ok());
  EXPECT_EQ(entriesOf(empty), entriesOf(*context));
}

// Each rate lands on the highest level across which the file keeps it, and nowhere a stored rate would
// pass it down anyway (Four's 100 is set: the built-in rate may be changed); a client that was there keeps
// its own rate.
TEST_F(ImportPlanTest, PlacesRatesWhereTheyHold) {
  auto* five = makeClient(QStringLiteral("Five"));
  five->setRate(Decimal(50));
  auto* seven = makeClient(QStringLiteral("Seven"));
  seven->setCurrency(QStringLiteral("EUR"));
  makeTask(makeProject(QStringLiteral("I"), seven), QStringLiteral("x"))->setRate(Decimal(120));
  QByteArray content =
      "client,project,task,kind,name,date,start,end,duration,billed duration,rate,amount,currency,notes\n"
      "One,A,x,time,e1,2024-01-01,09:00,10:00,,,80,,EUR,\n"
      "One,B,y,time,e2,2024-01-01,10:00,11:00,,,80,,EUR,\n"
      "Two,C,x,time,e3,2024-01-01,09:00,10:00,,,80,,,\n"
      "Two,D,x,time,e4,2024-01-01,09:00,10:00,,,90,,,\n"
      "Two,D,y,time,e5,2024-01-01,10:00,11:00,,,90,,,\n"
      "Three,E,x,time,e6,2024-01-01,09:00,10:00,,,70,,,\n"
      "Three,E,y,time,e7,2024-01-01,10:00,11:00,,,60,,,\n"
      "Three,E,y,time,e8,2024-01-01,11:00,12:00,,,,,,\n"
      "Four,G,x,time,e9,2024-01-01,09:00,10:00,,,100,,,\n"
      "Five,F,x,time,e10,2024-01-01,09:00,10:00,,,60,,,\n"
      "Six,H,x,time,e11,2024-01-01,09:00,10:00,,,1234.5,1500,JPY,\n"
      "Seven,I,x,time,e12,2024-01-01,09:00,10:00,,,200,,USD,\n";
  QBuffer buffer(&content);
  buffer.open(QIODevice::ReadOnly);
  const WTImportFile file = read(buffer);
  // The preview gives the file's amount (rounded up, as Six bills) as the store shows money, and the
  // rates a task keeps with their currencies.
  const QString preview = WTImport::preview(file, WTImport::apply(*context, file, {}), QTimeZone::utc());
  EXPECT_TRUE(preview.contains("  Six  01:00  1,500 JPY\n")) << preview.toStdString();
  EXPECT_TRUE(preview.contains("Note: I › x keeps its rate 120.00 EUR; the file gives 200.00 USD\n"))
      << preview.toStdString();
  QStringList rates;
  const auto rate = [](const WTObject* object) {
    return object->storedRate() ? object->storedRate()->toString() : QStringLiteral("-");
  };
  QList<WTClient*> clients = context->fetch<WTClient>();
  std::sort(clients.begin(), clients.end(), [](auto* a, auto* b) { return a->name() < b->name(); });
  for (const WTClient* client : clients) {
    QString line = client->name() + u' ' + rate(client);
    for (const WTProject* project : client->projects()) {
      line += QStringLiteral(" | %1 %2").arg(project->name(), rate(project));
      for (const WTTask* task : project->tasks())
        line += QStringLiteral(" %1 %2").arg(task->name(), rate(task));
    }
    rates.append(line);
  }
  EXPECT_EQ(rates, QStringList({"Five 50 | F 60 x -", "Four 100 | G - x -", "One 80 | A - x - | B - y -",
                                "Seven - | I - x 120", "Six 1234.5 | H - x -", "Three - | E - x 70 y 60",
                                "Two - | C 80 x - | D 90 x - y -"}));
  EXPECT_EQ(QStringList({clients[2]->currency(), clients[6]->currency()}), QStringList({"EUR", QString()}));
}

}  // namespace
