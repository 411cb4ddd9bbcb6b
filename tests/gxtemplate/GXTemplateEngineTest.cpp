#include "../fuzz/TemplateFuzzInput.h"
#include "GXTemplateStandardFilters.h"
#include "RXRegex.h"
#include "RZDate.h"
#include "TestFiles.h"

#include <QColor>
#include <QDir>
#include <QFile>
#include <QStringEncoder>
#include <QTemporaryDir>

#include <unicode/locid.h>

#include <fstream>
#include <vector>

// Readable failure messages for texts.
inline void PrintTo(const QString& text, std::ostream* out) {
  *out << '"' << text.toStdString() << '"';
}

namespace {

// Records everything the engine tells its delegate.
class RecordingDelegate : public GXTemplateEngineDelegate {
 public:
  struct Error {
    int code;
    QString message;
    bool continuing;
  };
  void templateEngineBlockStarted(GXTemplateEngine*, const GXBlockInfo& b) override {
    events << "start " + b.name;
    started.push_back(b);
  }
  void templateEngineBlockEnded(GXTemplateEngine*, const GXBlockInfo& b) override {
    events << "end " + b.name;
  }
  void templateEngineFinishedProcessingTemplate(GXTemplateEngine*) override { events << "finished"; }
  void templateEngineEncounteredError(GXTemplateEngine*, const GXTemplateError& error,
                                      bool continuing) override {
    EXPECT_EQ(error.domain, "GXTemplateEngineErrorDomain");
    errors.push_back({int(error.code), error.localizedDescription, continuing});
  }
  QString codes() const {  // as "4 3"
    QStringList result;
    for (const Error& error : errors) result << QString::number(error.code);
    return result.join(' ');
  }
  std::vector<Error> errors;
  QStringList events;
  std::vector<GXBlockInfo> started;
};

// An engine with the ICU matcher and a recording delegate, as the report window sets one up.
class TemplateTest : public ::testing::Test {
 protected:
  TemplateTest() {
    engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
    engine.setDelegate(&delegate);
  }
  ~TemplateTest() override {  // for the tests that move the clock or the zone
    Date::setClockForTesting({});
    RZDate::setDefaultTimeZone("UTC");
  }
  QString render(const QString& text, const QVariantMap& variables = {}) {
    delegate.errors.clear();
    delegate.events.clear();
    return engine.processTemplate(text, variables);
  }
  GXTemplateEngine engine;
  RecordingDelegate delegate;
};

// Misbehaves on request: "both" begins and ends, "noend" lacks end markers, "jump" resumes past the end.
class ProbeMarkers : public GXTemplateMarker {
 public:
  explicit ProbeMarkers(QStringList names) : names_(std::move(names)) {}
  QStringList markers() const override { return names_; }
  std::optional<QStringList> endMarkersForMarker(const QString&) const override { return std::nullopt; }
  QVariant markerEncountered(const QString& marker, const QStringList&, GXRange, bool& blockStarted,
                             bool& blockEnded, bool&, GXRange& nextRange, const GXBlockInfo*,
                             std::optional<QVariantMap>& newVariables) override {
    newVariables = QVariantMap{{marker + "Var", "kept"}};
    if (marker == "both") blockStarted = blockEnded = true;
    if (marker == "noend") blockStarted = true;
    if (marker == "jump") nextRange.length += 1;
    return marker.toUpper();
  }
  void engineFinishedProcessingTemplate() override { ++finishedCalls; }
  int finishedCalls = 0;

