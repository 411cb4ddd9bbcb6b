#include "Date.h"
#include "Decimal.h"
#include "TemplateTestSupport.h"

#include <QDateTime>

namespace {

using LoopTest = TemplateTest;
using ConditionTest = TemplateTest;
using StatementTest = TemplateTest;

const QVariantMap kLetters{{"letters", QStringList{"a", "b", "c"}}};

TEST_F(LoopTest, RangesCountBothEnds) {
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 3 %}{{ currentLoop.currentIndex }}{% /for %}")),
            QStringLiteral("123"));
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 3 reversed %}{{ currentLoop.currentIndex }}{% /for %}")),
            QStringLiteral("321"));
  // The middle word is not checked; the ends may be variables or "0..." text.
  EXPECT_EQ(render(QStringLiteral("{% for 0 up n %}{{ currentLoop.currentIndex }}{% /for %}"), {{"n", 2}}),
            QStringLiteral("012"));
  EXPECT_EQ(render(QStringLiteral("{% for -1 to 1 %}[{{ currentLoop.currentIndex }}]{% /for %}")),
            QStringLiteral("[-1][0][1]"));
  EXPECT_EQ(render(QStringLiteral("{% for 2 to 2 %}x{% /for %}")), QStringLiteral("x"));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(LoopTest, RangesThatCannotRunWriteNothing) {
  for (const char* text : {"{% for 3 to 1 %}x{% /for %}y", "{% for a to 3 %}x{% /for %}y",
                           "{% for 1 to nope %}x{% /for %}y", "{% for 1 to word %}x{% /for %}y"}) {
    EXPECT_EQ(render(QString::fromUtf8(text), {{"word", QStringLiteral("abc")}}), QStringLiteral("y"))
        << text;
    EXPECT_TRUE(delegate.errors.empty()) << text;
  }
}

TEST_F(LoopTest, CollectionsGiveTheLoopVariableAndIndex) {
  EXPECT_EQ(render(QStringLiteral("{% for x in letters %}{{ x }}{{ currentLoop.currentIndex }}{% /for %}"),
                   kLetters),
            QStringLiteral("a0b1c2"));
  // Reversed: last to first, the index from the count down to 1.
  EXPECT_EQ(
      render(QStringLiteral("{% for x in letters reversed %}{{ x }}{{ currentLoop.currentIndex }}{% /for %}"),
             kLetters),
      QStringLiteral("c3b2a1"));
  EXPECT_EQ(
      render(QStringLiteral("{% for x in letters %}{{ currentLoop.startIndex }}{{ currentLoop.endIndex }}"
                            "{{ currentLoop.reversed }}{% /for %}"),
             kLetters),
      QStringLiteral("030030030"));
  // A map enumerates its values (in key order), and cannot be reversed.
  const QVariantMap map{{"m", QVariantMap{{"b", 2}, {"a", 1}}}};
  EXPECT_EQ(
      render(QStringLiteral("{% for v in m %}{{ v }}{% /for %}|{% for v in m reversed %}{{ v }}{% /for %}"),
             map),
      QStringLiteral("12|12"));
  // "reversed" counts only as the fourth of exactly four arguments.
  EXPECT_EQ(render(QStringLiteral("{% for x in letters reversed extra %}{{ x }}{% /for %}"), kLetters),
            QStringLiteral("abc"));
}

