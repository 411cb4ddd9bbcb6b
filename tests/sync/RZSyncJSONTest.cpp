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

// Integers stay integers; other numbers are decimals written as they came (exponents written out).
TEST(RZSyncJSON, NumbersKeepTheirKindAndDigits) {
  const QMetaType integer = QMetaType::fromType<qint64>(), decimal = QMetaType::fromType<Decimal>();
  const struct {
    const char* text;
    QMetaType type;
    const char* written;  // null: the text itself
  } rows[] = {
      {"7", integer, nullptr},
      {"80", integer, nullptr},
      {"-9223372036854775808", integer, nullptr},
      {"18446744073709551615", decimal, nullptr},  // beyond qint64
      {"99999999999999999999999999999999999999", decimal, nullptr},
      {"12.30", decimal, nullptr},
      {"-0.5", decimal, nullptr},
      {"0.10", decimal, nullptr},
      {"1234567890123456789012345678.0123456789", decimal, nullptr},
      {"0.000000000000000000000000000000000001", decimal, nullptr},
      {"1e3", decimal, "1000"},
      {"2.5E-1", decimal, "0.25"},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.text);
    const QVariant value = parsed(row.text);
    EXPECT_EQ(value.metaType(), row.type);
    EXPECT_EQ(RZSyncJSON::write(value), QByteArray(row.written ? row.written : row.text));
    if (row.type == decimal && !row.written) {
      EXPECT_TRUE(value.value<Decimal>().isIdenticalTo(dec(row.text)));
      EXPECT_EQ(RZSyncJSON::write(QVariantMap{{"rate", QVariant::fromValue(dec(row.text))}}),
                QByteArray("{\n  \"rate\": ") + row.text + "\n}");
    }
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
  // A repeated key: the last one counts.
  const QVariant value = parsed(R"({"a": [1, true, false, null, "x", {}], "b": {"c": []}, "b": {"d": 1}})");
  const QVariantList a = value.toMap().value("a").toList();
  EXPECT_EQ(a.value(1).typeId(), QMetaType::Bool);
  EXPECT_FALSE(a.value(3).isValid());  // null is a null variant
  EXPECT_EQ(RZSyncJSON::write(value, RZSyncJSON::Style::Compact),
            R"({"a":[1,true,false,null,"x",{}],"b":{"d":1}})");
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
