#include "RXRegex.h"

#include <gtest/gtest.h>

#include <QStringList>

#include <atomic>
#include <thread>
#include <vector>

namespace {

constexpr GXRange kNone{kGXNotFound, 0};

GXRange range(std::uint64_t location, std::uint64_t length) {
  return {location, length};
}

// Every match, each search continuing from the last (as the matcher walks), or `fresh` on a new copy.
QList<GXRange> walk(const QString& text, const QString& regex, bool fresh = false) {
  QList<GXRange> found;
  std::uint64_t from = 0;
  while (from <= std::uint64_t(text.size())) {
    const QString copy = fresh ? QString(text.constData(), text.size()) : text;
    const GXRange match = RXRegex::rangeOfRegex(copy, regex, range(from, text.size() - from));
    if (match.location == kGXNotFound) break;
    found.append(match);
    from = match.location + match.length + (match.length == 0 ? 1 : 0);
  }
  return found;
}

template <typename Exception, typename Call>
std::string messageOf(Call&& call) {
  try {
    call();
  } catch (const Exception& exception) {
    return exception.what();
  }
  return "(nothing raised)";
}

TEST(RXRegexRanges, AMatchCountsOnlyWithinTheRangeAndRangesBeyondTheTextRaise) {
  const QString digits = "0123456789", letters = "abcdef";
  const struct {
    const QString& text;
    const char* regex;
    GXRange within, found;
  } cases[] = {
      // clang-format off
      {digits, "9", RXRegex::kWholeString, range(9, 1)},  {digits, "[0-9]+", RXRegex::kWholeString, range(0, 10)},
      {digits, "$", range(10, 0), range(10, 0)},
      // Greedy "c\w*" is "cdef"; "cd" would fit in (0, 4) but is not what the search finds.
      {letters, "c\\w*", range(0, 4), kNone},             {letters, "c\\w*", range(0, 6), range(2, 4)},
      {letters, "e", range(0, 3), kNone},                 {letters, "a", range(1, 5), kNone},
      // clang-format on
  };
  for (const auto& c : cases)
    EXPECT_EQ(RXRegex::rangeOfRegex(c.text, QString::fromUtf8(c.regex), c.within), c.found) << c.regex;
  EXPECT_FALSE(RXRegex::isMatchedByRegex(letters, "f", 0, range(0, 5), nullptr));
  EXPECT_TRUE(RXRegex::isMatchedByRegex(letters, "f"));
  for (const GXRange bad : {range(11, 0), range(0, 11), range(10, 1), range(kGXNotFound, 0),
                            range(3, kGXMaxLength - 1), range(5, kGXMaxLength)}) {
    EXPECT_EQ(messageOf<RXRegex::RangeException>([&] { RXRegex::rangeOfRegex(digits, "1", bad); }),
              "The search range exceeds the strings bounds.")
        << bad.location << "," << bad.length;
  }
}

TEST(RXRegexRanges, ContinuedSearchesFindWhatFreshSearchesFind) {
  const std::pair<const char*, const char*> cases[] = {
      {"a1b22c333d", "\\d+"},
      {"abc", "x*"},                 // empty matches everywhere, ends included
      {"aaa", "a|"},                 // alternating non-empty and empty matches
      {"xx yy  zz", "\\b"},          // zero-width assertions
      {"ab\ncd\nef", "(?m)^\\w"},    // anchors depend on what precedes the start
      {"caterpillar", "(?<=a)\\w"},  // look-behind sees text before the range
  };
  for (const auto& [text, regex] : cases)
    EXPECT_EQ(walk(text, regex), walk(text, regex, true)) << text << " / " << regex;
  EXPECT_EQ(walk("a1b22c333d", "\\d+"), (QList<GXRange>{range(1, 1), range(3, 2), range(6, 3)}));
}

TEST(RXRegexCaptures, CapturesAndTheirBoundsAndANullPatternRaises) {
  const QString text = "key = value";
  const QString regex = "(\\w+)\\s*=\\s*(\\w+)(;)?";
  EXPECT_EQ(RXRegex::captureCountForRegex(regex), 3);
  EXPECT_EQ(RXRegex::rangeOfRegex(text, regex, 1), range(0, 3));
  EXPECT_EQ(RXRegex::stringByMatching(text, regex, 2), "value");
  EXPECT_EQ(RXRegex::stringByMatching(text, regex), text);
  // A group that took no part in the match: no range, no text.
  EXPECT_EQ(RXRegex::rangeOfRegex(text, regex, 3), kNone);
  EXPECT_TRUE(RXRegex::stringByMatching(text, regex, 3).isNull());
  for (int bad : {-1, 4})
    EXPECT_EQ(messageOf<RXRegex::InvalidArgumentException>([&] { RXRegex::rangeOfRegex(text, regex, bad); }),
              "The capture argument is not valid.");
  EXPECT_TRUE(RXRegex::stringByMatching(text, "nope").isNull());
  // An empty match is text found, not nothing; the empty pattern is a pattern.
  const QString empty = RXRegex::stringByMatching(text, "x*");
  EXPECT_TRUE(!empty.isNull() && empty.isEmpty());
  EXPECT_EQ(RXRegex::rangeOfRegex("abc", ""), range(0, 0));
  EXPECT_EQ(RXRegex::captureCountForRegex(""), 0);
  const char* null = "The regular expression argument is NULL.";
  EXPECT_EQ(messageOf<RXRegex::InvalidArgumentException>([] { RXRegex::rangeOfRegex("a", QString()); }),
            null);
  EXPECT_EQ(messageOf<RXRegex::InvalidArgumentException>([] { RXRegex::captureCountForRegex(QString()); }),
            null);
}

// A pattern that does not compile finds nothing and, when asked, says so; a later good search clears it.
TEST(RXRegexErrors, ACompileErrorFindsNothingAndIsDescribedWhenAsked) {
  RXRegex::Error error;
  EXPECT_EQ(RXRegex::rangeOfRegex("abc", "ab(", 0, RXRegex::kWholeString, 0, &error), kNone);
  EXPECT_EQ(std::pair(error.domain, error.value("RXICURegexOffset").toInt()),
            std::pair(QStringLiteral("RXICURegexErrorDomain"), 3));
  EXPECT_EQ(RXRegex::captureCountForRegex("ab("), -1);
  EXPECT_EQ(RXRegex::rangeOfRegex("abc", "ab("), kNone);
  EXPECT_EQ(RXRegex::rangeOfRegex("abc", "b", 0, RXRegex::kWholeString, 0, &error), range(1, 1));
  EXPECT_TRUE(error.isNull());
}

// A text changed in place is searched anew, not answered from the match remembered for it.
TEST(RXRegexCache, ChangedTextsAreSearchedAnew) {
  QString text = "one two three";
  EXPECT_EQ(RXRegex::rangeOfRegex(text, "t\\w+"), range(4, 3));
  text.replace(4, 3, "TWO");
  EXPECT_EQ(RXRegex::rangeOfRegex(text, "t\\w+"), range(8, 5));
}

TEST(RXRegexCache, CollidingPatternsEvictEachOtherAndStillWork) {
  const QString first = "first[0-9]";
  RXRegex::rangeOfRegex("first1", first);
  // Find a pattern whose slot is first's: using first again after it costs a compilation.
  QString colliding;
  for (int i = 0; i < 500 && colliding.isNull(); ++i) {
    const QString candidate = QStringLiteral("other%1").arg(i);
    RXRegex::rangeOfRegex("x", candidate);
    const std::uint64_t before = RXRegex::compileCount();
    RXRegex::rangeOfRegex("first2", first);
    if (RXRegex::compileCount() != before) colliding = candidate;
  }
  ASSERT_FALSE(colliding.isNull()) << "23 slots: some pattern among 500 must share a slot";
  for (int round = 0; round < 3; ++round) {
    const std::uint64_t before = RXRegex::compileCount();
    EXPECT_EQ(RXRegex::rangeOfRegex("an " + colliding, colliding), range(3, colliding.size()));
    EXPECT_EQ(RXRegex::rangeOfRegex("xx first7", first), range(3, 6));
    EXPECT_EQ(RXRegex::compileCount(), before + 2);
  }
}

TEST(RXRegexCache, TextsThatDoNotOwnTheirCharactersAreCopied) {
  // Short and long texts of two slots share a buffer: each search must see its own characters.
  for (const qsizetype length : {qsizetype(40), qsizetype(5000)}) {
    std::vector<QChar> one(size_t(length), u'a'), two(size_t(length), u'b');
    one[size_t(length - 3)] = u'X';
    two[size_t(length - 7)] = u'Y';
    const QString rawOne = QString::fromRawData(one.data(), length),
                  rawTwo = QString::fromRawData(two.data(), length);
    for (int round = 0; round < 3; ++round) {
      EXPECT_EQ(RXRegex::rangeOfRegex(rawOne, "X"), range(length - 3, 1)) << length;
      EXPECT_EQ(RXRegex::rangeOfRegex(rawTwo, "Y"), range(length - 7, 1)) << length;
      EXPECT_EQ(RXRegex::rangeOfRegex(rawTwo, "X"), kNone) << length;
      EXPECT_EQ(RXRegex::rangeOfRegex(rawOne, "Y"), kNone) << length;
    }
    // The same characters changed in place under the same pointer and length: forgotten by clearing.
    one[size_t(length - 3)] = u'a';
    one[0] = u'X';
    RXRegex::clearStringCache();
    EXPECT_EQ(RXRegex::rangeOfRegex(rawOne, "X"), range(0, 1)) << length;
  }
}

TEST(RXRegexConcurrency, ThreadsSearchingAtOnceGetTheirOwnResults) {
  std::atomic<int> wrong{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([t, &wrong] {
      const QString regex = QStringLiteral("t%1-(\\d+)").arg(t);
      for (int i = 0; i < 1500; ++i) {
        const QString text = QStringLiteral("%1 t%2-%3 tail").arg(QString(i % 7, u'.')).arg(t).arg(i);
        if (RXRegex::stringByMatching(text, regex, 1) != QString::number(i)) ++wrong;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(wrong.load(), 0);
}

}  // namespace