// Each round stores the loop variable and the index where a variable of that name lives: the loop's own
// frame as a rule (changed in place), but a run variable of the same name shadows the frame from the
// first round on and takes the later rounds' values.
TEST_F(LoopTest, EachRoundStoresWhereTheNameLives) {
  const QVariantMap vars{{"item", QStringLiteral("ROOT")},
                         {"list", QVariantList{1, 2, 3}},
                         {"names", QStringList{"a", "b"}},
                         {"holes", QVariantList{1, QVariant(), 3}}};
  EXPECT_EQ(render(QStringLiteral("{% for item in list %}[{{ item }}]{% /for %} after {{ item }}"), vars),
            QStringLiteral("[ROOT][2][3] after 3"));
  // An inner loop of the same name has a frame of its own.
  EXPECT_EQ(
      render(QStringLiteral("{% for x in list %}{% for x in names %}{{ x }}{% /for %}{{ x }}{% /for %}"),
             vars),
      QStringLiteral("ab1ab2ab3"));
  // A missing element leaves the name unset for its round; the index goes on.
  EXPECT_EQ(
      render(QStringLiteral("{% for x in holes %}{{ currentLoop.currentIndex }}{% if x %}{{ x }}{% /if %};"
                            "{% /for %}"),
             vars),
      QStringLiteral("01;1;23;"));
  // A value set in the body lasts only until the next round.
  EXPECT_EQ(render(QStringLiteral("{% for x in list %}{% set x = 9 %}{{ x }}{% /for %}"), vars),
            QStringLiteral("123"));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(LoopTest, LoopVariablesEndWithTheirBlock) {
  EXPECT_EQ(render(QStringLiteral("{% for x in letters %}{% /for %}{{ x }}{{ currentLoop }}"), kLetters),
            QString());
  EXPECT_EQ(delegate.codes(), (QList<int>{3, 3}));
}

TEST_F(LoopTest, EmptyOrMissingCollectionsSkipTheBody) {
  const QVariantMap vars{{"none", QVariantList{}}, {"text", QStringLiteral("abc")}, {"number", 3}};
  for (const char* name : {"none", "missing", "text", "number"}) {
    EXPECT_EQ(
        render(QStringLiteral("a{% for x in %1 %}{{ x }}{{ nope }}{% /for %}b").arg(QLatin1String(name)),
               vars),
        QStringLiteral("ab"))
        << name;
    EXPECT_TRUE(delegate.errors.empty()) << name;
  }
}

TEST_F(LoopTest, ASkippedLoopTurnsOutputBackOnAtItsEnd) {
  // Inside a false conditional the skipped loop's end enables output unconditionally: "C" is written.
  EXPECT_EQ(render(QStringLiteral("{% if false %}A{% for x in missing %}B{% /for %}C{% /if %}D")),
            QStringLiteral("CD"));
  EXPECT_EQ(render(QStringLiteral("{% comment %}A{% for x in missing %}B{% /for %}C{% /comment %}D")),
            QStringLiteral("CD"));
}

TEST_F(LoopTest, NestedLoopsSeeTheirParentLoop) {
  const QVariantMap vars{{"outer", QStringList{"x", "y"}}, {"inner", QStringList{"1", "2"}}};
  EXPECT_EQ(render(QStringLiteral("{% for o in outer %}{% for i in inner %}{{ o }}{{ i }}"
                                  "{{ currentLoop.parentLoop.currentIndex }} {% /for %}{% /for %}"),
                   vars),
            QStringLiteral("x10 x20 y11 y21 "));
  // The enclosing block must belong to the standard markers; a section in between still counts.
  EXPECT_EQ(render(QStringLiteral(
                "{% for 5 to 5 %}{% section s %}{% for 1 to 1 %}{{ currentLoop.parentLoop.currentIndex }}"
                "{% /for %}{% /section %}{% /for %}")),
            QStringLiteral("5"));
  // A loop at the top has no parent.
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 1 %}{{ currentLoop.parentLoop }}{% /for %}")), QString());
  EXPECT_EQ(delegate.codes(), QList<int>{3});
}

TEST_F(LoopTest, ALoopWithTooFewArgumentsStartsNoBlock) {
  EXPECT_EQ(render(QStringLiteral("{% for x in %}a{% /for %}b")), QStringLiteral("a"));
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].message,
            QStringLiteral("Marker \"/for\" reported that a non-existent block ended"));
}

TEST_F(LoopTest, TheCollectionIsTakenWhenTheLoopBegins) {
  EXPECT_EQ(
      render(QStringLiteral("{% for x in letters %}{% set letters.2 z %}{{ x }}{% /for %}{{ letters.2 }}"),
             kLetters),
      QStringLiteral("abcz"));
}

