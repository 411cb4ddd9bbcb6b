#include "../fuzz/TemplateFuzzInput.h"
#include "Date.h"
#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "GXTemplateStandardFilters.h"
#include "ICUTemplateMatcher.h"
#include "KeyPath.h"
#include "RXRegex.h"
#include "RZDate.h"

#include <QColor>
#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QStringEncoder>
#include <QTemporaryDir>

#include <unicode/locid.h>

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

  void templateEngineBlockStarted(GXTemplateEngine*, const GXBlockInfo& block) override {
    events.append(QStringLiteral("start ") + block.name);
  }
  void templateEngineBlockEnded(GXTemplateEngine*, const GXBlockInfo& block) override {
    events.append(QStringLiteral("end ") + block.name);
  }
  void templateEngineFinishedProcessingTemplate(GXTemplateEngine*) override {
    events.append(QStringLiteral("finished"));
  }
  void templateEngineEncounteredError(GXTemplateEngine*, const GXTemplateError& error,
                                      bool continuing) override {
    EXPECT_EQ(error.domain, QStringLiteral("GXTemplateEngineErrorDomain"));
    errors.push_back({int(error.code), error.localizedDescription, continuing});
  }

  QList<int> codes() const {
    QList<int> result;
    for (const Error& error : errors) result.append(error.code);
    return result;
  }

  std::vector<Error> errors;
  QStringList events;
};

// An engine with the ICU matcher and a recording delegate, as the report window sets one up.
class TemplateTest : public ::testing::Test {
 protected:
  TemplateTest() {
    engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
    engine.setDelegate(&delegate);
  }

  QString render(const QString& text, const QVariantMap& variables = {}) {
    delegate.errors.clear();
    delegate.events.clear();
    return engine.processTemplate(text, variables);
  }

  GXTemplateEngine engine;
  RecordingDelegate delegate;
};

// A marker handler that misbehaves on request, to drive the engine's error paths:
// "both" reports a block both beginning and ending, "noend" starts a block without end markers,
// "jump" asks to resume past the template's end. Each returns a value and sets a variable.
class ProbeMarkers : public GXTemplateMarker {
 public:
  explicit ProbeMarkers(QStringList names) : names_(std::move(names)) {}

  QStringList markers() const override { return names_; }
  std::optional<QStringList> endMarkersForMarker(const QString&) const override { return std::nullopt; }
  QVariant markerEncountered(const QString& marker, const QStringList&, GXRange, bool& blockStarted,
                             bool& blockEnded, bool&, GXRange& nextRange, const GXBlockInfo*,
                             std::optional<QVariantMap>& newVariables) override {
    newVariables = QVariantMap{{marker + QStringLiteral("Var"), QStringLiteral("kept")}};
    if (marker == QLatin1String("both")) blockStarted = blockEnded = true;
    if (marker == QLatin1String("noend")) blockStarted = true;
    if (marker == QLatin1String("jump")) nextRange.length += 1;
    return marker.toUpper();
  }
  void engineFinishedProcessingTemplate() override { ++finishedCalls; }

  int finishedCalls = 0;

 private:
  QStringList names_;
};

using EngineRunTest = TemplateTest;
using EngineErrorTest = TemplateTest;
using EngineVariableTest = TemplateTest;

