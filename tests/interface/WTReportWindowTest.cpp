#include "TestFiles.h"
#include "UiFixture.h"

#include "WTCustomRangeDialog.h"
#include "WTExportController.h"
#include "WTRangePopUpButton.h"
#include "WTReportGenerator.h"
#include "WTReportWindowController.h"
#include "WTSaveLocation.h"

#include <QFileDialog>

namespace {

// The file's lines, sorted.
QStringList linesOf(const QString& path) {
  QFile file(path);
  QStringList lines = file.open(QIODevice::ReadOnly)
                          ? QString(file.readAll()).split(u'\n', Qt::SkipEmptyParts)
                          : QStringList{"<unreadable>"};
  lines.sort();
  return lines;
}

// Acme's Website (Design, 2:30 in March) and Backend (API, 2:00 in February), all at 60 an hour.
class ReportWindowTest : public UiTest {
 protected:
  void SetUp() override {
    UiTest::SetUp();
    setNow(berlin(2024, 3, 20, 12));
    client = makeClient("Acme");
    for (WTProject* project : {web = makeProject("Website"), backend = makeProject("Backend")})
      project->setClient(client);
    design = makeTask(web, "Design");
    api = makeTask(backend, "API");
    for (WTTask* task : {design, api}) task->setRate(Decimal(60));
    makeTime(design, berlin(2024, 3, 3, 9), berlin(2024, 3, 3, 10, 30));
    makeTime(design, berlin(2024, 3, 4, 9), berlin(2024, 3, 4, 10));
    makeTime(api, berlin(2024, 2, 10, 9), berlin(2024, 2, 10, 11));
    save();
    QFile::remove(WTReportGenerator::userTemplatePath());
  }
  void TearDown() override {
    window.reset();
    QFile::remove(WTReportGenerator::userTemplatePath());
    UiTest::TearDown();
  }

  // Opens the window, with the user's template `text` if given; counts renders from then on.
  void openReport(const QList<WTProject*>& projects, const QString& text = {}) {
    if (!text.isEmpty()) writeFile(WTReportGenerator::userTemplatePath(), text.toUtf8());
    window = std::make_unique<WTReportWindowController>(context.get());
    window->resize(700, 400);
    window->show();
    window->setProjects(projects);
    QObject::connect(window.get(), &WTReportWindowController::reportRendered, [this] { ++renders; });
    QObject::connect(window.get(), &WTReportWindowController::reportShown, [this] { ++shown; });
    renders = shown = 0;
  }
  void rerender(const QString& text) {
    writeFile(WTReportGenerator::userTemplatePath(), text.toUtf8());
    window->refreshWebContent();
  }
  QString text() const { return window->webView()->toPlainText(); }
  QScrollBar* scroll() const { return window->webView()->verticalScrollBar(); }
  int scrolledHalfway() {
    scroll()->setValue(scroll()->maximum() / 2);
    EXPECT_GT(scroll()->value(), 200);
    return scroll()->value();
  }
  void save() { ASSERT_TRUE(context->save().ok()); }
  void waitForDocument() {
    ASSERT_TRUE(QTest::qWaitFor([&] { return !window->isBuildingDocument(); }, 20000));
  }

