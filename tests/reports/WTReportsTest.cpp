#include "ModelFixture.h"

#include "KeyPath.h"
#include "LogCapture.h"
#include "MoneyFormat.h"
#include "TestFiles.h"
#include "UserLocale.h"
#include "WTCSVExport.h"
#include "WTItemContainer.h"
#include "WTRangePredicate.h"
#include "WTReportGenerator.h"

#include <QFile>
#include <QJsonArray>
#include <QJsonDocument>
#include <QProcess>
#include <QRegularExpression>

namespace {

QString readAll(const QString& path) {
  return QString::fromUtf8(fileBytes(path));
}

// Acme: "Web "Site"" (Design: entries in March and February, expense, note, to-do), Backend (API: a fee).
class ReportTest : public ModelTest {
 protected:
  void SetUp() override {
    ModelTest::SetUp();
    setNow(berlin(2024, 3, 20, 12));
    client = makeClient(QStringLiteral("Acme"));
    web = makeProject(QStringLiteral("Web \"Site\""), client);
    backend = makeProject(QStringLiteral("Backend"), client);
    design = makeTask(web, QStringLiteral("Design"));
    design->setRate(dec("60"));
    makeTime(design, berlin(2024, 3, 3, 9), berlin(2024, 3, 3, 10, 30))
        ->setName(QStringLiteral("Kick \"off\""));
    makeTime(design, berlin(2024, 3, 3, 14), berlin(2024, 3, 3, 14, 30))->setName(QStringLiteral("Review"));
    makeTime(design, berlin(2024, 2, 10, 10), berlin(2024, 2, 10, 11))->setName(QStringLiteral("Sketch"));
    auto* fonts = makeItem<WTExpense>(design, berlin(2024, 3, 4, 8));
    fonts->setName(QStringLiteral("Fonts"));
    fonts->setExpense(dec("1234.5"));
    makeItem<WTNote>(design, berlin(2024, 3, 5, 8))->setName(QStringLiteral("Call notes"));
    makeItem<WTToDo>(design, berlin(2024, 3, 6, 8))->setName(QStringLiteral("Open question"));
    api = makeTask(backend, QStringLiteral("API"));
    api->setRate(dec("100"));
    auto* setup = makeItem<WTFlat>(api, berlin(2024, 3, 6, 9));
    setup->setName(QStringLiteral("Setup"));
    setup->setMinutes(120);

    // The report sees what was saved: the store is read back from its file, and the records found again.
    const QStringList uuids{client->uuid(), web->uuid(), backend->uuid(), design->uuid(), api->uuid()};
    saveAndReopen();
    client = WTClient::objectWithUUID(uuids[0], context.get());
    web = WTProject::objectWithUUID(uuids[1], context.get());
    backend = WTProject::objectWithUUID(uuids[2], context.get());
    design = WTTask::objectWithUUID(uuids[3], context.get());
    api = WTTask::objectWithUUID(uuids[4], context.get());
    ASSERT_TRUE(client && web && backend && design && api);
  }

  void TearDown() override {
    QFile::remove(WTReportGenerator::userTemplatePath());
    ModelTest::TearDown();
  }

  QList<WTProject*> projects() const { return {web, backend}; }

  const UserLocale user{"en_US"};
  WTClient* client = nullptr;
  WTProject *web = nullptr, *backend = nullptr;
  WTTask *design = nullptr, *api = nullptr;
};

const auto at = [](WTObject* object, const char* path) {
  return KeyPath::valueForKeyPath(KeyPath::variantFromObject(object), QString::fromUtf8(path));
};

}  // namespace