// The golden table: each seed of the template fuzzer, rendered twice on one engine over the fuzzer's
// variables, gives the output in tests/fuzz/golden, followed by the codes of the errors it reported.
TEST(TemplateGolden, EverySeedRendersItsGoldenOutput) {
  UErrorCode status = U_ZERO_ERROR;
  icu::Locale::setDefault(icu::Locale("en_US"), status);
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin")));
  const Date fixed = Date::fromQDateTime(QDateTime(QDate(2031, 7, 4), QTime(12, 0), Qt::UTC));
  Date::setClockForTesting([fixed] { return fixed; });
  struct Restore {
    ~Restore() {
      Date::setClockForTesting({});
      RZDate::setDefaultTimeZone(QStringLiteral("UTC"));
    }
  } restore;
  const QVariantMap variables = templatefuzz::variables();
  const QDir corpus(QStringLiteral(TESSAL_TEST_DATA_DIR "/../fuzz/corpus"));
  const QStringList names = corpus.entryList(QDir::Files);
  EXPECT_GE(names.size(), 24);
  for (const QString& name : names) {
    QFile seed(corpus.filePath(name));
    QFile golden(corpus.filePath(QStringLiteral("../golden/") + name));
    ASSERT_TRUE(seed.open(QIODevice::ReadOnly) && golden.open(QIODevice::ReadOnly)) << name.toStdString();
    const QByteArray bytes = seed.readAll();
    const QString expected = QString::fromUtf8(golden.readAll());
    GXTemplateEngine engine;
    RecordingDelegate delegate;
    engine.setDelegate(&delegate);
    const QString text = templatefuzz::prepare(engine, bytes.constData(), std::size_t(bytes.size()));
    for (int run = 0; run < 2; ++run) {
      delegate.errors.clear();
      QString output = engine.processTemplate(text, variables);
      if (!delegate.errors.empty()) {
        output += QStringLiteral("\n--- errors");
        for (const int code : delegate.codes()) output += QStringLiteral(" %1").arg(code);
      }
      EXPECT_EQ(output, expected) << name.toStdString() << ", run " << run;
    }
  }
}

TEST_F(EngineRunTest, EmptyTemplateGivesAnEmptyTextNotNone) {
  const QString output = render(QString());
  EXPECT_FALSE(output.isNull());
  EXPECT_TRUE(output.isEmpty());
  EXPECT_TRUE(delegate.errors.empty());
  EXPECT_EQ(delegate.events, QStringList{"finished"});
}

TEST_F(EngineRunTest, BlockEventsCarryTheBlock) {
  struct Blocks : RecordingDelegate {
    void templateEngineBlockStarted(GXTemplateEngine* engine, const GXBlockInfo& block) override {
      RecordingDelegate::templateEngineBlockStarted(engine, block);
      started.push_back(block);
    }
    std::vector<GXBlockInfo> started;
  } blocks;
  engine.setDelegate(&blocks);
  EXPECT_EQ(engine.processTemplate(QStringLiteral("ab{% for 1 to 2 %}x{% /for %}"), {}),
            QStringLiteral("abxx"));
  // One start and one end for the whole loop, not one per pass.
  EXPECT_EQ(blocks.events, (QStringList{"start for", "end for", "finished"}));
  ASSERT_EQ(blocks.started.size(), 1u);
  EXPECT_EQ(blocks.started[0].args, (QStringList{"1", "to", "2"}));
  EXPECT_EQ(blocks.started[0].endNames, QStringList{"/for"});
  EXPECT_EQ(blocks.started[0].startMarkerRange, (GXRange{2, 16}));
  EXPECT_TRUE(blocks.started[0].vars.isEmpty());  // filled after the event
}

TEST_F(EngineRunTest, EveryRegistrationHearsOfTheEndOfARun) {
  auto probe = std::make_shared<ProbeMarkers>(QStringList{"both", "noend", "jump"});
  engine.loadMarker(probe);
  render(QStringLiteral("plain"));
  EXPECT_EQ(probe->finishedCalls, 3);
}

TEST_F(EngineRunTest, TheFirstHandlerLoadedForANameKeepsIt) {
  auto probe = std::make_shared<ProbeMarkers>(QStringList{"for", "both"});
  engine.loadMarker(probe);
  engine.loadMarker(nullptr);
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 3 %}{{ currentLoop.currentIndex }}{% /for %}")),
            QStringLiteral("123"));
  EXPECT_EQ(render(QStringLiteral("{% both %}")), QStringLiteral("BOTH"));
}