 private:
  QStringList names_;
};

// Each fuzzer seed, rendered twice on one engine, gives its golden output and error codes.
TEST_F(TemplateTest, EverySeedRendersItsGoldenOutput) {
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(icu::Locale("en_US"), status);
  ASSERT_TRUE(RZDate::setDefaultTimeZone("Europe/Berlin"));
  const Date fixed = Date::fromQDateTime(QDateTime(QDate(2031, 7, 4), QTime(12, 0), Qt::UTC));
  Date::setClockForTesting([fixed] { return fixed; });
  const QDir corpus(TESSAL_TEST_DATA_DIR "/../fuzz/corpus");
  const QStringList names = corpus.entryList(QDir::Files);
  EXPECT_GE(names.size(), 24);
  for (const QString& name : names) {
    ASSERT_TRUE(QFile::exists(corpus.filePath("../golden/" + name))) << name.toStdString();
    const QByteArray bytes = fileBytes(corpus.filePath(name)),
                     expected = fileBytes(corpus.filePath("../golden/" + name));
    GXTemplateEngine engine;
    RecordingDelegate delegate;
    engine.setDelegate(&delegate);
    const QString text = templatefuzz::prepare(engine, bytes.constData(), std::size_t(bytes.size()));
    for (int run = 0; run < 2; ++run) {
      delegate.errors.clear();
      QString output = engine.processTemplate(text, templatefuzz::variables());
      if (!delegate.errors.empty()) output += "\n--- errors " + delegate.codes();
      EXPECT_EQ(output, QString::fromUtf8(expected)) << name.toStdString() << ", run " << run;
    }
  }
}

TEST_F(TemplateTest, BlockEventsCarryTheBlockAndHandlersKeepTheirNames) {
  EXPECT_EQ(render("ab{% for 1 to 2 %}x{% /for %}"), "abxx");
  // One start and one end for the whole loop, not one per pass; the block's variables come after the event.
  EXPECT_EQ(delegate.events, (QStringList{"start for", "end for", "finished"}));
  ASSERT_EQ(delegate.started.size(), 1u);
  const GXBlockInfo& b = delegate.started[0];
  EXPECT_TRUE(b.args == QStringList({"1", "to", "2"}) && b.endNames == QStringList{"/for"} &&
              b.startMarkerRange == (GXRange{2, 16}) && b.vars.isEmpty());
  // The first handler loaded for a name keeps it; each name a handler holds hears of a run's end.
  auto probe = std::make_shared<ProbeMarkers>(QStringList{"for", "both", "jump"});
  engine.loadMarker(probe);
  engine.loadMarker(nullptr);
  EXPECT_EQ(render("{% for 1 to 3 %}{{ currentLoop.currentIndex }}{% /for %}{% both %}"), "123BOTH");
  EXPECT_EQ(probe->finishedCalls, 2);  // "both" and "jump"; "for" was taken
}

TEST_F(TemplateTest, AnEngineIsReusableAfterAStoppedRunAndCompilesNoPatternAgain) {
  EXPECT_EQ(render("{% for 1 to 2 %}a{% if x y %}{% /if %}b{% /for %}"), "a");
  EXPECT_EQ(delegate.codes(), "1");
  EXPECT_EQ(render("{% for 1 to 2 %}{% cycle p q %}{% /for %}{% if true %}ok{% /if %}"), "pqok");
  EXPECT_TRUE(delegate.errors.empty());
  QString text;
  for (int i = 0; i < 200; ++i)
    text += QStringLiteral("<p>{{ x | uppercase }} {% if n > %1 %}b{% /if %}</p>").arg(i);
  const QVariantMap vars{{"x", "x"}, {"n", 100}};
  const std::uint64_t before = RXRegex::compileCount();
  render(text, vars);
  // At most the matcher's three patterns, once each, however many markers the template holds.
  EXPECT_LE(RXRegex::compileCount() - before, 3u);
  const std::uint64_t afterFirst = RXRegex::compileCount();
  render(text + text, vars);
  render("{% for x in xs %}{{ x | lowercase }}{% /for %}", {{"xs", QStringList{"A", "B"}}});
  EXPECT_EQ(RXRegex::compileCount(), afterFirst);
}

TEST_F(TemplateTest, ProcessingAFileDetectsItsEncoding) {
  QTemporaryDir dir;
  auto run = [&](const QString& name, const std::optional<QByteArray>& bytes) {
    if (bytes) writeFile(dir.filePath(name), *bytes);
    return engine.processTemplateInFileAtPath(dir.filePath(name), {{"who", QStringLiteral("Zoë")}});
  };
  const QString text = QStringLiteral("Grüße {{ who }}");
  QStringEncoder utf16(QStringConverter::Utf16LE, QStringEncoder::Flag::WriteBom);
  EXPECT_EQ(QStringList({run("utf8.txt", text.toUtf8()), run("utf16.txt", QByteArray(utf16.encode(text)))}),
            QStringList(2, QStringLiteral("Grüße Zoë")));
  EXPECT_TRUE(run("latin1.txt", text.toLatin1()).isNull() && run("missing.txt", std::nullopt).isNull());
  delegate.errors.clear();
  const QString empty = run("empty.txt", QByteArray());
  EXPECT_TRUE(empty.isEmpty() && !empty.isNull() && delegate.errors.empty());
}

// Each line of tests/data/template-errors.txt.
TEST_F(TemplateTest, ErrorsAreReportedWithTheirCodeMessageAndOutcome) {
  engine.loadMarker(std::make_shared<ProbeMarkers>(QStringList{"both", "noend", "jump"}));
  std::ifstream file(TESSAL_TEST_DATA_DIR "/template-errors.txt");
  int rows = 0;
  for (std::string line; std::getline(file, line);) {
    if (line.empty() || line[0] == '#') continue;
    const QString text = QString::fromStdString(line.substr(0, line.find('\t')));
    QStringList outcome{render(text, {{"items", QVariantList{1}}}), delegate.codes(), {}};
    if (!delegate.errors.empty())
      outcome[2] = delegate.errors[0].message + (delegate.errors[0].continuing ? "" : " (stop)");
    EXPECT_EQ(outcome.join(" | ").trimmed(),
              QString::fromStdString(line.substr(line.find('\t') + 1)).trimmed())
        << line;
    EXPECT_EQ(delegate.events.last(), "finished") << line;
    ++rows;
  }
  EXPECT_EQ(rows, 18);
  render("{% both %}");
  EXPECT_EQ(delegate.events, QStringList{"finished"});  // no block was opened or closed
}

TEST_F(TemplateTest, RunawayTemplatesStopAtTheLimits) {
  engine.setMaximumSteps(50);
  EXPECT_LT(render("{% for 1 to 2000000000 %}x{% /for %}").size(), 50);
  ASSERT_EQ(delegate.codes(), "8");
  EXPECT_EQ(
      std::pair(delegate.errors[0].message, delegate.errors[0].continuing),
      std::pair(QString("Fatal Error: Processing stopped: more than 50 markers and expressions"), false));
  // A run variable "currentLoop" takes the loop's updates, so the loop's own counter never moves.
  render("{% set currentLoop 1 %}{% for 1 to 3 %}{% /for %}");
  EXPECT_EQ(delegate.codes(), "8");
  engine.setMaximumSteps(0);
  engine.setMaximumOutputLength(100);
  const QString wide = render("{% for 1 to 2000000000 %}0123456789{% /for %}");
  EXPECT_TRUE(wide.size() > 100 && wide.size() <= 110) << wide.size();
  EXPECT_EQ(delegate.codes(), "8");
}

TEST_F(TemplateTest, RunVariablesShadowGlobalsWhichShadowBlockVariables) {
  engine.setObject("global", "x");
  engine.addEntriesFromDictionary({{"item", "global"}, {"only", "g"}});
  EXPECT_EQ(render("{{ x }}{{ only }}", {{"x", "run"}}), "rung");
  // The block's loop variable loses to the global, whose value the loop then updates.
  EXPECT_EQ(render("{% for item in items %}{{ item }};{% /for %}", {{"items", QStringList{"a", "b", "c"}}}),
            "global;b;c;");
  EXPECT_EQ(engine.objectForKey("item"), QVariant("c"));
}

// A counter standing for a record whose answer could differ from one reading to the next.
class Counter : public KeyValueCoding {
 public:
  QVariant valueForKey(const QString&) const override { return ++readings_; }