// Valuable items newest first whatever order they were made in; day lines name or count their items.
TEST_F(ReportTest, TasksAnswerTheirItemListsPerMode) {
  EXPECT_EQ(at(design, "itemsWithoutPendingToDos.@count").toInt(), 5);
  EXPECT_EQ(
      QVariantList({at(design, "firstItemDate"), at(design, "lastItemDate"),
                    at(makeTask(web, QStringLiteral("Empty")), "firstItemDate")}),
      QVariantList(
          {QVariant::fromValue(berlin(2024, 2, 10, 10)), QVariant::fromValue(berlin(2024, 3, 4, 8)), {}}));

  WTReportGenerator generator(projects(), 0);
  EXPECT_TRUE(generator.filteredItemsForTask(design, 0).isNull());
  EXPECT_EQ(KeyPath::valueForKeyPath(generator.filteredItemsForTask(design, 1), u"name").toStringList(),
            QStringList({"Fonts", "Review", "Kick \"off\"", "Sketch"}));
  // Day lines name their items once (the note and open to-do have no value) or count them.
  generator.setMode(2);
  const WTReport report = generator.renderText(QStringLiteral(
      "{% for project in projects %}{% for task in project.tasks %}{% for day in task.dailyItems %}"
      "{{ day.date | date_format: \"MM-dd\" }}={% if day.itemNames %}{{ day.itemNames }}{% else %}"
      "#{{ day.items.@count }}{% /if %};{% /for %}{% /for %}{% /for %}"));
  EXPECT_TRUE(report.errors.empty());
  EXPECT_EQ(report.html, QStringLiteral("03-04=Fonts;03-03=Review; Kick \"off\";02-10=Sketch;03-06=Setup;"));
}

// Mode 1 lists items in no promised order: its lines are compared sorted.
TEST_F(ReportTest, ReportCsvIsExactAtEveryMode) {
  const QString web = "\"Web \\\"Site\\\"\",\"Design\",", api = "\"Backend\",\"API\",";
  const QString expected[] = {
      web + "\"03:00\",\"1,414.50\"\n" + api + "\"02:00\",\"200.00\"\n",
      api + "\"2024-03-06 09:00\",\"02:00\",\"200.00\"\n" + web +
          "\"2024-02-10 10:00\",\"01:00\",\"60.00\"\n" + web + "\"2024-03-03 09:00\",\"01:30\",\"90.00\"\n" +
          web + "\"2024-03-03 14:00\",\"00:30\",\"30.00\"\n" + web +
          "\"2024-03-04 08:00\",\"00:00\",\"1,234.50\"\n",
      web + "\"2024-03-04\",\"00:00\",\"1,234.50\"\n" + web + "\"2024-03-03\",\"02:00\",\"120.00\"\n" + web +
          "\"2024-02-10\",\"01:00\",\"60.00\"\n" + api + "\"2024-03-06\",\"02:00\",\"200.00\"\n",
      web + "\"2024-03\",\"02:00\",\"1,354.50\"\n" + web + "\"2024-02\",\"01:00\",\"60.00\"\n" + api +
          "\"2024-03\",\"02:00\",\"200.00\"\n"};
  for (int mode = 0; mode <= 3; ++mode) {
    QString csv = WTCSVExport::reportCSV(projects(), mode);
    if (mode == 1) {
      QStringList lines = csv.split('\n', Qt::SkipEmptyParts);
      lines.sort();
      csv = lines.join('\n') + '\n';
    }
    EXPECT_EQ(csv, expected[mode]) << mode;
  }
  EXPECT_EQ(WTCSVExport::reportCSV({}, 2), QString());
  EXPECT_EQ(WTCSVExport::escapedString(QVariant()), QString(""));
}

TEST_F(ReportTest, TimeExportSortsAndWritesSevenColumns) {
  // A second project whose name sorts first, and an entry of the design task dated before the others.
  auto* alpha = makeProject(QStringLiteral("Alpha"));
  auto* task = makeTask(alpha, QStringLiteral("Zeta"));
  makeTime(task, berlin(2024, 3, 1, 8), berlin(2024, 3, 1, 8, 45))->setName(QStringLiteral("Early"));
  const QString path = dir.filePath(QStringLiteral("times.csv"));
  EXPECT_EQ(WTCSVExport::exportTimes(*context, {}, nullptr, path).value(), 4);
  EXPECT_EQ(readAll(path),
            QStringLiteral(
                "\"Alpha\",\"Zeta\",\"\",\"Early\",\"3/1/24\",\"3/1/24\",\"45\"\n"
                "\"Web \\\"Site\\\"\",\"Design\",\"60\",\"Sketch\",\"2/10/24\",\"2/10/24\",\"60\"\n"
                "\"Web \\\"Site\\\"\",\"Design\",\"60\",\"Kick \\\"off\\\"\",\"3/3/24\",\"3/3/24\",\"90\"\n"
                "\"Web \\\"Site\\\"\",\"Design\",\"60\",\"Review\",\"3/3/24\",\"3/3/24\",\"30\"\n"));

  const WTItemPredicate day = WTRangePredicate::predicateForRangeWord("2024-03-03..2024-03-03").value();
  ASSERT_TRUE(WTCSVExport::exportTimes(*context, day, web, path).ok());
  EXPECT_EQ(readAll(path).count(QLatin1Char('\n')), 2);
  ASSERT_TRUE(WTCSVExport::exportTimes(*context, day, alpha, path).ok());
  EXPECT_TRUE(readAll(path).isEmpty());

  const QString missing = dir.filePath(QStringLiteral("missing-folder/times.csv"));
  const Result<int> failed = WTCSVExport::exportTimes(*context, {}, nullptr, missing);
  EXPECT_TRUE(!failed.ok() && failed.error().message.contains(missing) && !QFile::exists(missing));
}

