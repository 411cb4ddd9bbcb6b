#include "ModelFixture.h"

#include "LogCapture.h"
#include "WTCustomRangeDialog.h"
#include "WTExportController.h"
#include "WTRangePopUpButton.h"
#include "WTReportGenerator.h"
#include "WTReportWindowController.h"

#include <QAbstractButton>
#include <QButtonGroup>
#include <QDateEdit>
#include <QDesktopServices>
#include <QDir>
#include <QFile>
#include <QLabel>
#include <QPointer>
#include <QProcess>
#include <QScrollBar>
#include <QStandardPaths>
#include <QTest>
#include <QTextBrowser>
#include <QTextDocument>

namespace {

QString readAll(const QString& path) {
  QFile file(path);
  if (!file.open(QIODevice::ReadOnly)) return QStringLiteral("<unreadable>");
  return QString::fromUtf8(file.readAll());
}

void writeFile(const QString& path, const QString& text) {
  QDir().mkpath(QFileInfo(path).absolutePath());
  QFile file(path);
  ASSERT_TRUE(file.open(QIODevice::WriteOnly | QIODevice::Truncate));
  file.write(text.toUtf8());
}

// Runs a poppler tool; empty when it is not installed or fails.
QString poppler(const QString& tool, const QStringList& arguments) {
  QProcess process;
  process.start(tool, arguments);
  if (!process.waitForFinished(30000) || process.exitStatus() != QProcess::NormalExit ||
      process.exitCode() != 0) {
    return {};
  }
  return QString::fromUtf8(process.readAllStandardOutput());
}

// Receives what the desktop would open, in the desktop's place.
class UrlCatcher : public QObject {
  Q_OBJECT
 public:
  QList<QUrl> opened;
 public slots:
  void open(const QUrl& url) { opened.append(url); }
};

// A client with two projects over a real store file, and a report window on them.
class ReportWindowTest : public ModelTest {
 protected:
  void SetUp() override {
    ModelTest::SetUp();
    setNow(berlin(2024, 3, 20, 12));
    client = WTClient::insertNewObject(context.get());
    client->setName(QStringLiteral("Acme"));
    web = WTProject::insertNewObject(context.get());
    web->setName(QStringLiteral("Website"));
    web->setClient(client);
    backend = WTProject::insertNewObject(context.get());
    backend->setName(QStringLiteral("Backend"));
    backend->setClient(client);
    design = makeTask(web, QStringLiteral("Design"));
    design->setRate(Decimal::fromString(QStringLiteral("60")).value());
    makeTime(design, berlin(2024, 3, 3, 9), berlin(2024, 3, 3, 10, 30))->setName(QStringLiteral("Kick-off"));
    makeTime(design, berlin(2024, 3, 4, 9), berlin(2024, 3, 4, 10))->setName(QStringLiteral("Review"));
    api = makeTask(backend, QStringLiteral("API"));
    api->setRate(Decimal::fromString(QStringLiteral("60")).value());
    makeTime(api, berlin(2024, 2, 10, 9), berlin(2024, 2, 10, 11))->setName(QStringLiteral("Schema"));
    ASSERT_TRUE(context->save().ok());
    QFile::remove(WTReportGenerator::userTemplatePath());
  }

  void TearDown() override {
    window.reset();
    QFile::remove(WTReportGenerator::userTemplatePath());
    ModelTest::TearDown();
  }

  WTReportWindowController* openReport(const QList<WTProject*>& projects) {
    window = std::make_unique<WTReportWindowController>(context.get());
    window->resize(700, 400);
    window->show();
    window->setProjects(projects);
    return window.get();
  }

  static void useUserTemplate(const QString& text) { writeFile(WTReportGenerator::userTemplatePath(), text); }

