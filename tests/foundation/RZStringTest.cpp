#include "RZString.h"

#include <gtest/gtest.h>

namespace {

QString u(const char* text) {
  return QString::fromUtf8(text);
}

struct Predicate {
  const char* text;
  const char* argument;
  bool expected;
};

TEST(RZString, Predicates) {
  const Predicate prefix[] = {
      {"Hello world", "hello", true}, {"Hello", "HELLO", true}, {"ÄBC", "äb", true}, {"He", "hello", false},
      {"xhello", "hello", false},     {"Hello", "", false},     {"", "", false},
  };
  for (const Predicate& c : prefix)
    EXPECT_EQ(RZString::hasCaseInsensitivePrefix(u(c.text), u(c.argument)), c.expected)
        << c.text << " / " << c.argument;

  const Predicate contains[] = {
      {"abc", "b", true}, {"abc", "abc", true}, {"abc", "B", false}, {"abc", "", false}, {"", "a", false},
  };
  for (const Predicate& c : contains)
    EXPECT_EQ(RZString::stringContains(u(c.text), u(c.argument)), c.expected)
        << c.text << " / " << c.argument;

  const Predicate oneSpace[] = {
      {"a b", "", true},    {" a", "", true},    {"a  b", "", false}, {"ab", "", false},
      {"a b c", "", false}, {"a\tb", "", false}, {"", "", false},
  };
  for (const Predicate& c : oneSpace)
    EXPECT_EQ(RZString::stringContainsOneSpace(u(c.text)), c.expected) << c.text;

  // Tests for an apostrophe, whatever the name says.
  const Predicate apostrophe[] = {{"it's", "", true}, {"'", "", true}, {"a-b", "", false}, {"", "", false}};
  for (const Predicate& c : apostrophe)
    EXPECT_EQ(RZString::stringContainsHyphen(u(c.text)), c.expected) << c.text;

  const Predicate twoNumbers[] = {
      {"12 5", "", true}, {"12-5", "", true},   {"  12 5x", "", true}, {"-3 +4", "", true},
      {"1\n2", "", true}, {"12", "", false},    {"12a5", "", false},   {"a12 5", "", false},
      {"", "", false},    {"+ 5 6", "", false}, {"12 - 5", "", false}, {"1.5 2", "", false},
  };
  for (const Predicate& c : twoNumbers)
    EXPECT_EQ(RZString::stringBeginsWithTwoNumbers(u(c.text)), c.expected) << c.text;
}

TEST(RZString, SplitLinesKeepsTerminators) {
  const struct {
    QString text;
    QStringList lines;
  } cases[] = {
      {"", {}},
      {"a", {"a"}},
      {"a\n", {"a\n"}},
      {"a\nb", {"a\n", "b"}},
      {"\n", {"\n"}},
      {"a\r\nb\rc\n\n", {"a\r\n", "b\r", "c\n", "\n"}},
      {"a\n\rb", {"a\n", "\r", "b"}},
      {u("x\u2028y\u2029z"), {u("x\u2028"), u("y\u2029"), "z"}},
  };
  for (const auto& c : cases) EXPECT_EQ(RZString::splitLines(c.text), c.lines) << c.text.toStdString();
}

TEST(RZString, RemovingCharacters) {
  EXPECT_EQ(RZString::stringByRemovingWhitespace(u(" a\tb\nc\r d\u00a0e\u2028 ")), "abcde");
  EXPECT_EQ(RZString::stringByRemovingWhitespace("abc"), "abc");

  const struct {
    QString text, set, expected;
  } cases[] = {
      {"a-b_c", "-_", "abc"}, {"abc", "xyz", "abc"},         {"", "a", ""}, {"aaa", "a", ""},
      {"abc", "", "abc"},     {u("a😀b😁"), u("😀"), u("ab😁")},  // characters outside the BMP stay whole
  };
  for (const auto& c : cases) {
    EXPECT_EQ(RZString::stringByRemovingCharactersFromSet(c.text, c.set), c.expected) << c.text.toStdString();
    QString inPlace = c.text;
    RZString::removeCharactersInSet(inPlace, c.set);
    EXPECT_EQ(inPlace, c.expected) << c.text.toStdString();
  }
  // Nothing to remove: the very same text comes back.
  const QString untouched = "untouched";
  EXPECT_EQ(RZString::stringByRemovingCharactersFromSet(untouched, "xyz").constData(), untouched.constData());

  EXPECT_EQ(RZString::stringByRemovingPathCharacters("a/b*c[d]e?f"), "abcdef");
  EXPECT_EQ(RZString::stringByRemovingPathCharacters("Report 2024-05.html"), "Report 2024-05.html");
}

TEST(RZString, URLEncoding) {
  const struct {
    const char* text;
    const char* encoded;
  } cases[] = {
      {"", ""},
      {"abcXYZ019-._~", "abcXYZ019-._~"},
      {"a b", "a%20b"},
      {"?=&+", "%3F%3D%26%2B"},
      {"#%", "%23%25"},
      {"[]{}<>\"\\^`|", "%5B%5D%7B%7D%3C%3E%22%5C%5E%60%7C"},
      {"a/b:c@d!$'()*,;", "a/b:c@d!$'()*,;"},
      {"ä€", "%C3%A4%E2%82%AC"},
      {"user+tag@example.com", "user%2Btag@example.com"},
  };
  for (const auto& c : cases) EXPECT_EQ(RZString::stringByURLEncoding(u(c.text)), c.encoded) << c.text;
}

TEST(RZString, ReplaceAllOccurrences) {
  const struct {
    QString text, target, replacement, expected;
  } cases[] = {
      {"aaa", "a", "b", "bbb"},         {"hello world", "o", "0", "hell0 w0rld"},
      {"aabb", "ab", "", ""},  // each replacement can make a new occurrence
      {"a--b---c", "--", "-", "a-b-c"}, {"a.b.c", ".", QString(), "abc"},  // no replacement counts as empty
      {"abc", "", "x", "abc"},                                             // no target does nothing
      {"abc", QString(), "x", "abc"},   {"abc", "x", "y", "abc"},
  };
  for (const auto& c : cases) {
    QString text = c.text;
    RZString::replaceAllOccurrenceOfString(text, c.target, c.replacement);
    EXPECT_EQ(text, c.expected) << c.text.toStdString() << " / " << c.target.toStdString();
  }
}

// A replacement that contains the target would loop forever: debug builds stop, release builds refuse.
TEST(RZStringDeathTest, ReplacementContainingTheTargetIsRefused) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  QString text = "abc";
#ifdef QT_NO_DEBUG
  RZString::replaceAllOccurrenceOfString(text, "b", "xbx");
  EXPECT_EQ(text, "abc");
#else
  EXPECT_DEATH(RZString::replaceAllOccurrenceOfString(text, "b", "xbx"), "replacement contains the target");
#endif
}

}  // namespace
