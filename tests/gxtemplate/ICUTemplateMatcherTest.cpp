#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"
#include "RXRegex.h"

#include <gtest/gtest.h>

namespace {

// A matcher over an engine whose template a run without a matcher set.
class MatcherTest : public ::testing::Test {
 protected:
  MatcherTest() : matcher(&engine) {}

  void use(const QString& text) {
    engine.processTemplate(text, {});  // no matcher set: only takes the template
    matcher.engineSettingsChanged();
  }

  GXTemplateEngine engine;
  ICUTemplateMatcher matcher;
};

// Each match as "type name [args] filter [filter args]", with "-" for an absent name or filter.
TEST_F(MatcherTest, SplitsMarkersAndExpressions) {
  const std::pair<const char*, const char*> cases[] = {
      // clang-format off
      {"{{ client.name }}", "expression client.name [] - []"}, {"{% for item in items %}", "marker for [item,in,items] - []"},
      {"{{ d | date_format: \"%d.%m.%Y\" }}", "expression d [] date_format [%d.%m.%Y]"},
      {"{{d|date_format:'yyyy MM'}}", "expression d [] date_format [yyyy MM]"}, {"{% if a == 'x y' %}", "marker if [a,==,x y] - []"},
      {"{% set x '' 5 %}", "marker set [x] - []"}, {"{% cycle \"a \\\" b\" 'c' %}", "marker cycle [a \\\" b,c] - []"},
      {"{{ a | b | c }}", "expression a [] b [|,c]"}, {"{{ a | f: x: y }}", "expression a [] f [x:,y]"},
      {"{{ a | '' x }}", "expression a [] - []"}, {"{%  %}", "marker - [] - []"}, {"{{}}", "expression - [] - []"},
      {"{% '' | upper %}", "marker - [] upper []"},
      {"{%\tnow\n%}", "marker now [] - []"},  // blanks around the body may include a line end
      // clang-format on
  };
  for (const auto& [text, expected] : cases) {
    const GXRange whole{0, std::uint64_t(QString::fromUtf8(text).size())};
    use(QString::fromUtf8(text));
    const std::shared_ptr<const GXTemplateMatch> m = matcher.firstMarkerWithinRange(whole);
    ASSERT_TRUE(m) << text;
    EXPECT_EQ(m->range, whole) << text;
    const QString described =
        QStringList{m->type, m->name.isNull() ? "-" : m->name, "[" + m->args.join(',') + "]",
                    m->filter.isNull() ? "-" : m->filter, "[" + m->filterArgs.join(',') + "]"}
            .join(' ');
    EXPECT_EQ(described.toStdString(), expected) << text;
  }
}

TEST_F(MatcherTest, ArgumentsSplitAtBlanksOutsideQuotes) {
  const std::pair<const char*, QStringList> cases[] = {
      // clang-format off
      {"a  b\tc", {"a", "b", "c"}}, {"\"x y\" 'z w' v", {"x y", "z w", "v"}},
      {"'it\\'s' \"say \\\"hi\\\"\"", {"it\\'s", "say \\\"hi\\\""}},  // escapes are kept as written
      {"a \"\" b", {"a"}},  // an empty quoted argument ends the split
      {"'' a", {}}, {"\"unclosed x", {"\"unclosed", "x"}}, {"mixed\"quote\"s", {"mixed\"quote\"s"}}, {"", {}}, {"   ", {}},
      // clang-format on
  };
  for (const auto& [text, arguments] : cases) EXPECT_EQ(matcher.argumentsFromString(text), arguments) << text;
}

TEST_F(MatcherTest, FindsWhatASearchFromTheAskedPositionFinds) {
  // From every position, to the end and then to a shorter end, the matcher finds what the plain search
  // finds: a match reaching past the range is none, whatever was found from the same place before.
  // clang-format off
  const QStringList pieces{"{{", "}}", "{%", "%}", "|", " ", "\t", "\n", "\r\n", "x", "ab", ":", "\"", "'",
                           "\\", QChar(0x2028), QChar(0x0085), QChar(0x00a0), "{", "%"};
  // clang-format on
  std::uint32_t seed = 12345;
  auto next = [&seed] { return (seed = seed * 1664525u + 1013904223u) >> 8; };
  for (int round = 0; round < 300; ++round) {
    QString text;
    const int count = 1 + int(next() % 40);
    for (int i = 0; i < count; ++i) text += pieces[next() % pieces.size()];
    use(text);
    for (std::uint64_t location = 0; location <= std::uint64_t(text.size()); ++location) {
      const std::uint64_t rest = text.size() - location;
      for (const GXRange within : {GXRange{location, rest}, GXRange{location, next() % (rest + 1)}}) {
        const GXRange expected =
            RXRegex::rangeOfRegex(QString(text.constData(), text.size()), matcher.regex(), within);
        const std::shared_ptr<const GXTemplateMatch> found = matcher.firstMarkerWithinRange(within);
        const GXRange got = found ? found->range : GXRange{kGXNotFound, 0};
        ASSERT_EQ(got, expected) << "text " << text.toStdString() << " in " << location << "+"
                                 << within.length;
      }
    }
  }
  use("ab");
  EXPECT_THROW(matcher.firstMarkerWithinRange({0, 3}), RXRegex::RangeException);
}

TEST(MatcherCharacterClasses, AreThoseOfTheRegularExpressions) {
  // The classes decide where the matcher starts its searches: they must be ICU's own.
  int differences = 0;
  for (char32_t c = 0; c < 0x10000; ++c) {
    if (c >= 0xd800 && c <= 0xdfff) continue;
    const QString one{QChar(char16_t(c))};
    const bool space = RXRegex::isMatchedByRegex(one, "^\\s$");
    const bool dot = RXRegex::isMatchedByRegex(one, "^.$");
    if (space != ICUTemplateMatcher::isPatternSpace(char16_t(c))) ++differences;
    if (dot == ICUTemplateMatcher::isPatternLineEnd(char16_t(c))) ++differences;
  }
  EXPECT_EQ(differences, 0);
}

}  // namespace