// The rows as Python's csv module reads the file with its default dialect.
QList<QStringList> rowsReadByPython(const QString& path) {
  QProcess python;
  python.start(QStringLiteral("python3"),
               {QStringLiteral("-c"),
                QStringLiteral("import csv, json, sys\n"
                               "with open(sys.argv[1], newline='', encoding='utf-8') as f:\n"
                               "    json.dump(list(csv.reader(f)), sys.stdout)\n"),
                path});
  EXPECT_TRUE(python.waitForFinished(30000) && python.exitCode() == 0)
      << python.readAllStandardError().toStdString();
  QList<QStringList> rows;
  for (const QJsonValue& row : QJsonDocument::fromJson(python.readAllStandardOutput()).array())
    rows.append(row.toVariant().toStringList());
  return rows;
}

// Quoted only where needed, quotes doubled, CR LF rows; awkward text, minor units and a rounding rule
// come back intact through Python's csv module.
TEST_F(ReportTest, SpreadsheetCsvReadsBackAsColumns) {
  design->setName(QStringLiteral("Design, \"final\""));
  ASSERT_TRUE(client->setValue(QStringLiteral("currency"), QStringLiteral("EUR")));
  client->setRoundingMinutes(15);
  client->setRoundingMode(QStringLiteral("up"));
  WTTime* brief = makeTime(design, berlin(2024, 3, 5, 9), berlin(2024, 3, 5, 9, 7));
  brief->setName(QStringLiteral("Line one\nLine \"two\""));
  brief->setNotes(QStringLiteral("Größe – ½ €\r\nzweite Zeile"));
  WTTime* formula = makeTime(design, berlin(2024, 3, 5, 10), berlin(2024, 3, 5, 11));
  formula->setName(QStringLiteral("=HYPERLINK(\"x\")"));
  formula->setNotes(QStringLiteral("-1"));
  auto* tanaka = makeClient(QStringLiteral("Tanaka 株式会社"));
  ASSERT_TRUE(tanaka->setValue(QStringLiteral("currency"), QStringLiteral("JPY")));
  backend->setClient(tanaka);
  api->setRate(dec("33.33"));  // finer than the yen: kept as it is; 2 hours bill 66.66, so 67 yen

  const QString path = dir.filePath(QStringLiteral("sheet.csv"));
  // Five entries, a fee and an expense; no note, no to-do.
  ASSERT_EQ(WTCSVExport::exportSpreadsheet(*context, {}, nullptr, path).value(), 7);
  const QString site = QStringLiteral("Web \"Site\""), task = design->name();
  const QList<QStringList> expected = {
      WTCSVExport::spreadsheetColumns(),
      {"Acme", site, task, "time", "Sketch", "2024-02-10", "10:00", "11:00", "1:00", "1:00", "60.00", "60.00",
       "EUR", "", "15 up"},
      {"Acme", site, task, "time", "Kick \"off\"", "2024-03-03", "09:00", "10:30", "1:30", "1:30", "60.00",
       "90.00", "EUR", "", "15 up"},
      {"Acme", site, task, "time", "Review", "2024-03-03", "14:00", "14:30", "0:30", "0:30", "60.00", "30.00",
       "EUR", "", "15 up"},
      {"Acme", site, task, "expense", "Fonts", "2024-03-04", "", "", "", "", "", "1234.50", "EUR", "", ""},
      {"Acme", site, task, "time", brief->name(), "2024-03-05", "09:00", "09:07", "0:07", "0:15", "60.00",
       "15.00", "EUR", brief->notes(), "15 up"},
      // Text a spreadsheet would run as a formula stays text.
      {"Acme", site, task, "time", "'=HYPERLINK(\"x\")", "2024-03-05", "10:00", "11:00", "1:00", "1:00",
       "60.00", "60.00", "EUR", "'-1", "15 up"},
      {"Tanaka 株式会社", "Backend", "API", "flat fee", "Setup", "2024-03-06", "", "", "2:00", "2:00",
       "33.33", "67", "JPY", "", ""},
  };
  const QList<QStringList> rows = rowsReadByPython(path);
  ASSERT_EQ(rows.size(), expected.size());
  for (qsizetype i = 0; i < rows.size(); ++i)
    EXPECT_EQ(rows[i].join(u'|').toStdString(), expected[i].join(u'|').toStdString());
  EXPECT_TRUE(
      readAll(path).contains("\r\nAcme,\"Web \"\"Site\"\"\",\"Design, "
                             "\"\"final\"\"\",time,Sketch,2024-02-10,10:00,11:00,1:00,1:00,60.00,"
                             "60.00,EUR,,15 up\r\n"))
      << readAll(path).toStdString();

  const WTItemPredicate days = WTRangePredicate::predicateForRangeWord("2024-03-03..2024-03-04").value();
  EXPECT_EQ(WTCSVExport::exportSpreadsheet(*context, days, web, path).value(), 3);
}