TEST_F(ConditionTest, OneArgumentIsItsTruth) {
  const QVariantMap vars{{"one", 1},
                         {"zero", 0},
                         {"text", QStringLiteral("no")},
                         {"empty", QString()},
                         {"list", QVariantList{}},
                         {"dzero", QVariant::fromValue(Decimal())},
                         {"dhalf", QVariant::fromValue(*Decimal::fromString(QStringLiteral("0.5")))},
                         {"fzero", 0.0}};
  struct Case {
    const char* arg;
    bool truth;
  };
  const Case cases[] = {{"true", true},  {"YES", true},    {"yes", true},      {"false", false},
                        {"NO", false},   {"no", false},    {"one", true},      {"zero", false},
                        {"text", true},  {"empty", true},  {"list", true},     {"dzero", false},
                        {"dhalf", true}, {"fzero", false}, {"missing", false}, {"1", false},
                        {"'yes'", true}};
  for (const Case& c : cases) {
    EXPECT_EQ(render(QStringLiteral("{% if %1 %}T{% else %}F{% /if %}").arg(QLatin1String(c.arg)), vars),
              c.truth ? QStringLiteral("T") : QStringLiteral("F"))
        << c.arg;
  }
}

TEST_F(ConditionTest, ThreeArgumentsCompare) {
  const QVariantMap vars{{"x", 5},
                         {"y", QStringLiteral("5")},
                         {"name", QStringLiteral("abc")},
                         {"kind", QStringLiteral("time")},
                         {"money", QVariant::fromValue(*Decimal::fromString(QStringLiteral("7.9")))}};
  struct Case {
    const char* condition;
    bool result;
  };
  const Case cases[] = {
      {"x > 3", true},
      {"x < 3", false},
      {"x >= 5", true},
      {"x <= 4", false},
      {"x == 5", true},
      {"x = y", true},
      {"x != 4", true},
      {"x <> 5", false},
      {"x % 2", true},
      {"x % 5", false},
      {"x % 0", false},
      {"x % zero", false},
      {"money == 7", true},
      {"007 == 7", true},
      {"0 == zero", true},
      {"2abc == 2", true},
      // A side that is not a number counts 1 when it names a variable, else 0.
      {"name == 1", true},
      {"missing == 0", true},
      {"abc == 0", true},
      {"name > missing", true},
      {"true and yes", true},
      {"true && false", false},
      {"false or yes", true},
      {"no || NO", false},
      {"x AND x", true},
      {"kind equalsstring time", true},
      {"kind EqualsString kind", true},
      {"x equalsstring y", true},
      {"kind notequalsstring time", false},
      {"name notequalsstring x", true},
      {"x ~ 5", false},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(
        render(QStringLiteral("{% if %1 %}T{% else %}F{% /if %}").arg(QLatin1String(c.condition)), vars),
        c.result ? QStringLiteral("T") : QStringLiteral("F"))
        << c.condition;
    EXPECT_TRUE(delegate.errors.empty()) << c.condition;
  }
}

