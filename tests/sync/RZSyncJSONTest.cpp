#include "RZSyncJSON.h"

#include "Decimal.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

namespace {

QVariant parsed(const char* text) {
  const std::optional<QVariant> value = RZSyncJSON::parse(QByteArray(text));
  EXPECT_TRUE(value.has_value()) << text;
  return value.value_or(QVariant());
}

Decimal dec(const char* text) {
  return *Decimal::fromString(QString::fromLatin1(text));
}

}  // namespace

// Money goes out and comes back as the very same text: no double on the way.
TEST(RZSyncJSON, DecimalsRoundTripExactly) {
  const char* const amounts[] = {"12.30",
                                 "-0.5",
                                 "0.10",
                                 "80",
                                 "1234567890123456789012345678.0123456789",
                                 "0.000000000000000000000000000000000001",
                                 "99999999999999999999999999999999999999"};
  for (const char* amount : amounts) {
    SCOPED_TRACE(amount);
    const QByteArray written = RZSyncJSON::write(QVariantMap{{"rate", QVariant::fromValue(dec(amount))}});
    EXPECT_TRUE(written.contains(QByteArray(amount))) << written.toStdString();
    const QVariant back = RZSyncJSON::parse(written).value_or(QVariant()).toMap().value("rate");
    // A whole amount may come back as an integer; its value and its text are the same.
    const std::optional<Decimal> decimal = Decimal::fromVariant(back);
    ASSERT_TRUE(decimal.has_value());
    EXPECT_TRUE(decimal->isIdenticalTo(dec(amount))) << decimal->toString().toStdString();
    EXPECT_EQ(RZSyncJSON::write(back), QByteArray(amount));
  }
}

TEST(RZSyncJSON, NumberTokensKeepTheirKind) {
  struct Case {
    const char* text;
    QMetaType type;
    const char* written;
  };
  const Case cases[] = {
      {"7", QMetaType::fromType<qint64>(), "7"},
      {"-9223372036854775808", QMetaType::fromType<qint64>(), "-9223372036854775808"},
      {"18446744073709551615", QMetaType::fromType<Decimal>(), "18446744073709551615"},  // beyond qint64
      {"12.30", QMetaType::fromType<Decimal>(), "12.30"},
      {"1e3", QMetaType::fromType<Decimal>(), "1000"},
      {"2.5E-1", QMetaType::fromType<Decimal>(), "0.25"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    const QVariant value = parsed(c.text);
    EXPECT_EQ(value.metaType(), c.type);
    EXPECT_EQ(RZSyncJSON::write(value), QByteArray(c.written));
  }
}

TEST(RZSyncJSON, StringsRoundTripThroughAStandardParser) {
  const QString text =
      QStringLiteral("quote \" backslash \\ tab\t newline\n nul%1 bell\a del\x7f é € 😀").arg(QChar(0));
  const QByteArray written = RZSyncJSON::write(QVariantList{text});
  // Another JSON implementation reads the same text.
  const nlohmann::json other = nlohmann::json::parse(written.toStdString());
  EXPECT_EQ(QString::fromStdString(other[0].get<std::string>()), text);
  EXPECT_EQ(parsed(written.constData()).toList().value(0).toString(), text);
}

TEST(RZSyncJSON, ContainersNullsAndBooleans) {
  const QVariant value = parsed(R"({"a": [1, true, false, null, "x", {}], "b": {"c": []}, "b": {"d": 1}})");
  const QVariantMap map = value.toMap();
  const QVariantList a = map.value("a").toList();
  ASSERT_EQ(a.size(), 6);
  EXPECT_EQ(a[1].typeId(), QMetaType::Bool);
  EXPECT_FALSE(a[3].isValid());  // null is a null variant
  EXPECT_EQ(a[5].typeId(), QMetaType::QVariantMap);
  EXPECT_EQ(map.value("b").toMap().keys(), QStringList{"d"});  // a repeated key: the last one counts
  EXPECT_TRUE(RZSyncJSON::isContainer(value));
  EXPECT_TRUE(RZSyncJSON::isContainer(parsed("[]")));
  EXPECT_FALSE(RZSyncJSON::isContainer(parsed("\"text\"")));
  EXPECT_FALSE(RZSyncJSON::isContainer(parsed("3")));
}

TEST(RZSyncJSON, MalformedTextIsRefusedWithAReason) {
  // The last one is grammatical but no number type can hold it.
  for (const char* text :
       {"", "{", "{\"a\" 1}", "[1,]", "nul", "{} {}", "\"\\x\"", "12.30.1", "1e1000000000"}) {
    SCOPED_TRACE(text);
    QString error;
    EXPECT_FALSE(RZSyncJSON::parse(QByteArray(text), &error).has_value());
    EXPECT_FALSE(error.isEmpty());
  }
}

TEST(RZSyncJSON, PrettyAndCompactWriteTheSameValue) {
  const QVariantMap value{
      {"i",
       QVariantMap{{"A@WTTask", QVariantMap{{"name", "x"}, {"budget", QVariant::fromValue(dec("1.50"))}}}}},
      {"u", QVariantMap{}},
      {"x", QStringList{"B@WTNote"}}};
  const QByteArray pretty = RZSyncJSON::write(value, RZSyncJSON::Style::Pretty);
  const QByteArray compact = RZSyncJSON::write(value, RZSyncJSON::Style::Compact);
  EXPECT_TRUE(pretty.contains("\n  \"i\": {\n    \"A@WTTask\": {")) << pretty.toStdString();
  EXPECT_FALSE(compact.contains('\n'));
  EXPECT_EQ(RZSyncJSON::write(*RZSyncJSON::parse(pretty), RZSyncJSON::Style::Compact), compact);
  EXPECT_TRUE(RZSyncJSON::sameValue(QVariant::fromValue(dec("12.30")), *RZSyncJSON::parse("12.30")));
  EXPECT_FALSE(RZSyncJSON::sameValue(QVariant::fromValue(dec("12.30")), QVariant::fromValue(dec("12.3"))));
}

TEST(RZSyncJSON, NestingIsBoundedWhileParsing) {
  const auto nested = [](std::size_t depth) {
    return QByteArray(qsizetype(depth), '[') + QByteArray(qsizetype(depth), ']');
  };
  EXPECT_TRUE(RZSyncJSON::parse(nested(RZSyncJSON::kMaxDepth)));
  QString error;
  EXPECT_FALSE(RZSyncJSON::parse(nested(RZSyncJSON::kMaxDepth + 1), &error));
  EXPECT_TRUE(error.contains("nested")) << error.toStdString();
  EXPECT_FALSE(RZSyncJSON::parse(nested(1000000)));
}