TEST_F(EngineRunTest, AnEngineIsReusableAfterAStoppedRun) {
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 2 %}a{% if x y %}{% /if %}b{% /for %}")), QStringLiteral("a"));
  EXPECT_EQ(delegate.codes(), QList<int>{1});
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 2 %}{% cycle p q %}{% /for %}{% if true %}ok{% /if %}")),
            QStringLiteral("pqok"));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(EngineRunTest, PatternsAreNotCompiledAgainDuringOrBetweenRuns) {
  QString text;
  for (int i = 0; i < 200; ++i) {
    text +=
        QStringLiteral("<p>{{ name | uppercase }} {% if n > %1 %}big{% else %}small{% /if %}</p>\n").arg(i);
  }
  const QVariantMap vars{{"name", QStringLiteral("x")}, {"n", 100}};
  const std::uint64_t before = RXRegex::compileCount();
  render(text, vars);
  // At most the three patterns of the matcher, once each, however many markers the template holds.
  EXPECT_LE(RXRegex::compileCount() - before, 3u);
  const std::uint64_t afterFirst = RXRegex::compileCount();
  render(text + text, vars);
  render(QStringLiteral("{% for x in xs %}{{ x | lowercase }}{% /for %}"), {{"xs", QStringList{"A", "B"}}});
  EXPECT_EQ(RXRegex::compileCount(), afterFirst);
}

TEST_F(EngineRunTest, ProcessingAFileDetectsItsEncoding) {
  QTemporaryDir dir;
  auto write = [&](const QString& name, const QByteArray& bytes) {
    QFile file(dir.filePath(name));
    EXPECT_TRUE(file.open(QIODevice::WriteOnly));
    file.write(bytes);
    return file.fileName();
  };
  const QString text = QStringLiteral("Grüße {{ who }}");
  const QVariantMap vars{{"who", QStringLiteral("Zoë")}};
  EXPECT_EQ(engine.processTemplateInFileAtPath(write("utf8.txt", text.toUtf8()), vars),
            QStringLiteral("Grüße Zoë"));
  QStringEncoder utf16(QStringConverter::Utf16LE, QStringEncoder::Flag::WriteBom);
  EXPECT_EQ(engine.processTemplateInFileAtPath(write("utf16.txt", utf16.encode(text)), vars),
            QStringLiteral("Grüße Zoë"));
  EXPECT_TRUE(engine.processTemplateInFileAtPath(write("latin1.txt", text.toLatin1()), vars).isNull());
  EXPECT_TRUE(engine.processTemplateInFileAtPath(dir.filePath("missing.txt"), vars).isNull());
  EXPECT_TRUE(engine.processTemplateInFileAtPath(write("empty.txt", QByteArray()), vars).isEmpty());
  EXPECT_FALSE(engine.processTemplateInFileAtPath(dir.filePath("empty.txt"), vars).isNull());
}

TEST(EngineWithoutMatcher, ReportsFatalErrorSevenAndGivesNone) {
  GXTemplateEngine engine;
  EXPECT_TRUE(engine.processTemplate(QStringLiteral("x"), {}).isNull());  // no delegate: nothing to tell
  RecordingDelegate delegate;
  engine.setDelegate(&delegate);
  EXPECT_TRUE(engine.processTemplate(QStringLiteral("x"), {}).isNull());
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(QStringLiteral("%1 %2 %3")
                .arg(delegate.errors[0].code)
                .arg(delegate.errors[0].continuing)
                .arg(delegate.errors[0].message),
            QStringLiteral("7 0 Fatal Error: No matcher has been configured for the template engine"));
  EXPECT_TRUE(delegate.events.isEmpty());  // no run took place, so none finished
}