 private:
  mutable int readings_ = 0;
};

// A name is looked up again only after a variable may have changed (set, loop, block end, new run).
TEST_F(TemplateTest, ANameIsReadAgainOnlyAfterAVariableMayHaveChanged) {
  const Counter counter;
  const QVariantMap vars{
      {"c", KeyPath::variantFromObject(&counter)}, {"items", QStringList{"a", "b"}}, {"title", "A"}};
  EXPECT_EQ(render("{{ c.n }}{% if c.n %}{{ c.n }}{% /if %}|{% set x 1 %}{{ c.n }}", vars), "11|2");
  EXPECT_EQ(render("{{ c.n }}", vars), "3");
  EXPECT_EQ(render("{% for item in items %}{{ item }}{% if item %}{{ item }}{% /if %}{% /for %}", vars),
            "aabb");
  EXPECT_EQ(render("{{ title }}{% set title B %}{{ title }}", vars), "AB");
  engine.setObject("G", "g");
  EXPECT_EQ(render("{{ g }}"), "G");
  engine.setObject("H", "g");
  EXPECT_EQ(render("{{ g }}"), "H");
}

// A value set in place finds where the name lives; forced, it goes into the run's own frame.
TEST_F(TemplateTest, SetValueChangesWhereTheNameLivesUnlessForced) {
  render(QString(), {{"client", QVariantMap{{"name", "Bar"}}}});
  engine.setValue("Baz", "client.name", false);
  EXPECT_EQ(engine.resolveVariable("client"), QVariant(QVariantMap{{"name", "Baz"}}));
  engine.setValue("forced", "client.name", true);
  EXPECT_EQ(engine.templateVariables().value("client.name"), QVariant("forced"));
  EXPECT_EQ(engine.resolveVariable("client.name"), QVariant("Baz"));
}

// Filters loaded by class name stay with their engine; a filter without a value writes nothing.
TEST_F(TemplateTest, LoadFindsClassesByNameAndAFilterWithoutAValueWritesNothing) {
  struct Shout : GXTemplateFilter {
    QStringList filters() const override { return {"shout", "uppercase", "nothing"}; }
    QVariant filterInvoked(const QString& name, const QStringList&, const QVariant& value) override {
      return name == "nothing" ? QVariant() : QVariant(GXTemplateValue::description(value) + '!');
    }
  };
  engine.classRegistry().registerFilterClass("ShoutFilters", [] { return std::make_shared<Shout>(); });
  const QVariantMap vars{{"w", "hi"}};
  const QString text = "{{ w | shout }}{% load Nope ShoutFilters %}{{ w | shout }}{{ w | uppercase }}";
  EXPECT_EQ(render(text, vars), "hihi!HI");
  EXPECT_TRUE(delegate.errors.empty());
  EXPECT_EQ(render("{{ w | shout }}[{{ w | nothing }}]", vars), "hi![]");
  EXPECT_TRUE(delegate.errors.empty());
  GXTemplateEngine other;
  other.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&other));
  EXPECT_EQ(other.processTemplate(text, vars), "hihiHI");
}