  WTClient* client = nullptr;
  WTProject *web = nullptr, *backend = nullptr;
  WTTask *design = nullptr, *api = nullptr;
  std::unique_ptr<WTReportWindowController> window;
  int renders = 0, shown = 0;
};

// The segments set the mode; a template error shows in the bar until mended; a client covers its projects.
TEST_F(ReportWindowTest, TheSegmentsChooseTheLevelAndATemplateErrorShowsUntilMended) {
  openReport({web}, "mode={{ mode }} {% for project in projects %}[{{ project.name }}]{% /for %}");
  EXPECT_EQ(window->html() + ' ' + QString::number(window->segmentedControl()->checkedId()),
            "mode=0 [Website] 0");
  for (int mode : {3, 1, 2}) {
    window->segmentedControl()->button(mode)->click();
    EXPECT_EQ(QString::number(window->mode()) + ' ' + text(),
              QStringLiteral("%1 mode=%1 [Website]").arg(mode));
  }
  window->setClient(client);
  makeProject("Elsewhere");  // no client: never in Acme's report
  makeProject("Later")->setClient(client);
  save();
  EXPECT_EQ(window->html(), "mode=2 [Website][Backend][Later]");
  EXPECT_EQ(window->windowTitle(), "Report — Acme");
  EXPECT_TRUE(window->errorBar()->isHidden());
  rerender("<p>fine</p>\n<p>{{ nosuchvariable }}</p>\n<p>{{ nosuchother }}</p>\n");
  EXPECT_FALSE(window->errorBar()->isHidden());
  EXPECT_TRUE(window->errorBar()->text().contains("line 2")) << window->errorBar()->text().toStdString();
  EXPECT_TRUE(window->errorBar()->text().contains("(and 1 more)"))
      << window->errorBar()->text().toStdString();
  EXPECT_TRUE(text().contains("fine"));
  EXPECT_FALSE(window->findChild<QPushButton*>("savePDF")->isEnabled());  // nor Print, nor HTML
  rerender("<p>mended</p>");
  EXPECT_TRUE(window->errorBar()->isHidden() && window->findChild<QPushButton*>("savePDF")->isEnabled());
  // Editing opens the user's copy, whose saved changes show; the window goes with its context.
  UrlCatcher catcher;
  QDesktopServices::setUrlHandler("file", &catcher, "open");
  window->editReportTemplate();
  EXPECT_EQ(catcher.opened, QList<QUrl>{QUrl::fromLocalFile(WTReportGenerator::userTemplatePath())});
  writeFile(WTReportGenerator::userTemplatePath(), "<p>my own report</p>");
  EXPECT_TRUE(QTest::qWaitFor([&] { return window->html() == "<p>my own report</p>"; }, 5000));
  QDesktopServices::unsetUrlHandler("file");
  // Asking again for a report that is open brings its window forward, not a second one.
  WTReportWindowController* shown = WTReportWindowController::showReport(context.get(), client);
  EXPECT_EQ(WTReportWindowController::showReport(context.get(), client), shown);
  EXPECT_NE(WTReportWindowController::showReport(context.get(), QList<WTProject*>{web}), shown);
  QPointer<WTReportWindowController> open = window.release();
  open->setAttribute(Qt::WA_DeleteOnClose);
  context.reset();
  QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
  EXPECT_TRUE(open.isNull());
}

// Laying out is slow: only changes the report shows render it, only once seen, keeping the place.
TEST_F(ReportWindowTest, OnlyChangesTheReportShowsRenderItAgainAndAHiddenReportWaitsUntilSeen) {
  WTTask* chores = makeTask(makeProject("Elsewhere"), "Chores");
  save();
  openReport({web, backend},
             "{% for project in projects %}[{{ project.name }} {{ project.duration }} "
             "{{ project.cost }}]{% /for %}{% for 1 to 300 %}<p>line</p>{% /for %}");
  const int place = scrolledHalfway();
  makeTime(chores, berlin(2024, 3, 5, 9), berlin(2024, 3, 5, 10));
  chores->project()->setName("Away");
  save();
  EXPECT_EQ(renders, 0) << "changes outside the report";
  WTItem* kickOff = design->items().first();
  kickOff->setTask(chores);
  save();
  EXPECT_EQ(renders, 1);
  EXPECT_TRUE(window->html().contains("[Website 60 ")) << window->html().toStdString();
  EXPECT_EQ(scroll()->value(), place);
  client->setName("Acme Ltd");  // a template may show project.client.name
  save();
  EXPECT_EQ(renders, 2);
  window->hide();
  kickOff->setTask(design);
  save();
  EXPECT_EQ(renders, 2) << "hidden";
  window->show();
  window->show();
  EXPECT_EQ(renders, 3) << "shown, then shown again with nothing new";
  EXPECT_TRUE(window->html().contains("[Website 150 ")) << window->html().toStdString();
  // A new default rate changes no record, yet costs follow it (Copy has no rate of its own).
  makeTime(makeTask(web, "Copy"), berlin(2024, 3, 6, 9), berlin(2024, 3, 6, 10));
  save();
  defaults->setValue("WTDefaultRate", "100");
  QCoreApplication::processEvents();
  EXPECT_EQ(renders, 5);
  EXPECT_TRUE(window->html().contains("[Website 210 250")) << window->html().toStdString();
  context->deleteObject(backend);
  save();
  EXPECT_FALSE(window->html().contains("Backend"));
  EXPECT_EQ(window->projects(), QList<WTProject*>{web});
}

// A long report is read on another thread; only the newest render reaches the view.
TEST_F(ReportWindowTest, ALongReportReachesTheViewFromAnotherThreadNewestFirstKeepingThePlace) {
  openReport({web},
             "{% for project in projects %}<h1>{{ project.name }} {{ project.duration }} mode {{ mode }}"
             "</h1>{% /for %}{% for 1 to 4000 %}<p>line {{ currentLoop.currentIndex }} of a long report</p>"
             "{% /for %}");
  EXPECT_TRUE(window->isBuildingDocument());
  EXPECT_FALSE(text().contains("line 3999"));
  waitForDocument();
  EXPECT_EQ(shown, 1);
  EXPECT_TRUE(text().contains("Website 150 mode 0") && text().contains("line 3999"));
  const int place = scrolledHalfway();
  const QPointer<QTextDocument> first = window->webView()->document();
  makeTime(design, berlin(2024, 3, 5, 9), berlin(2024, 3, 5, 9, 30));
  save();
  EXPECT_TRUE(window->isBuildingDocument());
  EXPECT_EQ(scroll()->value(), place) << "the previous report stays while the new one is read";
  waitForDocument();
  EXPECT_EQ(shown, 2);
  EXPECT_TRUE(text().contains("Website 180 mode 0"));
  EXPECT_EQ(scroll()->value(), place);
  EXPECT_TRUE(first.isNull()) << "a replaced document is deleted";
  window->setMode(1);
  window->setMode(2);
  waitForDocument();
  EXPECT_EQ(shown, 3);
  EXPECT_TRUE(text().contains("mode 2"));
  window->setMode(3);
  rerender("<p>short, mode {{ mode }}</p>");
  waitForDocument();
  EXPECT_EQ(text().trimmed(), "short, mode 3");
}

// Exports of the mode's lines go to the file chosen (none when cancelled); a long PDF holds every page.
TEST_F(ReportWindowTest, ExportsWriteTheChosenFileWithTheModesLines) {
  openReport({web, backend});
  const QString csv = dir.filePath("report.csv"), html = dir.filePath("report.html");
  QStringList asked;
  window->setSaveLocationChooser([&](QWidget*, const WTSaveRequest& request) {
    asked << request.filter;
    EXPECT_EQ(request.suggestedName, "Report." + request.suffix);  // two projects, every day
    return asked.size() == 1 ? csv : asked.size() == 3 ? html : QString();
  });
  window->setMode(1);
  window->exportCSV();
  const QStringList lines = linesOf(csv);  // what they hold is the CSV export's
  EXPECT_TRUE(lines.size() == 3 && lines[0].startsWith("\"Backend\"") && lines[2].contains("01:00"))
      << lines.join(u'\n').toStdString();
  QFile::remove(csv);
  window->exportCSV();
  EXPECT_EQ(asked.size(), 2);
  EXPECT_FALSE(QFile::exists(csv));
  const Result<void> refused = window->saveHTMLToFile(dir.filePath("missing/report.html"));
  EXPECT_TRUE(!refused.ok() && refused.error().message.contains("missing/report.html"));
  // The period chosen covers the report and its lines: February's entry alone, then every one again.
  WTRangePopUpButton* range = window->rangeButton();
  EXPECT_EQ(range->selectedTag(), WTRangePredicate::AnyDate);
  for (const int tag : {WTRangePredicate::LastMonth, WTRangePredicate::AnyDate}) {
    range->setCurrentIndex(range->findData(tag));
    emit range->activated(range->currentIndex());
    ASSERT_TRUE(window->exportCSVToFile(csv).ok());
    EXPECT_EQ(linesOf(csv).size(), tag == WTRangePredicate::AnyDate ? 3 : 1);
    EXPECT_EQ(window->html().contains("Website"), tag == WTRangePredicate::AnyDate);
  }
  // What is saved is rendered then: three hours of a timer that ran on unsaved since the last render.
  design->toggleTimer();
  window->refreshWebContent();
  clockNow = clockNow.addingSeconds(3 * 3600);
  window->saveHTML();
  EXPECT_EQ(QString::fromUtf8(fileBytes(html)), window->html());
  EXPECT_TRUE(window->html().contains("450.00")) << "7:30 at 60";

  if (QStandardPaths::findExecutable("pdfinfo").isEmpty()) GTEST_SKIP() << "poppler-utils missing";
  for (int i = 0; i < 200; ++i) {  // two hundred tasks of a day each make many pages
    WTTask* task = makeTask(web, QString("Task %1").arg(i));
    task->setRate(Decimal(60));
    makeTime(task, berlin(2024, 3, 6, 8), berlin(2024, 3, 6, 9));
  }
  save();
  const QString pdf = dir.filePath("long.pdf");
  ASSERT_TRUE(window->savePDFToFile(pdf).ok());
  auto poppler = [](const QString& tool, const QStringList& arguments) {
    QProcess process;
    process.start(tool, arguments);
    EXPECT_TRUE(process.waitForFinished(30000) && process.exitCode() == 0) << tool.toStdString();
    return QString::fromUtf8(process.readAllStandardOutput());
  };
  EXPECT_GE(QRegularExpression("Pages:\\s+(\\d+)").match(poppler("pdfinfo", {pdf})).captured(1).toInt(), 3);
  EXPECT_TRUE(poppler("pdftotext", {pdf, "-"}).contains("12,450.00")) << "the whole report, to its total";
  // Each head stands over its column: "Duration" ends where every task's and entry's 01:00 ends.
  QList<double> rights;
  for (const auto& word : QRegularExpression(R"re(xMax="([\d.]+)"[^>]*>(Duration|01:00)<)re")
                              .globalMatch(poppler("pdftotext", {"-bbox", "-l", "1", pdf, "-"})))
    rights << word.captured(1).toDouble();
  ASSERT_GE(rights.size(), 3);
  for (const double right : rights) EXPECT_NEAR(right, rights.first(), 1.0);
}

// Custom days stand when the range dialog is dismissed; the export writes the chosen project's range.
TEST_F(ReportWindowTest, TheRangeMenuKeepsTheCustomDaysShownAndTheExportWritesTheRangeOfTheChosenProjects) {
  WTProject* selected = nullptr;
  WTExportController exporter(context.get(), [&] { return selected; });
  WTRangePopUpButton& button = *exporter.rangeButton();
  using Range = std::pair<std::optional<Date>, std::optional<Date>>;
  auto range = [&] { return Range(button.customRangeBegin(), button.customRangeEnd()); };
  EXPECT_EQ(range(), Range(RZDate::addMonth(clockNow, -1), clockNow));
  int chosen = 0;
  QObject::connect(&button, &WTRangePopUpButton::rangeChosen, [&] { ++chosen; });
  button.selectTag(WTRangePredicate::Custom);
  const QLocale locale;
  QLocale::setDefault(QLocale(QLocale::German, QLocale::Germany));  // a short form with a two-digit year
  WTCustomRangeDialog* dialog = button.showRangeWindow();
  QLocale::setDefault(locale);
  ASSERT_NE(dialog, nullptr);
  dialog->beginEdit()->setSelectedSection(QDateTimeEdit::DaySection);
  QTest::keyClicks(dialog->beginEdit(), "03.03.2024");  // two digits move on by themselves
  // A last day before the first stays as typed while it is typed (never another year), and the range is
  // then that first day.
  dialog->endEdit()->setSelectedSection(QDateTimeEdit::DaySection);
  QTest::keyClicks(dialog->endEdit(), "01.03.2024");
  EXPECT_EQ(dialog->endEdit()->text(), "01.03.2024") << "the whole year, as it is typed";
  QTest::keyClick(dialog, Qt::Key_Escape);
  EXPECT_EQ(chosen, 1);
  EXPECT_EQ(range(), Range(berlin(2024, 3, 3), berlin(2024, 3, 3)));
  EXPECT_EQ(button.currentText().count("2024"), 2);

  const QString path = dir.filePath("times.csv");
  auto recordsIn = [&] {  // each line's project and task
    QStringList records = linesOf(path);
    for (QString& line : records) line = line.section(u',', 0, 1);
    return records.join(u' ');
  };
  QString suggested;
  exporter.setSaveLocationChooser([&](QWidget*, const WTSaveRequest& request) {
    suggested = request.suggestedName;
    return path;
  });
  exporter.projectChoice()->button(WTExportController::SelectedProject)->click();
  exporter.accept();
  EXPECT_EQ(suggested, "Time entries 2024-03-03.csv");
  EXPECT_EQ(suggestedFileName("Web/App", std::nullopt, "pdf"), "Web-App.pdf");
  EXPECT_EQ(exporter.result(), QDialog::Accepted);
  EXPECT_EQ(recordsIn(), "\"Website\",\"Design\"");  // 3 March's entry, not 4 March's
  selected = backend;
  button.selectTag(WTRangePredicate::LastMonth);
  ASSERT_TRUE(exporter.exportToPath(path).ok());
  EXPECT_EQ(recordsIn(), "\"Backend\",\"API\"");
  // The spreadsheet is the other choice, never the one offered first. Its longer note makes the open
  // window taller rather than squeezing the choices above it.
  EXPECT_EQ(exporter.format(), WTCSVExport::Format::Times);
  exporter.show();
  exporter.formatChoice()->setCurrentIndex(1);
  QCoreApplication::processEvents();
  EXPECT_GE(exporter.height(), exporter.layout()->totalHeightForWidth(exporter.width()));
  ASSERT_TRUE(exporter.exportToPath(path).ok());
  const QStringList rows = linesOf(path);
  EXPECT_TRUE(rows.size() == 2 && rows[0].startsWith("Acme,Backend,API,time,,2024-02-10,09:00,11:00,2:00") &&
              rows[1].startsWith("client,project,"))
      << rows.join(u'\n').toStdString();
  // The next export offers what the last one written chose: the custom days and times, then last
  // month's spreadsheet, named as such.
  selected = nullptr;
  for (const bool again : {false, true}) {
    WTExportController next(context.get(), [] { return nullptr; });
    const std::pair chosen(next.rangeButton()->selectedTag(), next.format());
    EXPECT_EQ(chosen, again ? std::pair(int(WTRangePredicate::LastMonth), WTCSVExport::Format::Spreadsheet)
                            : std::pair(int(WTRangePredicate::Custom), WTCSVExport::Format::Times));
    EXPECT_EQ(Range(next.rangeButton()->customRangeBegin(), next.rangeButton()->customRangeEnd()),
              Range(berlin(2024, 3, 3), berlin(2024, 3, 3)));
    exporter.accept();
  }
  EXPECT_TRUE(suggested.startsWith("Spreadsheet ")) << suggested.toStdString();
}

// The save dialog starts in the folder saved into last, never in the folder the program was started from.
TEST(SaveLocationTest, StartsWhereTheLastSaveWent) {
  QTemporaryDir folder;
  QStringList shown;
  for (const char* name : {"first.csv", "second.csv"}) {
    QTimer::singleShot(0, [&, name] {
      auto* dialog = qobject_cast<QFileDialog*>(QApplication::activeModalWidget());
      ASSERT_NE(dialog, nullptr);
      shown << dialog->directory().absolutePath();
      dialog->selectFile(folder.filePath(name));
      QMetaObject::invokeMethod(dialog, "accept");
    });
    EXPECT_EQ(askForSaveLocation(nullptr, {"Export", "CSV files (*.csv)", "csv", name}),
              folder.filePath(name));
  }
  ASSERT_EQ(shown.size(), 2);
  EXPECT_NE(shown[0], QDir::currentPath());
  EXPECT_EQ(shown[1], folder.path());
}

}  // namespace