// Each error with what the run made of the template: "output | codes | first message", the message marked
// "(stop)" when it was not reported as continuing.
TEST_F(EngineErrorTest, ErrorsAreReportedWithTheirCodeMessageAndOutcome) {
  engine.loadMarker(std::make_shared<ProbeMarkers>(QStringList{"both", "noend", "jump"}));
  const std::pair<const char*, const char*> cases[] = {
      {"a{{ missing }}b", "ab | 3 | \"missing\" is not a valid variable"},
      {"{% if false %}{{ missing }}{% /if %}c", "c |  | "},  // silent while output is off
      {"{{}}", " | 3 | \"(null)\" is not a valid variable"},
      {"a{% bogus x y %}b", "ab | 2 | \"bogus\" is not a valid marker"},
      {"{% if false %}{% bogus %}{% /if %}c", "c | 2 | \"bogus\" is not a valid marker"},
      {"{%%}", " | 2 | \"(null)\" is not a valid marker"},
      // Markers whose arguments do not fit start no block; their end closes nothing.
      {"{% for x in %}a{% /for %}b", "a | 1 | Marker \"/for\" reported that a non-existent block ended"},
      {"{% if not x %}A{% /if %}B", "A | 1 | Marker \"/if\" reported that a non-existent block ended"},
      {"{% if a b c d %}A{% /if %}B", "A | 1 | Marker \"/if\" reported that a non-existent block ended"},
      {"a{% comment x %}b{% /comment %}c",
       "ab | 1 | Marker \"/comment\" reported that a non-existent block ended"},
      {"{% section %}x{% /section %}",
       "x | 1 | Marker \"/section\" reported that a non-existent block ended"},
      {"{% for x in items %}abc", "abc | 6 | Finished processing template, but 1 block was left open (for)."},
      {"{% for 1 to 2 %}{% if true %}{% section s %}x",
       "x | 6 | Finished processing template, but 3 blocks were left open (for, if, section)."},
      // Reported as continuing, and yet the run ends.
      {"a{% /for %}b{{ missing }}", "a | 1 | Marker \"/for\" reported that a non-existent block ended"},
      {"{% section s %}x{% /if %}y{% /section %}z",
       "x | 1 | Marker \"/if\" reported that a block ended, but current block was started by \"section\" "
       "marker"},
      {"{% both %}{{ bothVar }}",
       "BOTHkept | 0 | Marker \"both\" reported that a block simultaneously began "
       "and ended"},
      {"a{% noend %}b{{ noendVar }}",
       "ab | 4 3 | Marker \"noend\" started a block but did not supply any suitable end-markers"},
      {"before{% jump %}after",
       "before | 5 | Fatal Error: Marker handler \"jump\" specified an invalid range "
       "to resume processing from (stop)"},
  };
  for (const auto& [text, expected] : cases) {
    QStringList outcome{render(QString::fromUtf8(text), {{"items", QVariantList{1}}}), {}, {}};
    for (const int code : delegate.codes())
      outcome[1] += (outcome[1].isEmpty() ? "" : " ") + QString::number(code);
    if (!delegate.errors.empty())
      outcome[2] = delegate.errors[0].message + (delegate.errors[0].continuing ? "" : " (stop)");
    EXPECT_EQ(outcome.join(" | ").toStdString(), expected) << text;
    EXPECT_EQ(delegate.events.last(), QStringLiteral("finished")) << text;
  }
  render(QStringLiteral("{% both %}"));
  EXPECT_EQ(delegate.events, QStringList{"finished"});  // no block was opened or closed
}

TEST_F(EngineErrorTest, RunawayTemplatesStopAtTheLimits) {
  engine.setMaximumSteps(50);
  const QString loop = render(QStringLiteral("{% for 1 to 2000000000 %}x{% /for %}"));
  EXPECT_LT(loop.size(), 50);
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, 8);
  EXPECT_EQ(delegate.errors[0].message,
            QStringLiteral("Fatal Error: Processing stopped: more than 50 markers and expressions"));
  EXPECT_FALSE(delegate.errors[0].continuing);
  // A run variable named "currentLoop" takes the loop's updates, so the loop's own counter never moves:
  // without the limit this loop would not end.
  render(QStringLiteral("{% set currentLoop 1 %}{% for 1 to 3 %}{% /for %}"));
  EXPECT_EQ(delegate.codes(), QList<int>{8});

  engine.setMaximumSteps(0);
  engine.setMaximumOutputLength(100);
  const QString wide = render(QStringLiteral("{% for 1 to 2000000000 %}0123456789{% /for %}"));
  EXPECT_GT(wide.size(), 100);
  EXPECT_LE(wide.size(), 110);
  EXPECT_EQ(delegate.codes(), QList<int>{8});
}