TEST(FilterFunctions, OnlyDayPatternsShareADaysText) {
  for (const char* pattern : {"yyyy-MM-dd", "EEEE d. MMMM y 'um' QQQ", "w/W D F g e c", "'HH:mm' yy"})
    EXPECT_TRUE(GXTemplateStandardFilters::patternHasOnlyDayFields(QString::fromUtf8(pattern))) << pattern;
  for (const char* pattern : {"HH:mm", "yyyy a", "d z", "dd 'x''' ss", "yyyy-MM-dd'T'HH"})
    EXPECT_FALSE(GXTemplateStandardFilters::patternHasOnlyDayFields(QString::fromUtf8(pattern))) << pattern;
}

TEST_F(TemplateTest, DateTextsOfOneDayComeFromTheRightDay) {
  ASSERT_TRUE(RZDate::setDefaultTimeZone("America/New_York"));
  // Half-hourly items across a local midnight, and one pattern with times: every text must match its date.
  QVariantList items;
  QString expected;
  const double start =
      Date::fromQDateTime(QDateTime(QDate(2024, 11, 2), QTime(20, 0), Qt::UTC)).secondsSince1970();
  for (int i = 0; i < 60; ++i) {
    const Date date = Date::fromSeconds(start + 1800.0 * i);
    items.append(QVariant::fromValue(date));
    expected += RZDate::stringWithPattern(date, "yyyy-MM-dd") + ' ' +
                RZDate::stringWithPattern(date, "d HH:mm") + ';';
  }
  EXPECT_EQ(render("{% for d in items %}{{ d | date_format: \"yyyy-MM-dd\" }} "
                   "{{ d | date_format: \"d HH:mm\" }};{% /for %}",
                   {{"items", items}}),
            expected);
  // After a change of zone the same instant (00:00 UTC, 3 November) may fall on another day.
  const QVariantMap late{{"d", QVariant::fromValue(Date::fromSeconds(start + 4 * 3600.0))}};
  EXPECT_EQ(render("{{ d | date_format: \"d\" }}", late), "2");
  ASSERT_TRUE(RZDate::setDefaultTimeZone("Europe/Berlin"));
  EXPECT_EQ(render("{{ d | date_format: \"d\" }}", late), "3");
}

TEST_F(TemplateTest, ColorFormatWritesHexForHexOnly) {
  const QVariant red = QColor(255, 0, 0);
  QStringList hex;
  for (const QColor color :
       {QColor(255, 0, 0), QColor(18, 52, 86, 128), QColor::fromHsv(240, 255, 255), QColor()})
    hex << render("{{ v | color_format: hex }}", {{"v", color}});
  hex << render("{{ v | color_format: HEX }}", {{"v", red}});
  EXPECT_EQ(hex, QStringList({"ff0000", "123456", "0000ff", "000000", "ff0000"}));
  GXTemplateStandardFilters filters;  // anything else leaves the value as it is
  EXPECT_EQ(filters.filterInvoked("color_format", {"rgb"}, red), red);
  EXPECT_EQ(filters.filterInvoked("color_format", {"hex"}, QStringLiteral("ff0000")), QVariant("ff0000"));
  EXPECT_EQ(filters.filterInvoked("nosuch", {}, red), red);
}

}  // namespace
