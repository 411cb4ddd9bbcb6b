#include "RZSyncJSON.h"

#include "SyncTestSupport.h"

#include <nlohmann/json.hpp>

using synctest::dec;

// Integers stay integers; other numbers are decimals written as they came (exponents written out).
TEST(RZSyncJSON, NumbersKeepTheirKindAndDigits) {
  // clang-format off
  const struct {
    const char *text, *written;  // written: "" for the text itself; "int" for an integer written as it came
  } rows[] = {  // 18446744073709551615 is beyond qint64
      {"7", "int"}, {"80", "int"}, {"-9223372036854775808", "int"}, {"18446744073709551615", ""},
      {"99999999999999999999999999999999999999", ""}, {"12.30", ""}, {"-0.5", ""}, {"0.10", ""},
      {"1234567890123456789012345678.0123456789", ""}, {"0.000000000000000000000000000000000001", ""},
      {"1e3", "1000"}, {"2.5E-1", "0.25"}};
  // clang-format on
  for (const auto& [text, written] : rows) {
    const bool integer = QByteArray(written) == "int", asCame = integer || !*written;
    const QVariant value = RZSyncJSON::parse(text).value_or(QVariant());
    EXPECT_EQ(value.metaType(), integer ? QMetaType::fromType<qint64>() : QMetaType::fromType<Decimal>())
        << text;
    EXPECT_EQ(RZSyncJSON::write(value), QByteArray(asCame ? text : written));
    if (integer || !asCame) continue;
    EXPECT_TRUE(value.value<Decimal>().isIdenticalTo(dec(text))) << text;
    EXPECT_EQ(RZSyncJSON::write(QVariantMap{{"rate", synctest::money(text)}}),
              QByteArray("{\n  \"rate\": ") + text + "\n}");
  }
}

// Strings round-trip through another parser; the last repeated key counts; null is a null variant.
TEST(RZSyncJSON, StringsAndContainers) {
  const QString text =
      QStringLiteral("quote \" backslash \\ tab\t newline\n nul%1 bell\a del\x7f é € 😀").arg(QChar(0));
  const QByteArray written = RZSyncJSON::write(QVariantList{text});
  EXPECT_EQ(QString::fromStdString(nlohmann::json::parse(written.toStdString())[0].get<std::string>()), text);
  EXPECT_EQ(RZSyncJSON::parse(written).value_or(QVariant()).toList().value(0).toString(), text);

  const QVariant value =
      *RZSyncJSON::parse(R"({"a": [1, true, false, null, "x", {}], "b": {"c": []}, "b": {"d": 1}})");
  const QVariantList a = value.toMap().value("a").toList();
  EXPECT_TRUE(a.value(1).typeId() == QMetaType::Bool && !a.value(3).isValid());
  EXPECT_EQ(synctest::compact(value), R"({"a":[1,true,false,null,"x",{}],"b":{"d":1}})");
}

// The last text is grammatical but no number type can hold it; nesting is bounded while parsing.
TEST(RZSyncJSON, MalformedTextIsRefusedWithAReason) {
  const QByteArray deepest = QByteArray(RZSyncJSON::kMaxDepth, '[') + QByteArray(RZSyncJSON::kMaxDepth, ']');
  EXPECT_TRUE(RZSyncJSON::parse(deepest));
  for (const QByteArray& text :
       {QByteArray(), QByteArray("{"), QByteArray("{\"a\" 1}"), QByteArray("[1,]"), QByteArray("nul"),
        QByteArray("{} {}"), QByteArray("\"\\x\""), QByteArray("12.30.1"), QByteArray("1e1000000000"),
        "[" + deepest + "]", QByteArray(1000000, '[') + QByteArray(1000000, ']')}) {
    QString error;
    EXPECT_FALSE(RZSyncJSON::parse(text, &error).has_value()) << text.left(40).toStdString();
    EXPECT_FALSE(error.isEmpty());
  }
  QString error;
  RZSyncJSON::parse("[" + deepest + "]", &error);
  EXPECT_TRUE(error.contains("nested")) << error.toStdString();
}