TEST_F(EngineVariableTest, RunVariablesShadowGlobalsWhichShadowBlockVariables) {
  engine.setObject(QStringLiteral("global"), QStringLiteral("x"));
  engine.addEntriesFromDictionary({{"item", QStringLiteral("global")}, {"only", QStringLiteral("g")}});
  EXPECT_EQ(render(QStringLiteral("{{ x }}{{ only }}"), {{"x", QStringLiteral("run")}}),
            QStringLiteral("rung"));
  // The loop variable lives in the block's frame, so the global of that name wins; the loop's next
  // value then goes where "item" was found: into the globals.
  EXPECT_EQ(render(QStringLiteral("{% for item in items %}{{ item }};{% /for %}"),
                   {{"items", QStringList{"a", "b", "c"}}}),
            QStringLiteral("global;b;c;"));
  EXPECT_EQ(engine.objectForKey(QStringLiteral("item")), QVariant(QStringLiteral("c")));
}

// A value set is the engine's copy of the run's variables, not the caller's.
TEST_F(EngineVariableTest, SetChangesTheRunsCopyOnly) {
  const QVariantMap vars{{"client", QVariantMap{{"name", QStringLiteral("Bar")}}}};
  EXPECT_EQ(render(QStringLiteral("{% set client.name Foo %}{% set a.b 5 %}"), vars), QString());
  EXPECT_EQ(engine.templateVariables().value("client").toMap().value("name"),
            QVariant(QStringLiteral("Foo")));
  EXPECT_EQ(engine.templateVariables().value(QStringLiteral("a.b")), QVariant(QStringLiteral("5")));
  EXPECT_EQ(vars.value("client").toMap().value("name"), QVariant(QStringLiteral("Bar")));
}

// A counter standing for a record whose answer could differ from one reading to the next.
class Counter : public KeyValueCoding {
 public:
  QVariant valueForKey(const QString&) const override { return ++readings_; }

 private:
  mutable int readings_ = 0;
};

// A name read again is not looked up again until a variable may have changed: a value set, a loop going
// round, a block with values of its own closing, a new run. Every reading after such a change is fresh.
TEST_F(EngineVariableTest, ANameIsReadAgainOnlyAfterAVariableMayHaveChanged) {
  const Counter counter;
  const QVariantMap vars{{"c", KeyPath::variantFromObject(&counter)},
                         {"items", QStringList{"a", "b"}},
                         {"title", QStringLiteral("A")}};
  EXPECT_EQ(render(QStringLiteral("{{ c.n }}{% if c.n %}{{ c.n }}{% /if %}|{% set x 1 %}{{ c.n }}"), vars),
            QStringLiteral("11|2"));
  EXPECT_EQ(render(QStringLiteral("{{ c.n }}"), vars), QStringLiteral("3"));
  EXPECT_EQ(
      render(QStringLiteral("{% for item in items %}{{ item }}{% if item %}{{ item }}{% /if %}{% /for %}"),
             vars),
      QStringLiteral("aabb"));
  EXPECT_EQ(render(QStringLiteral("{{ title }}{% set title B %}{{ title }}"), vars), QStringLiteral("AB"));
  EXPECT_EQ(render(QStringLiteral("{% section s %}{% set t A %}{{ t }}{% /section %}[{{ t }}]")),
            QStringLiteral("A[]"));
  engine.setObject(QStringLiteral("G"), QStringLiteral("g"));
  EXPECT_EQ(render(QStringLiteral("{{ g }}")), QStringLiteral("G"));
  engine.setObject(QStringLiteral("H"), QStringLiteral("g"));
  EXPECT_EQ(render(QStringLiteral("{{ g }}")), QStringLiteral("H"));
}