// Every mode over all projects, an empty one and none: every total, no error, no stray rows, escaped names.
TEST_F(ReportTest, BuiltInTemplateRendersEveryModeCleanly) {
  client->setName(QStringLiteral("Smith & <Co>"));
  design->setName(QStringLiteral("a<b"));
  auto* empty = makeProject(QStringLiteral("Not started"));
  makeItem<WTNote>(makeTask(backend, QString()), berlin(2024, 3, 7, 8));
  makeTime(api, berlin(2024, 3, 8, 9), berlin(2024, 3, 8, 9, 45));  // no name
  auto* bare = WTFlat::insertNewObject(context.get());              // unnamed, made today
  bare->setTask(api);
  bare->setMinutes(15);
  for (const QList<WTProject*>& chosen : {QList<WTProject*>{web, backend, empty}, {empty}, {}}) {
    for (int mode = 0; mode <= 3; ++mode) {
      SCOPED_TRACE(testing::Message() << chosen.size() << " projects, mode " << mode);
      const WTReport report = WTReportGenerator(chosen, mode).render();
      ASSERT_TRUE(report.templateRead);
      for (const WTReportTemplateError& error : report.errors)
        ADD_FAILURE() << error.message.toStdString() << " at line " << error.line;
      const QString& html = report.html;
      EXPECT_EQ(
          QList({html.count("class=\"subtotal\""), html.count("<h2>"), html.count("class=\"total\""),
                 html.count("<table") - html.count("</table>"), qsizetype(html.contains("class=\"item\""))}),
          QList<qsizetype>(
              {chosen.size(), chosen.size(), 1, 0, mode > 0 && chosen.size() > 0 && chosen != QList{empty}}))
          << html.toStdString();
      if (chosen.size() < 3) continue;
      // Valued items set the period; the client's total (1,414.50 + 300.00) comes from the model.
      for (const char* text : {"1,714.50", "<h1>Smith &amp; &lt;Co&gt;</h1>",
                               "Period: 10 February 2024 – 20 March 2024", "Report date: 20 March 2024"})
        EXPECT_TRUE(html.contains(QString::fromUtf8(text))) << text;
      EXPECT_TRUE(!html.contains("<Co>") && html.contains("Review") == (mode == 1 || mode == 2));
    }
  }
  const QString items = WTReportGenerator(projects(), 1).render().html,
                months = WTReportGenerator(projects(), 3).render().html;
  for (const char* text : {"Expense: Fonts", "Flat fee: Setup", "Time: Review", ">a&lt;b</td>", ">Time</td>"})
    EXPECT_TRUE(items.contains(QString::fromUtf8(text))) << text;
  EXPECT_TRUE(!items.contains("Open question") && months.contains("3 items") &&  // an expense and a flat fee are items
              months.contains("1 item<"));
  // The named flat fee, the time without a name, the bare flat fee.
  EXPECT_EQ(WTReportGenerator({backend}, 1).render().html.count(QStringLiteral("class=\"item\"")), 3);
  EXPECT_EQ(WTReportGenerator().renderText(QStringLiteral("[{{ missing | html }}]")).html,
            QStringLiteral("[]"));
}