TEST_F(ConditionTest, ElseSwitchesOnceAndOnlyItsOwnConditional) {
  EXPECT_EQ(render(QStringLiteral("{% if true %}A{% else %}B{% else %}C{% /if %}")), QStringLiteral("A"));
  EXPECT_EQ(render(QStringLiteral("{% if false %}A{% else %}B{% else %}C{% /if %}")), QStringLiteral("BC"));
  // A conditional inside a disabled one never turns output on.
  EXPECT_EQ(render(QStringLiteral("{% if false %}{% if true %}A{% else %}B{% /if %}C{% /if %}D")),
            QStringLiteral("D"));
  EXPECT_EQ(render(QStringLiteral("{% if true %}{% if false %}A{% else %}B{% /if %}C{% else %}E{% /if %}")),
            QStringLiteral("BC"));
  // An else outside any conditional is ignored.
  EXPECT_EQ(render(QStringLiteral("a{% else %}b")), QStringLiteral("ab"));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(ConditionTest, TwoArgumentsAreNeverEvaluated) {
  EXPECT_EQ(render(QStringLiteral("{% if not x %}A{% /if %}B")), QStringLiteral("A"));
  ASSERT_EQ(delegate.errors.size(), 1u);
  EXPECT_EQ(delegate.errors[0].code, 1);
  EXPECT_EQ(delegate.errors[0].message,
            QStringLiteral("Marker \"/if\" reported that a non-existent block ended"));
  EXPECT_EQ(render(QStringLiteral("{% if a b c d %}A{% /if %}B")), QStringLiteral("A"));
  EXPECT_EQ(delegate.codes(), QList<int>{1});
}

TEST_F(StatementTest, CommentsHideTheirContent) {
  EXPECT_EQ(
      render(QStringLiteral("a{% comment %}b{{ missing }}{% comment %}c{% /comment %}d{% /comment %}e")),
      QStringLiteral("ae"));
  EXPECT_TRUE(delegate.errors.empty());
  // With arguments it is no comment, and its end closes nothing.
  EXPECT_EQ(render(QStringLiteral("a{% comment x %}b{% /comment %}c")), QStringLiteral("ab"));
  EXPECT_EQ(delegate.codes(), QList<int>{1});
}

TEST_F(StatementTest, SectionsAreNamedBlocks) {
  EXPECT_EQ(render(QStringLiteral("{% section head %}x{% section body %}y{% /section %}{% /section %}")),
            QStringLiteral("xy"));
  EXPECT_EQ(delegate.events,
            (QStringList{"start section", "start section", "end section", "end section", "finished"}));
  EXPECT_EQ(render(QStringLiteral("{% section %}x{% /section %}")), QStringLiteral("x"));
  EXPECT_EQ(delegate.codes(), QList<int>{1});
}

TEST_F(StatementTest, CyclesAdvanceByMarkerPosition) {
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 3 %}{% cycle odd even %}{% /for %}")),
            QStringLiteral("oddevenodd"));
  EXPECT_EQ(render(QStringLiteral("{% for 1 to 3 %}{% cycle a b c %}{% cycle x y %}-{% /for %}")),
            QStringLiteral("ax-by-cx-"));
  // The arguments are texts, not variables; every run starts afresh.
  EXPECT_EQ(render(QStringLiteral("{% cycle x y %}{% cycle x y %}"), {{"x", 1}}), QStringLiteral("xx"));
  EXPECT_EQ(render(QStringLiteral("{% cycle %}z")), QStringLiteral("z"));
  EXPECT_TRUE(delegate.errors.empty());
}

TEST_F(StatementTest, SetStoresTextWhileOutputIsOn) {
  EXPECT_EQ(render(QStringLiteral("{% set title Report %}{{ title }}")), QStringLiteral("Report"));
  EXPECT_EQ(render(QStringLiteral("{% set a x %}{{ a }}"), {{"x", 5}}), QStringLiteral("x"));
  EXPECT_EQ(render(QStringLiteral("{% set t 'two words' %}{{ t }}")), QStringLiteral("two words"));
  EXPECT_EQ(render(QStringLiteral(
                "{% if false %}{% set t A %}{% /if %}{% set u B C %}{% set v %}{{ t }}{{ u }}{{ v }}")),
            QString());
  EXPECT_EQ(delegate.codes(), (QList<int>{3, 3, 3}));
}

TEST_F(StatementTest, NowIsTheCurrentDate) {
  const Date fixed = Date::fromQDateTime(QDateTime(QDate(2031, 7, 4), QTime(12, 0), Qt::UTC));
  Date::setClockForTesting([fixed] { return fixed; });
  EXPECT_EQ(render(QStringLiteral("{% now | date_format: \"yyyy\" %}")), QStringLiteral("2031"));
  EXPECT_EQ(render(QStringLiteral("{% now %}")), QStringLiteral("2031-07-04 12:00:00 +0000"));
  Date::setClockForTesting({});
}

TEST_F(StatementTest, LoadFindsClassesByName) {
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

}  // namespace