TEST_F(EngineVariableTest, LookupAnswersWhereAValueLives) {
  render(QString(),
         {{"client", QVariantMap{{"name", QStringLiteral("Bar")}}}, {"letters", QStringList{"a", "b"}}});
  QVariant parent;
  QString key;
  EXPECT_EQ(engine.valueForVariable(QStringLiteral("client.name"), &parent, &key),
            QVariant(QStringLiteral("Bar")));
  EXPECT_EQ(parent.toMap().value("name"), QVariant(QStringLiteral("Bar")));
  EXPECT_EQ(key, QStringLiteral("name"));
  EXPECT_EQ(engine.valueForVariable(QStringLiteral("letters.1"), &parent, &key),
            QVariant(QStringLiteral("b")));
  EXPECT_EQ(parent.toStringList(), (QStringList{"a", "b"}));
  EXPECT_EQ(key, QStringLiteral("1"));
  EXPECT_EQ(engine.valueForVariable(QStringLiteral("client"), &parent, &key).toMap().size(), 1);
  EXPECT_TRUE(parent.toMap().contains("letters"));  // the run's variables themselves
  EXPECT_EQ(key, QStringLiteral("client"));
  engine.setValue(QStringLiteral("Baz"), QStringLiteral("client.name"), false);
  EXPECT_EQ(engine.resolveVariable(QStringLiteral("client.name")), QVariant(QStringLiteral("Baz")));
  engine.setValue(QStringLiteral("forced"), QStringLiteral("client.name"), true);
  EXPECT_EQ(engine.templateVariables().value(QStringLiteral("client.name")),
            QVariant(QStringLiteral("forced")));
  EXPECT_EQ(engine.resolveVariable(QStringLiteral("client.name")), QVariant(QStringLiteral("Baz")));
}

// A filter that gives no value writes nothing (and is no error).
TEST_F(EngineVariableTest, AFilterWithoutAValueWritesNothing) {
  struct Nothing : GXTemplateFilter {
    QStringList filters() const override { return {QStringLiteral("nothing")}; }
    QVariant filterInvoked(const QString&, const QStringList&, const QVariant&) override { return {}; }
  };
  engine.loadFilter(std::make_shared<Nothing>());
  EXPECT_EQ(render(QStringLiteral("[{{ name | nothing }}]"), {{"name", QStringLiteral("Ada")}}),
            QStringLiteral("[]"));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(EngineRunTest, LoadFindsClassesByName) {
  struct Shout : GXTemplateFilter {
    QStringList filters() const override { return {QStringLiteral("shout"), QStringLiteral("uppercase")}; }
    QVariant filterInvoked(const QString&, const QStringList&, const QVariant& value) override {
      return GXTemplateValue::description(value) + QLatin1Char('!');
    }
  };
  engine.classRegistry().registerFilterClass(QStringLiteral("ShoutFilters"),
                                             [] { return std::make_shared<Shout>(); });
  const QVariantMap vars{{"w", QStringLiteral("hi")}};
  const QString text =
      QStringLiteral("{{ w | shout }}{% load Nope ShoutFilters %}{{ w | shout }}{{ w | uppercase }}");
  EXPECT_EQ(render(text, vars), QStringLiteral("hihi!HI"));  // "uppercase" was taken before
  EXPECT_TRUE(delegate.errors.empty());
  // Loaded handlers stay with the engine for later runs.
  EXPECT_EQ(render(QStringLiteral("{{ w | shout }}"), vars), QStringLiteral("hi!"));
  // Classes are registered on one engine, not on every engine of the process.
  GXTemplateEngine other;
  other.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&other));
  EXPECT_EQ(other.processTemplate(text, vars), QStringLiteral("hihiHI"));
}

class FilterTest : public TemplateTest {
 protected:
  QString filtered(const QVariant& value, const QString& filter) {
    return render(QStringLiteral("{{ v | %1 }}").arg(filter), {{"v", value}});
  }
};