// A period takes the items starting in it (its end is the next period's), at every level and in every
// total; without one ("any") the records answer as they always did.
TEST_F(ReportTest, APeriodLimitsTheListsAndTotalsToItsItems) {
  for (const auto& [name, start] : {std::pair{"Edge in", berlin(2024, 3, 3)},
                                    {"Edge out", berlin(2024, 3, 4)},
                                    {"Eve", berlin(2024, 3, 2, 23, 45)}})
    makeTime(design, start, start.addingSeconds(15 * 60))->setName(QString::fromUtf8(name));
  // What follows a nested loop is guarded by the enclosing loop's variable (an empty loop's end writes).
  const QString text = QStringLiteral(
      "{% for project in projects %}{{ project.name }} {{ project.duration }}m {{ project.cost | decimal }}:"
      "{% for task in project.tasks %} {{ task.name }} {{ task.items.@count }}/{{ task.children.@count }} "
      "{{ task.duration }}m {{ task.cost | decimal }} "
      "[{% for item in task.valuableItems %}{{ item.name }};{% /for %}{% if task %}] days{% /if %}"
      "{% for day in task.dailyItems %} {{ day.date | date_format: \"MM-dd\" }}={{ day.duration }}m{% /for %}"
      "{% if task %} months{% /if %}{% for month in task.monthlyItems %} {{ month.date | date_format: \"MM\" "
      "}}="
      "{{ month.cost | decimal }}{% /for %}{% /for %}{% if project %}\n{% /if %}{% /for %}total "
      "{{ projects.@sum.cost | decimal }} client {{ client.cost | decimal }} {% if period %}"
      "{{ period.begin | date_format: \"MM-dd\" }}..{{ period.end | date_format: \"MM-dd\" }}{% /if %}");
  const std::pair<const char*, const char*> cases[] = {
      // clang-format off
      {"2024-03-03..2024-03-03", "Web \"Site\" 135m 135.00: Design 3/1 135m 135.00 [Review;Kick \"off\";Edge in;] days "
                                 "03-03=135m months 03=135.00\ntotal 135.00 client 135.00 03-03..03-03"},
      {"2024-03-04..2024-03-06", "Web \"Site\" 15m 1,249.50: Design 4/3 15m 1,249.50 [Fonts;Edge out;] days 03-04=15m "
                                 "months 03=1,249.50\nBackend 120m 200.00: API 1/1 120m 200.00 [Setup;] days 03-06=120m "
                                 "months 03=200.00\ntotal 1,449.50 client 1,449.50 03-04..03-06"},
      {"last-month", "Web \"Site\" 60m 60.00: Design 1/1 60m 60.00 [Sketch;] days 02-10=60m months 02=60.00\n"
                     "total 60.00 client 60.00 02-01..02-29"},
      {"2024-01-01..2024-01-31", "total 0.00 client 0.00 01-01..01-31"},
      {"any", "Web \"Site\" 225m 1,459.50: Design 9/6 225m 1,459.50 [Fonts;Edge out;Review;Kick \"off\";Edge in;Eve;"
              "Sketch;] days 03-04=15m 03-03=135m 03-02=15m 02-10=60m months 03=1,399.50 02=60.00\nBackend 120m "
              "200.00: API 1/1 120m 200.00 [Setup;] days 03-06=120m months 03=200.00\ntotal 1,659.50 client 1,659.50 "},
      // clang-format on
  };
  WTReportGenerator generator(projects(), 2);
  for (const auto& [word, expected] : cases) {
    const Result<std::optional<RZDate::Range>> period = WTRangePredicate::boundsForRangeWord(word);
    ASSERT_TRUE(period.ok()) << word;
    generator.setPeriod(period.value());
    const WTReport report = generator.renderText(text);
    EXPECT_TRUE(report.errors.empty()) << word;
    EXPECT_EQ(report.html.toStdString(), expected) << word;
  }
  EXPECT_EQ(WTCSVExport::reportCSV(projects(), 0,
                                   WTRangePredicate::boundsForRangeWord("2024-03-03..2024-03-03").value()),
            "\"Web \\\"Site\\\"\",\"Design\",\"02:15\",\"135.00\"\n");
}

