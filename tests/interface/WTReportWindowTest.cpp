#include "ModelFixture.h"

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
    client->setName("Acme");
    web = projectOfAcme("Website");
    backend = projectOfAcme("Backend");
    design = makeTask(web, "Design");
    api = makeTask(backend, "API");
    for (WTTask* task : {design, api}) task->setRate(Decimal(60));
    makeTime(design, berlin(2024, 3, 3, 9), berlin(2024, 3, 3, 10, 30));
    makeTime(design, berlin(2024, 3, 4, 9), berlin(2024, 3, 4, 10));
    makeTime(api, berlin(2024, 2, 10, 9), berlin(2024, 2, 10, 11));
    ASSERT_TRUE(context->save().ok());
    QFile::remove(WTReportGenerator::userTemplatePath());
  }

  void TearDown() override {
    window.reset();
    QFile::remove(WTReportGenerator::userTemplatePath());
    ModelTest::TearDown();
  }

  WTProject* projectOfAcme(const QString& name) {
    auto* project = WTProject::insertNewObject(context.get());
    project->setName(name);
    project->setClient(client);
    return project;
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

// The segments choose the mode the report is rendered at (here seen through the user's template).
TEST_F(ReportWindowTest, TheSegmentsChooseTheLevelOfDetail) {
  useUserTemplate(
      QStringLiteral("mode={{ mode }} {% for project in projects %}[{{ project.name }}]{% /for %}"));
  openReport({web});
  EXPECT_EQ(window->html(), "mode=0 [Website]");
  EXPECT_EQ(window->segmentedControl()->checkedId(), 0);
  for (int mode : {3, 1, 2}) {
    window->segmentedControl()->button(mode)->click();
    EXPECT_EQ(window->mode(), mode);
    EXPECT_EQ(window->webView()->toPlainText(), QStringLiteral("mode=%1 [Website]").arg(mode));
  }
  EXPECT_TRUE(window->errorBar()->isHidden());
}

TEST_F(ReportWindowTest, ATemplateErrorIsNamedWithItsLineUntilTheNextRender) {
  useUserTemplate(QStringLiteral("<p>fine</p>\n<p>{{ nosuchvariable }}</p>\n{% nosuchmarker %}\n"));
  openReport({web});
  EXPECT_FALSE(window->errorBar()->isHidden());
  const QString bar = window->errorBar()->text();
  EXPECT_TRUE(bar.contains("line 2")) << bar.toStdString();
  EXPECT_TRUE(bar.contains("nosuchvariable")) << bar.toStdString();
  EXPECT_TRUE(bar.contains("1 more")) << bar.toStdString();
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
  projectOfAcme("Later");
  ASSERT_TRUE(context->save().ok());
  EXPECT_TRUE(window->html().contains("[Later]"));
  EXPECT_FALSE(window->html().contains("Elsewhere"));
  EXPECT_EQ(window->windowTitle(), "Report — Acme");
}

// What the lines hold is the CSV export's; the window writes them for its mode to the file chosen, and
// nothing when the choice is cancelled or the folder is missing.
TEST_F(ReportWindowTest, ExportsWriteTheChosenFileWithTheModesLines) {
  openReport({web});
  const QString csv = dir.filePath(QStringLiteral("report.csv"));
  QStringList asked;
  window->setSaveLocationChooser([&](QWidget*, const QString&, const QString& filter, const QString&) {
    asked << filter;
    return asked.size() == 1 ? csv : QString();
  });
  window->setMode(1);
  window->exportCSV();
  QStringList lines = readAll(csv).split(QLatin1Char('\n'), Qt::SkipEmptyParts);
  lines.sort();
  EXPECT_EQ(lines, QStringList({"\"Website\",\"Design\",\"2024-03-03 09:00\",\"01:30\",\"90.00\"",
                                "\"Website\",\"Design\",\"2024-03-04 09:00\",\"01:00\",\"60.00\""}));
  EXPECT_TRUE(asked.front().endsWith("(*.csv)"));
  QFile::remove(csv);
  window->exportCSV();
  EXPECT_EQ(asked.size(), 2);
  EXPECT_FALSE(QFile::exists(csv));

  const QString html = dir.filePath(QStringLiteral("report.html"));
  ASSERT_TRUE(window->saveHTMLToFile(html).ok());
  EXPECT_EQ(readAll(html), window->html());
  const Result<void> refused = window->saveHTMLToFile(dir.filePath(QStringLiteral("missing/report.html")));
  ASSERT_FALSE(refused.ok());
  EXPECT_TRUE(refused.error().message.contains("missing/report.html"));
}

TEST_F(ReportWindowTest, ThePdfHoldsTheReportOnNumberedPages) {
  if (QStandardPaths::findExecutable(QStringLiteral("pdfinfo")).isEmpty())
    GTEST_SKIP() << "poppler-utils missing";
  openReport({web, backend});
  // Two hundred tasks of a day each make many pages; every page carries its number and the last the total.
  for (int i = 0; i < 200; ++i) {
    WTTask* task = makeTask(web, QStringLiteral("Task %1").arg(i));
    task->setRate(Decimal(60));
    makeTime(task, berlin(2024, 3, 6, 8), berlin(2024, 3, 6, 9));
  }
  ASSERT_TRUE(context->save().ok());
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

// How the copy is made is the generator's; the window opens it and shows the user's changes once saved.
TEST_F(ReportWindowTest, EditingTheTemplateOpensTheUsersCopyAndItsChangesShow) {
  UrlCatcher catcher;
  QDesktopServices::setUrlHandler(QStringLiteral("file"), &catcher, "open");
  openReport({web});
  const QString path = WTReportGenerator::userTemplatePath();
  window->editReportTemplate();
  ASSERT_TRUE(QFile::exists(path));
  EXPECT_EQ(catcher.opened, QList<QUrl>{QUrl::fromLocalFile(path)});
  writeFile(path, QStringLiteral("<p>my own report</p>"));
  EXPECT_TRUE(QTest::qWaitFor([&] { return window->html() == "<p>my own report</p>"; }, 5000));
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

TEST_F(RangeAndExportTest, TheRangeMenuOffersItsRangesInOrderAndKeepsTheCustomDaysShown) {
  WTRangePopUpButton button(defaults.get());
  QStringList titles;
  for (int i = 0; i < button.count(); ++i) titles << button.itemText(i);
  EXPECT_EQ(titles, QStringList({"Today", "Yesterday", "This week", "Last week", "This month", "Last month",
                                 "This year", "Last year", "Any date", "", "Custom..."}));
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

  // The chosen days are the predicate's (its bounds are the range predicate's).
  EXPECT_TRUE(
      button.selectedPredicate()(makeTime(design, berlin(2024, 3, 3, 23), berlin(2024, 3, 3, 23, 30))));
  EXPECT_FALSE(button.selectedPredicate()(makeTime(design, berlin(2024, 3, 4, 9), berlin(2024, 3, 4, 10))));

  // Reopening shows the stored dates again.
  dialog = button.showRangeWindow();
  EXPECT_EQ(dialog->beginEdit()->date(), QDate(2024, 3, 3));
  dialog->accept();
  EXPECT_EQ(chosen, 2);
}

TEST_F(RangeAndExportTest, TheExportWritesTheRangeOfTheChosenProjects) {
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
}

}  // namespace

#include "WTReportWindowTest.moc"