TEST(FilterFunctions, CapitalizedStartsEveryWord) {
  struct Case {
    const char* text;
    const char* capitalized;
  };
  const Case cases[] = {{"hello world", "Hello World"},           {"HELLO wORLD", "Hello World"},
                        {"o'neil-smith", "O'neil-Smith"},         {"123abc 4U", "123Abc 4U"},
                        {"élan\tvital\nend", "Élan\tVital\nEnd"}, {"", ""}};
  for (const Case& c : cases) {
    EXPECT_EQ(GXTemplateStandardFilters::capitalized(QString::fromUtf8(c.text)),
              QString::fromUtf8(c.capitalized))
        << c.text;
  }
}

TEST_F(FilterTest, DateTextsOfOneDayComeFromTheRightDay) {
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("America/New_York")));
  // Hourly items across a local midnight, and one pattern with times: every text must match its own date.
  QVariantList items;
  const double start =
      Date::fromQDateTime(QDateTime(QDate(2024, 11, 2), QTime(20, 0), Qt::UTC)).secondsSince1970();
  for (int i = 0; i < 60; ++i) items.append(QVariant::fromValue(Date::fromSeconds(start + 1800.0 * i)));
  const QString output = render(QStringLiteral("{% for d in items %}{{ d | date_format: \"yyyy-MM-dd\" }} "
                                               "{{ d | date_format: \"d HH:mm\" }};{% /for %}"),
                                {{"items", items}});
  QString expected;
  for (const QVariant& item : items) {
    const Date date = item.value<Date>();
    expected += RZDate::stringWithPattern(date, QStringLiteral("yyyy-MM-dd")) + QLatin1Char(' ') +
                RZDate::stringWithPattern(date, QStringLiteral("d HH:mm")) + QLatin1Char(';');
  }
  EXPECT_EQ(output, expected);
  // After a change of zone the same instant may fall on another day.
  const QVariantMap late{
      {"d", QVariant::fromValue(Date::fromSeconds(start + 4 * 3600.0))}};  // 00:00 UTC, 3 Nov
  EXPECT_EQ(render(QStringLiteral("{{ d | date_format: \"d\" }}"), late), QStringLiteral("2"));
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin")));
  EXPECT_EQ(render(QStringLiteral("{{ d | date_format: \"d\" }}"), late), QStringLiteral("3"));
  RZDate::setDefaultTimeZone(QStringLiteral("UTC"));
}

TEST(FilterFunctions, OnlyPatternsOfDayFieldsShareADaysText) {
  for (const char* pattern : {"yyyy-MM-dd", "EEEE d. MMMM y 'um' QQQ", "w/W D F g e c", "'HH:mm' yy"}) {
    EXPECT_TRUE(GXTemplateStandardFilters::patternHasOnlyDayFields(QString::fromUtf8(pattern))) << pattern;
  }
  for (const char* pattern : {"HH:mm", "yyyy a", "d z", "dd 'x''' ss", "yyyy-MM-dd'T'HH"}) {
    EXPECT_FALSE(GXTemplateStandardFilters::patternHasOnlyDayFields(QString::fromUtf8(pattern))) << pattern;
  }
}

TEST_F(FilterTest, ColorFormatWritesHexForHex) {
  const QVariant red = QColor(255, 0, 0);
  EXPECT_EQ(filtered(red, QStringLiteral("color_format: hex")), QStringLiteral("ff0000"));
  EXPECT_EQ(filtered(red, QStringLiteral("color_format: HEX")), QStringLiteral("ff0000"));
  EXPECT_EQ(filtered(QColor(18, 52, 86, 128), QStringLiteral("color_format: hex")), QStringLiteral("123456"));
  EXPECT_EQ(filtered(QColor::fromHsv(240, 255, 255), QStringLiteral("color_format: hex")),
            QStringLiteral("0000ff"));
  EXPECT_EQ(filtered(QColor(), QStringLiteral("color_format: hex")), QStringLiteral("000000"));
  // Anything else leaves the value as it is.
  GXTemplateStandardFilters filters;
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("color_format"), {QStringLiteral("rgb")}, red), red);
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("color_format"), {}, red), red);
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("color_format"), {QStringLiteral("hex")},
                                  QStringLiteral("ff0000")),
            QVariant(QStringLiteral("ff0000")));
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("nosuch"), {}, red), red);
}

}  // namespace