// Three amounts of 138.465 bill 138.47 each: the built-in template's lines add up to its subtotal and
// total (415.41) at every level, where the exact sum rounded once said 415.40. Its head names both sides;
// a budget's line is the whole record's, in a period too.
TEST_F(ReportTest, BuiltInTemplateLinesAddUpToItsTotalsAndItsHeadNamesBothSides) {
  auto* billed = makeProject(QStringLiteral("Billed"), client);
  for (int month : {1, 2, 3}) {
    WTTask* task = makeTask(billed, QStringLiteral("Task %1").arg(month));
    task->setRate(dec("92.31"));
    makeTime(task, berlin(2024, month, 5, 9), berlin(2024, month, 5, 10, 30));
    if (month == 1) task->setBudget(dec("100"));
  }
  billed->setBudget(dec("500"));
  defaults->setValue(QStringLiteral("WTBillingName"), QStringLiteral("Ann <Smith>"));
  defaults->setValue(QStringLiteral("WTBillingAddress"), QStringLiteral("Main St 1\n12345 Town"));
  defaults->setValue(QStringLiteral("WTBillingPaymentTerms"), QStringLiteral("Due in 30 days"));
  client->setAddress(QStringLiteral("\n"));  // left blank
  EXPECT_FALSE(WTReportGenerator({billed}, 0).render().html.contains("class=\"to\""));
  client->setAddress(QStringLiteral("1 Acme Way\nSpringfield"));
  // The amounts of the rows of a kind (their last cell), and their sum.
  const auto amounts = [](const QString& html, const QString& kind) {
    QStringList cells;
    Decimal sum;
    const QRegularExpression row(QStringLiteral("<tr class=\"%1\">.*<td[^>]*>([^<]*)</td></tr>").arg(kind));
    for (auto match = row.globalMatch(html); match.hasNext();) {
      cells << match.next().captured(1);
      sum += Decimal::fromString(QString(cells.last()).remove(u',')).value_or(Decimal(-1000));
    }
    return std::pair(cells, MoneyFormat::format(sum).toStdString());
  };
  // Over February and March, two of them.
  const auto period = WTRangePredicate::boundsForRangeWord(QStringLiteral("2024-02-01..2024-03-31")).value();
  QString html;
  for (const auto& [range, total] :
       {std::pair{std::optional<RZDate::Range>(), "415.41"}, {period, "276.94"}}) {
    for (int mode = 0; mode <= 3; ++mode) {
      WTReportGenerator generator({billed}, mode);
      generator.setPeriod(range);
      html = generator.render().html;
      const QString lines = mode == 0 ? QStringLiteral("task") : QStringLiteral("item");
      EXPECT_EQ(amounts(html, lines).first, QStringList(range ? 2 : 3, QStringLiteral("138.47"))) << mode;
      for (const char* kind : {"task", "item", "subtotal", "total"})
        EXPECT_EQ(amounts(html, kind).second, mode > 0 || kind != QLatin1String("item") ? total : "0.00")
            << mode << kind;
    }
  }
  for (const char* text :
       {"<b>Ann &lt;Smith&gt;</b>", ">Main St 1\n12345 Town</p>", "<b>Acme</b>\n1 Acme Way\nSpringfield</p>",
        ">Due in 30 days</p>", ">92.31</td>", ">Budget to date: 83 % of the budget of 500.00 · 84.59 left</td>"})
    EXPECT_TRUE(html.contains(QString::fromUtf8(text))) << text;
  // Task 1 is outside the period: its budget's line shows in the report over every date.
  html = WTReportGenerator({billed}, 0).render().html;
  EXPECT_TRUE(html.contains(QString::fromUtf8(">Budget to date: 139 % of the budget of 100.00 · 38.47 over</td>")))
      << html.toStdString();
  EXPECT_EQ(html.count("class=\"budget\""), 2);  // tasks 2 and 3 have none
  WTReportGenerator empty({billed}, 0);
  empty.setPeriod(WTRangePredicate::boundsForRangeWord(QStringLiteral("2025-01-01..2025-01-31")).value());
  EXPECT_TRUE(empty.render().html.contains("Projects: none in the period<br>"));
}

