#pragma once
// The template fuzzer's set-up, shared with the golden table (tests/fuzz/corpus -> tests/fuzz/golden).
#include "Date.h"
#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"
#include "KeyPath.h"

#include <QDateTime>
#include <QString>
#include <QVariant>

#include <cstddef>

namespace templatefuzz {

// A record as the model offers them: answers one key, takes no values.
class Record : public KeyValueCoding {
 public:
  QVariant valueForKey(const QString& key) const override {
    return key == QLatin1String("name") ? QVariant(QStringLiteral("Acme")) : QVariant();
  }
};

inline QVariant decimal(const char* text) {
  return QVariant::fromValue(*Decimal::fromString(QString::fromLatin1(text)));
}
inline QVariant utc(int year, int month, int day, int hour, int minute) {
  return QVariant::fromValue(
      Date::fromQDateTime(QDateTime(QDate(year, month, day), QTime(hour, minute), Qt::UTC)));
}

inline QVariantMap variables() {
  static const Record record;
  // clang-format off
  return {{"i", 42}, {"big", qlonglong(1) << 40}, {"flag", true}, {"amount", decimal("12.30")}, {"money", decimal("7.9")},
          {"ratio", 0.1}, {"when", utc(2024, 1, 1, 0, 0)}, {"d", utc(2024, 3, 31, 22, 30)},
          {"q", QDateTime(QDate(2024, 12, 24), QTime(8, 0), Qt::UTC)}, {"pair", QVariantList{1, QStringLiteral("two words")}},
          {"map", QVariantMap{{"k", QStringLiteral("v")}}}, {"m", QVariantMap{{"b", 2}, {"a", 1}}},
          {"letters", QStringList{"a", "b", "c"}},
          {"rows", QVariantList{QVariantMap{{"name", "first"}}, QVariantMap{{"name", "second"}}}},
          {"nested", QVariantList{QVariantList{1, 2}, QVariantList{3}}}, {"client", KeyPath::variantFromObject(&record)},
          {"account", QVariantMap{{"name", QStringLiteral("Bar")}}}, {"title", QStringLiteral("A")},
          {"item", QStringLiteral("ROOT")}, {"list", QVariantList{1, 2, 3}}, {"names", QStringList{"a", "b"}},
          {"holes", QVariantList{1, QVariant(), 3}}, {"none", QVariantList{}}, {"outer", QStringList{"x", "y"}},
          {"inner", QStringList{"1", "2"}}, {"n", 2}, {"x", 5}, {"y", QStringLiteral("5")}, {"name", QStringLiteral("abc")},
          {"kind", QStringLiteral("time")}, {"word", QStringLiteral("abc")}, {"text", QStringLiteral("no")},
          {"empty", QString()}, {"one", 1}, {"zero", 0}, {"dzero", QVariant::fromValue(Decimal())},
          {"dhalf", decimal("0.5")}, {"fzero", 0.0}, {"up", QStringLiteral("Straße")}, {"low", QStringLiteral("ÀB c")},
          {"words", QStringLiteral("hello wORLD o'neil-smith 123abc 4U élan\tvital\nend")}};
  // clang-format on
}

struct Delimiters {
  const char* markerStart;
  const char* markerEnd;
  const char* expressionStart;
  const char* expressionEnd;
  const char* filter;
};

// The defaults first; the others include regular-expression characters and one-character delimiters.
inline constexpr Delimiters kDelimiters[] = {{"{%", "%}", "{{", "}}", "|"},
                                             {"<%", "%>", "<%=", "%>", "!"},
                                             {"[[", "]]", "$(", ")", "\\"},
                                             {"(", ")", "*", "*", "."},
                                             {"{%", "%}", "[[", "]]", "!"}};
inline constexpr std::size_t kDelimiterSets = sizeof(kDelimiters) / sizeof(kDelimiters[0]);

// Sets `engine` up: a first byte below kDelimiterSets picks the delimiters; runaway loops hit the limits.
inline QString prepare(GXTemplateEngine& engine, const char* data, std::size_t size) {
  std::size_t choice = 0;
  if (size > 0 && static_cast<unsigned char>(data[0]) < kDelimiterSets) {
    choice = static_cast<unsigned char>(data[0]);
    ++data;
    --size;
  }
  const Delimiters& d = kDelimiters[choice];
  engine.setMarkerStartDelimiter(QString::fromLatin1(d.markerStart));
  engine.setMarkerEndDelimiter(QString::fromLatin1(d.markerEnd));
  engine.setExpressionStartDelimiter(QString::fromLatin1(d.expressionStart));
  engine.setExpressionEndDelimiter(QString::fromLatin1(d.expressionEnd));
  engine.setFilterDelimiter(QString::fromLatin1(d.filter));
  engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
  engine.setMaximumSteps(20000);
  engine.setMaximumOutputLength(1 << 20);
  return QString::fromUtf8(data, qsizetype(size));
}

}  // namespace templatefuzz