  WTClient* client = nullptr;
  WTProject* web = nullptr;
  WTProject* backend = nullptr;
  WTTask* design = nullptr;
  WTTask* api = nullptr;
  std::unique_ptr<WTReportWindowController> window;
};

TEST_F(ReportWindowTest, TheSegmentsChooseTheLevelOfDetailAndTheUsersTemplateWins) {
  useUserTemplate(
      QStringLiteral("mode={{ mode }} client={{ client.name }} "
                     "{% for project in projects %}[{{ project.name }}]{% /for %}"));
  openReport({web});
  EXPECT_EQ(window->html(), "mode=0 client=Acme [Website]");
  EXPECT_EQ(window->segmentedControl()->checkedId(), 0);
  for (int mode : {3, 1, 2}) {
    window->segmentedControl()->button(mode)->click();
    EXPECT_EQ(window->mode(), mode);
    EXPECT_EQ(window->html(), QStringLiteral("mode=%1 client=Acme [Website]").arg(mode));
    EXPECT_TRUE(window->webView()->toPlainText().startsWith(QStringLiteral("mode=%1").arg(mode)));
  }
  EXPECT_TRUE(window->errorBar()->isHidden());

  // Without a user template the built-in report is the one rendered.
  QFile::remove(WTReportGenerator::userTemplatePath());
  window->refreshWebContent();
  EXPECT_TRUE(window->html().contains("<html")) << window->html().left(200).toStdString();
  EXPECT_TRUE(window->webView()->toPlainText().contains("Website"));
}

TEST_F(ReportWindowTest, ATemplateErrorIsNamedWithItsLineUntilTheNextRender) {
  LogCapture log;
  useUserTemplate(QStringLiteral("<p>fine</p>\n<p>{{ nosuchvariable }}</p>\n{% nosuchmarker %}\n"));
  openReport({web});
  EXPECT_FALSE(window->errorBar()->isHidden());
  const QString bar = window->errorBar()->text();
  EXPECT_TRUE(bar.contains("line 2")) << bar.toStdString();
  EXPECT_TRUE(bar.contains("nosuchvariable")) << bar.toStdString();
  EXPECT_TRUE(bar.contains("1 more")) << bar.toStdString();
  EXPECT_TRUE(log.contains("Template error: "));
  // The output made before and after the error is still shown.
  EXPECT_TRUE(window->webView()->toPlainText().contains("fine"));

  useUserTemplate(QStringLiteral("<p>mended</p>"));
  window->refreshWebContent();
  EXPECT_TRUE(window->errorBar()->isHidden());
  EXPECT_TRUE(window->webView()->toPlainText().contains("mended"));
}

TEST_F(ReportWindowTest, TheReportFollowsSavesKeepingItsPlaceAndLeavingDeletedProjectsOut) {
  useUserTemplate(
      QStringLiteral("{% for project in projects %}<h1>{{ project.name }} {{ project.duration }}</h1>"
                     "{% /for %}{% for 1 to 300 %}<p>line {{ currentLoop.currentIndex }}</p>{% /for %}"));
  openReport({web, backend});
  QScrollBar* scroll = window->webView()->verticalScrollBar();
  ASSERT_GT(scroll->maximum(), 400);
  scroll->setValue(scroll->maximum() / 2);
  const int place = scroll->value();

  int renders = 0;
  QObject::connect(window.get(), &WTReportWindowController::reportRendered, [&] { ++renders; });
  makeTime(design, berlin(2024, 3, 5, 9), berlin(2024, 3, 5, 9, 30));
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(renders, 1);
  EXPECT_TRUE(window->html().contains("Website 180")) << window->html().left(120).toStdString();
  EXPECT_EQ(scroll->value(), place);

  context->deleteObject(backend);
  ASSERT_TRUE(context->save().ok());
  EXPECT_FALSE(window->html().contains("Backend"));
  EXPECT_EQ(window->projects(), QList<WTProject*>{web});
}

// A long report takes seconds to lay out again: it must do so for what it shows, and only once seen.
TEST_F(ReportWindowTest, OnlyChangesTheReportShowsRenderItAgainAndAHiddenReportWaitsUntilSeen) {
  useUserTemplate(
      QStringLiteral("{% for project in projects %}[{{ project.name }} {{ project.duration }} "
                     "{{ project.cost }}]{% /for %}"));
  auto* elsewhere = WTProject::insertNewObject(context.get());
  elsewhere->setName(QStringLiteral("Elsewhere"));
  WTTask* chores = makeTask(elsewhere, QStringLiteral("Chores"));
  ASSERT_TRUE(context->save().ok());
  openReport({web});
  int renders = 0;
  QObject::connect(window.get(), &WTReportWindowController::reportRendered, [&] { ++renders; });

  makeTime(chores, berlin(2024, 3, 5, 9), berlin(2024, 3, 5, 10));
  backend->setName(QStringLiteral("Server"));
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(renders, 0) << "changes outside the report";

  // An entry moved out of the report is seen through the task it left.
  WTItem* kickOff = design->items().first();
  kickOff->setTask(chores);
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(renders, 1);
  EXPECT_TRUE(window->html().contains("[Website 60 ")) << window->html().toStdString();

  client->setName(QStringLiteral("Acme Ltd"));  // a template may show project.client.name
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(renders, 2);

  window->hide();
  kickOff->setTask(design);
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(renders, 2) << "hidden";
  window->show();
  EXPECT_EQ(renders, 3);
  EXPECT_TRUE(window->html().contains("[Website 150 ")) << window->html().toStdString();
  window->show();
  EXPECT_EQ(renders, 3) << "shown again with nothing new";

  // Costs follow a new default rate, which changes no record and so saves nothing. Design has a rate of
  // its own, so give the project a task without one.
  WTTask* copy = makeTask(web, QStringLiteral("Copy"));
  makeTime(copy, berlin(2024, 3, 6, 9), berlin(2024, 3, 6, 10));
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(renders, 4);
  defaults->setValue(QStringLiteral("WTDefaultRate"), QStringLiteral("100"));
  QCoreApplication::processEvents();
  EXPECT_EQ(renders, 5);
  EXPECT_TRUE(window->html().contains("[Website 210 250")) << window->html().toStdString();
}

// A long report is read into its document on another thread, so the window's thread never stalls for it;
// only the newest render reaches the view, and the reader keeps their place.
TEST_F(ReportWindowTest, ALongReportReachesTheViewFromAnotherThreadNewestFirstKeepingThePlace) {
  const QString longTemplate = QStringLiteral(
      "{% for project in projects %}<h1>{{ project.name }} {{ project.duration }} mode {{ mode }}</h1>"
      "{% /for %}{% for 1 to 4000 %}<p>line {{ currentLoop.currentIndex }} of a long report</p>{% /for %}");
  useUserTemplate(longTemplate);
  openReport({web});
  int shown = 0;
  QObject::connect(window.get(), &WTReportWindowController::reportShown, [&] { ++shown; });
  EXPECT_TRUE(window->isBuildingDocument());
  EXPECT_FALSE(window->webView()->toPlainText().contains("line 3999"));
  ASSERT_TRUE(QTest::qWaitFor([&] { return !window->isBuildingDocument(); }, 20000));
  EXPECT_EQ(shown, 1);
  EXPECT_TRUE(window->webView()->toPlainText().contains("Website 150 mode 0"));
  EXPECT_TRUE(window->webView()->toPlainText().contains("line 3999"));

  QScrollBar* scroll = window->webView()->verticalScrollBar();
  scroll->setValue(scroll->maximum() / 2);
  const int place = scroll->value();
  ASSERT_GT(place, 1000);
  const QPointer<QTextDocument> first = window->webView()->document();
  makeTime(design, berlin(2024, 3, 5, 9), berlin(2024, 3, 5, 9, 30));
  ASSERT_TRUE(context->save().ok());
  EXPECT_TRUE(window->isBuildingDocument());
  EXPECT_EQ(scroll->value(), place) << "the previous report stays while the new one is read";
  ASSERT_TRUE(QTest::qWaitFor([&] { return !window->isBuildingDocument(); }, 20000));
  EXPECT_EQ(shown, 2);
  EXPECT_TRUE(window->webView()->toPlainText().contains("Website 180 mode 0"));
  EXPECT_EQ(scroll->value(), place);
  EXPECT_TRUE(first.isNull()) << "a replaced document is deleted";

  // Two renders in a row: only the second is shown.
  window->setMode(1);
  window->setMode(2);
  ASSERT_TRUE(QTest::qWaitFor([&] { return !window->isBuildingDocument(); }, 20000));
  EXPECT_EQ(shown, 3);
  EXPECT_TRUE(window->webView()->toPlainText().contains("mode 2"));

  // A short render while a long one is being read: the long one never replaces it.
  window->setMode(3);
  useUserTemplate(QStringLiteral("<p>short, mode {{ mode }}</p>"));
  window->refreshWebContent();
  EXPECT_EQ(window->webView()->toPlainText().trimmed(), "short, mode 3");
  ASSERT_TRUE(QTest::qWaitFor([&] { return !window->isBuildingDocument(); }, 20000));
  EXPECT_EQ(window->webView()->toPlainText().trimmed(), "short, mode 3");
}

TEST_F(ReportWindowTest, AClientReportCoversExactlyItsProjectsIncludingOnesAddedLater) {
  useUserTemplate(QStringLiteral("{% for project in projects %}[{{ project.name }}]{% /for %}"));
  window = std::make_unique<WTReportWindowController>(context.get());
  window->show();
  window->setClient(client);
  EXPECT_EQ(window->projects().size(), 2);
  auto* other = WTProject::insertNewObject(context.get());
  other->setName(QStringLiteral("Elsewhere"));  // no client: never in Acme's report
  auto* later = WTProject::insertNewObject(context.get());
  later->setName(QStringLiteral("Later"));
  later->setClient(client);
  ASSERT_TRUE(context->save().ok());
  EXPECT_TRUE(window->html().contains("[Later]"));
  EXPECT_FALSE(window->html().contains("Elsewhere"));
  EXPECT_EQ(window->windowTitle(), "Report — Acme");
}

TEST_F(ReportWindowTest, ExportsWriteTheChosenFileWithTheModesLines) {
  openReport({web});
  const QString csv = dir.filePath(QStringLiteral("report.csv"));
  QStringList asked;
  window->setSaveLocationChooser([&](QWidget*, const QString& title, const QString& filter, const QString&) {
    asked << title + QLatin1Char('|') + filter;
    return csv;
  });
  window->exportCSV();
  EXPECT_EQ(readAll(csv), "\"Website\",\"Design\",\"02:30\",\"150.00\"\n");
  window->setMode(1);
  window->exportCSV();
  QStringList lines = readAll(csv).split(QLatin1Char('\n'));
  lines.sort();
  EXPECT_EQ(lines, QStringList({"", "\"Website\",\"Design\",\"2024-03-03 09:00\",\"01:30\",\"90.00\"",
                                "\"Website\",\"Design\",\"2024-03-04 09:00\",\"01:00\",\"60.00\""}));
  ASSERT_EQ(asked.size(), 2);
  EXPECT_TRUE(asked.front().endsWith("(*.csv)"));

  // A cancelled dialog writes nothing.
  QFile::remove(csv);
  window->setSaveLocationChooser(
      [](QWidget*, const QString&, const QString&, const QString&) { return QString(); });
  window->exportCSV();
  EXPECT_FALSE(QFile::exists(csv));

  const QString html = dir.filePath(QStringLiteral("report.html"));
  ASSERT_TRUE(window->saveHTMLToFile(html).ok());
  EXPECT_EQ(readAll(html), window->html());
  // A folder that does not exist is refused with its name, and nothing is left behind.
  const Result<void> refused = window->saveHTMLToFile(dir.filePath(QStringLiteral("missing/report.html")));
  ASSERT_FALSE(refused.ok());
  EXPECT_TRUE(refused.error().message.contains("missing/report.html"));
}

TEST_F(ReportWindowTest, ThePdfHoldsTheReportOnNumberedPages) {
  if (QStandardPaths::findExecutable(QStringLiteral("pdfinfo")).isEmpty())
    GTEST_SKIP() << "poppler-utils missing";
  openReport({web, backend});
  const QString shortPdf = dir.filePath(QStringLiteral("short.pdf"));
  ASSERT_TRUE(window->savePDFToFile(shortPdf).ok());
  const QString info = poppler(QStringLiteral("pdfinfo"), {shortPdf});
  EXPECT_TRUE(info.contains(QRegularExpression(QStringLiteral("Pages:\\s+1\\n")))) << info.toStdString();
  const QString text =
      poppler(QStringLiteral("pdftotext"), {QStringLiteral("-layout"), shortPdf, QStringLiteral("-")});
  EXPECT_TRUE(text.contains("Website")) << text.toStdString();
  EXPECT_TRUE(text.contains("270.00")) << text.toStdString();  // the grand total: 150.00 + 2 h at 60.00

  // Two hundred tasks of a day each make many pages; every page carries its number and the last the total.
  for (int i = 0; i < 200; ++i) {
    WTTask* task = makeTask(web, QStringLiteral("Task %1").arg(i));
    task->setRate(Decimal::fromString(QStringLiteral("60")).value());
    makeTime(task, berlin(2024, 3, 6, 8), berlin(2024, 3, 6, 9));
  }
  window->refreshWebContent();
  const QString longPdf = dir.filePath(QStringLiteral("long.pdf"));
  ASSERT_TRUE(window->savePDFToFile(longPdf).ok());
  const QRegularExpressionMatch pages = QRegularExpression(QStringLiteral("Pages:\\s+(\\d+)"))
                                            .match(poppler(QStringLiteral("pdfinfo"), {longPdf}));
  ASSERT_TRUE(pages.hasMatch());
  const int count = pages.captured(1).toInt();
  EXPECT_GE(count, 3);
  for (int page = 1; page <= count; ++page) {
    const QString n = QString::number(page);
    const QString pageText =
        poppler(QStringLiteral("pdftotext"),
                {QStringLiteral("-f"), n, QStringLiteral("-l"), n, longPdf, QStringLiteral("-")});
    EXPECT_EQ(pageText.trimmed().split(QLatin1Char('\n')).last().trimmed(), n) << "page " << page;
    if (page == count) {
      EXPECT_TRUE(pageText.contains("12,270.00")) << pageText.toStdString();
    }
  }
  EXPECT_FALSE(QFile::exists(longPdf + ".part"));
}

TEST_F(ReportWindowTest, EditingTheTemplateCopiesTheBuiltInOneOnceAndOpensIt) {
  UrlCatcher catcher;
  QDesktopServices::setUrlHandler(QStringLiteral("file"), &catcher, "open");
  openReport({web});
  const QString path = WTReportGenerator::userTemplatePath();
  window->editReportTemplate();
  ASSERT_TRUE(QFile::exists(path));
  QFile builtIn(WTReportGenerator::builtInTemplatePath());
  ASSERT_TRUE(builtIn.open(QIODevice::ReadOnly));
  EXPECT_EQ(readAll(path), QString::fromUtf8(builtIn.readAll()));
  ASSERT_EQ(catcher.opened.size(), 1);
  EXPECT_EQ(catcher.opened.front(), QUrl::fromLocalFile(path));

  // The user's changes are never overwritten, and the open report shows them once the file changes.
  writeFile(path, QStringLiteral("<p>my own report</p>"));
  EXPECT_TRUE(QTest::qWaitFor([&] { return window->html() == "<p>my own report</p>"; }, 5000));
  window->editReportTemplate();
  EXPECT_EQ(readAll(path), "<p>my own report</p>");
  EXPECT_EQ(catcher.opened.size(), 2);
  QDesktopServices::unsetUrlHandler(QStringLiteral("file"));
}

TEST_F(ReportWindowTest, TheWindowClosesWhenItsContextGoes) {
  openReport({web});
  QPointer<WTReportWindowController> shown = window.release();
  shown->setAttribute(Qt::WA_DeleteOnClose);
  context.reset();
  QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
  EXPECT_TRUE(shown.isNull());
}

// The range chooser and the export dialog.
class RangeAndExportTest : public ReportWindowTest {};

TEST_F(RangeAndExportTest, TheRangeMenuOffersItsRangesInOrderAndCustomCoversItsEndDayWhole) {
  WTRangePopUpButton button(defaults.get());
  QStringList titles;
  QList<int> tags;
  for (int i = 0; i < button.count(); ++i) {
    titles << button.itemText(i);
    tags << (button.itemData(i).isValid() ? button.itemData(i).toInt() : -1);
  }
  EXPECT_EQ(titles, QStringList({"Today", "Yesterday", "This week", "Last week", "This month", "Last month",
                                 "This year", "Last year", "Any date", "", "Custom..."}));
  EXPECT_EQ(tags, QList<int>({0, 1, 2, 3, 4, 5, 6, 7, 21, -1, 20}));
  // The custom range starts out as the last month up to now.
  EXPECT_EQ(button.customRangeBegin(), RZDate::addMonth(clockNow, -1));
  EXPECT_EQ(button.customRangeEnd(), clockNow);

  int chosen = 0;
  QObject::connect(&button, &WTRangePopUpButton::rangeChosen, [&] { ++chosen; });
  button.selectTag(WTRangePredicate::Custom);
  WTCustomRangeDialog* dialog = button.showRangeWindow();
  ASSERT_NE(dialog, nullptr);
  QPointer<WTCustomRangeDialog> watched = dialog;
  dialog->beginEdit()->setDate(QDate(2024, 3, 3));
  dialog->endEdit()->setDate(QDate(2024, 3, 3));
  // Escape dismisses the dialog; the dates it showed stand all the same.
  QTest::keyClick(dialog, Qt::Key_Escape);
  EXPECT_EQ(chosen, 1);
  QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
  EXPECT_TRUE(watched.isNull());
  EXPECT_EQ(button.customRangeBegin(), berlin(2024, 3, 3));
  EXPECT_EQ(button.customRangeEnd(), berlin(2024, 3, 3));

  const WTItemPredicate inRange = button.selectedPredicate();
  ASSERT_TRUE(bool(inRange));
  auto timeAt = [&](Date start) { return makeTime(design, start, start.addingSeconds(60)); };
  EXPECT_TRUE(inRange(timeAt(berlin(2024, 3, 3, 0, 0))));
  EXPECT_TRUE(inRange(timeAt(berlin(2024, 3, 3, 23, 59, 59))));
  EXPECT_FALSE(inRange(timeAt(berlin(2024, 3, 4, 0, 0, 1))));
  EXPECT_FALSE(inRange(timeAt(berlin(2024, 3, 2, 23, 59, 59))));

  // Reopening shows the stored dates again.
  dialog = button.showRangeWindow();
  EXPECT_EQ(dialog->beginEdit()->date(), QDate(2024, 3, 3));
  dialog->accept();
  EXPECT_EQ(chosen, 2);

  // Any date matches an entry that has no date at all.
  button.selectTag(WTRangePredicate::AnyDate);
  auto* undated = WTTime::insertNewObject(context.get());
  undated->setTask(design);
  undated->setStartDate(std::nullopt);
  EXPECT_TRUE(button.selectedPredicate()(undated));
}

TEST_F(RangeAndExportTest, TheExportWritesTheRangeOfTheChosenProjects) {
  LogCapture log(QStringLiteral("tessal.export.debug=true"));
  WTProject* selected = nullptr;
  WTExportController exporter(context.get(), [&] { return selected; });
  exporter.rangeButton()->selectTag(WTRangePredicate::ThisMonth);
  const QString path = dir.filePath(QStringLiteral("times.csv"));
  exporter.setSaveLocationChooser(
      [&](QWidget*, const QString&, const QString&, const QString&) { return path; });

  // "Selected project" without a selection exports every project's entries of the month.
  exporter.projectChoice()->button(WTExportController::SelectedProject)->click();
  exporter.accept();
  QStringList lines = readAll(path).split(QLatin1Char('\n'), Qt::SkipEmptyParts);
  EXPECT_EQ(lines.size(), 2);
  EXPECT_TRUE(lines.front().startsWith("\"Website\",\"Design\",")) << lines.front().toStdString();
  EXPECT_EQ(exporter.result(), QDialog::Accepted);

  selected = backend;
  exporter.rangeButton()->selectTag(WTRangePredicate::LastMonth);
  ASSERT_TRUE(exporter.exportToPath(path).ok());
  lines = readAll(path).split(QLatin1Char('\n'), Qt::SkipEmptyParts);
  ASSERT_EQ(lines.size(), 1);
  EXPECT_TRUE(lines.front().startsWith("\"Backend\",\"API\",")) << lines.front().toStdString();

  // Nothing in range: an empty file and the count 0 in the log.
  exporter.rangeButton()->selectTag(WTRangePredicate::Today);
  ASSERT_TRUE(exporter.exportToPath(path).ok());
  EXPECT_EQ(readAll(path), "");
  EXPECT_TRUE(log.contains(QStringLiteral("Exporting 0 items to: %1").arg(path)));
}

}  // namespace

#include "WTReportWindowTest.moc"