// A "level" part is skipped unread elsewhere: an empty loop's end cannot switch output on inside it.
TEST_F(ReportTest, VariablesAndLevelParts) {
  const QVariantMap none = WTReportGenerator().variables();
  EXPECT_TRUE(!none.value("client").isValid() && none.value("projects").toList().isEmpty());
  const QString text = QStringLiteral(
      "{% for project in projects %}[{% level 1 %}one{% /level %}{% level 2 3 %}two-three"
      "{% level 3 %}+three{% /level %}{% /level %}]{% /for %}"
      "{% level 9 %}{% for x in nothing %}{% /for %}<level>{% /level %}|end");
  const char* expected[] = {"[][]", "[one][one]", "[two-three][two-three]",
                            "[two-three+three][two-three+three]"};
  WTReportGenerator generator(projects(), 2);
  EXPECT_EQ(generator.renderText(QStringLiteral("{{ mode }}|{{ client.name }}|{{ projects.@count }}")).html,
            "2|Acme|2");
  for (int mode = 0; mode <= 3; ++mode) {
    generator.setMode(mode);
    const WTReport report = generator.renderText(text);
    EXPECT_TRUE(report.errors.empty()) << mode;
    EXPECT_EQ(report.html, QString::fromLatin1(expected[mode]) + "|end") << mode;
  }
  // A part that would be an error if read is no error where it is skipped; one left open hides the rest.
  generator.setMode(1);
  EXPECT_TRUE(generator.renderText(QStringLiteral("a{% level 2 %}{% /for %}{% /level %}b")).errors.empty());
  EXPECT_FALSE(generator.renderText(QStringLiteral("a{% level 1 %}{% /for %}{% /level %}b")).errors.empty());
  EXPECT_EQ(generator.renderText(QStringLiteral("a{% level 2 %}b{{ mode }}")).html, QStringLiteral("a"));
  EXPECT_EQ(generator.renderText(QStringLiteral("a{% level x %}b{% /level %}c")).html, QStringLiteral("ac"));
}

TEST_F(ReportTest, UserTemplateWinsAndTheCopyNeverOverwrites) {
  const QString user = WTReportGenerator::userTemplatePath();
  ASSERT_FALSE(QFile::exists(user));
  EXPECT_EQ(WTReportGenerator::templatePath(), WTReportGenerator::builtInTemplatePath());

  const Result<QString> copied = WTReportGenerator::copyBuiltInTemplateToUserFolder();
  ASSERT_TRUE(copied.ok()) << copied.error().message.toStdString();
  EXPECT_TRUE(copied.value() == user && readAll(user) == readAll(WTReportGenerator::builtInTemplatePath()));
  writeFile(user, "Mine: {{ mode }} {{ client.name }}");
  ASSERT_TRUE(WTReportGenerator::copyBuiltInTemplateToUserFolder().ok());
  EXPECT_EQ(readAll(user), QStringLiteral("Mine: {{ mode }} {{ client.name }}"));
  EXPECT_EQ(WTReportGenerator(projects(), 3).render().html, QStringLiteral("Mine: 3 Acme"));
}

TEST_F(ReportTest, TemplateErrorsComeBackWithTheirLineAndAreLogged) {
  WTReportGenerator generator(projects(), 1);
  LogCapture log;
  const WTReport report = generator.renderText("<p>one</p>\n<p>two</p>\n{% /for %}\n<p>after</p>");
  ASSERT_FALSE(report.errors.empty());
  EXPECT_TRUE(report.errors.front().line == 3 && !report.errors.front().message.isEmpty());
  EXPECT_TRUE(log.lines.contains(QStringLiteral("Template error: %1").arg(report.errors.front().message)));
  EXPECT_TRUE(report.html.startsWith(QStringLiteral("<p>one</p>")));
}
