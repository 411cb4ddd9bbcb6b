#include "TestFiles.h"
#include "UserDefaults.h"

#include <gtest/gtest.h>

#include <QFile>
#include <QSignalSpy>
#include <QStandardPaths>
#include <QTemporaryDir>

namespace {

const auto dec = [](const char* text) { return *Decimal::fromString(QString::fromLatin1(text)); };

// A read value as text, with its type where that is what matters: "Decimal 12.30", "Date 42.5".
QString described(const QVariant& value) {
  if (value.metaType() == QMetaType::fromType<Decimal>())
    return "Decimal " + value.value<Decimal>().toString();
  if (value.metaType() == QMetaType::fromType<Date>())
    return "Date " + QString::number(value.value<Date>().secondsSince1970(), 'f', 6);
  return QString::fromLatin1(value.typeName()) + " " + value.toString();
}
template <class T>
QString described(const std::optional<T>& value) {
  return value ? described(QVariant::fromValue(*value)) : "-";
}

class UserDefaultsTest : public ::testing::Test {
 protected:
  QString path() const { return dir_.filePath("Tessal.conf"); }
  QTemporaryDir dir_;
};

TEST_F(UserDefaultsTest, StoredValuesOverrideRegisteredDefaultsUntilRemovedAndAreAnnounced) {
  const UserDefaults standard;
  EXPECT_EQ(standard.fileName(),
            QStandardPaths::writableLocation(QStandardPaths::GenericConfigLocation) + "/Tessal/Tessal.conf");
  EXPECT_TRUE(standard.fileName().startsWith(qEnvironmentVariable("XDG_CONFIG_HOME")));
  UserDefaults defaults(path());
  QSignalSpy spy(&defaults, &UserDefaults::valueChanged);
  defaults.registerDefaults({{"WTIdleTime", 5}, {"wtInvoiceUnit", "h"}});
  EXPECT_TRUE(defaults.integerForKey("WTIdleTime") == 5 && !defaults.hasStoredValue("WTIdleTime"));
  EXPECT_FALSE(defaults.value("WTShouldIdle").isValid());
  defaults.setValue("WTIdleTime", 10);
  EXPECT_TRUE(defaults.hasStoredValue("WTIdleTime"));
  defaults.registerDefaults({{"WTIdleTime", 7}});  // registering later does not override the user's value
  EXPECT_EQ(defaults.integerForKey("WTIdleTime"), 10);
  defaults.removeValue("WTIdleTime");
  EXPECT_TRUE(defaults.integerForKey("WTIdleTime") == 7 && !defaults.hasStoredValue("WTIdleTime"));
  EXPECT_EQ(UserDefaults(path()).integerForKey("WTIdleTime"), 0);  // the removal reached the file
  defaults.setValue("wtInvoiceUnit", "d");
  defaults.setValue("wtInvoiceUnit", QVariant());  // null removes as well
  EXPECT_EQ(defaults.stringForKey("wtInvoiceUnit"), "h");
  QStringList announced;
  for (const auto& arguments : spy) announced << arguments[0].toString();
  EXPECT_EQ(announced, QStringList({"WTIdleTime", "WTIdleTime", "wtInvoiceUnit", "wtInvoiceUnit"}));
}

// Decimals keep places, dates fractions; plain numbers and booleans read back as the file's text.
TEST_F(UserDefaultsTest, ValuesRoundTripThroughTheFileExactly) {
  // clang-format off
  const std::pair<const char*, QVariant> written[] = {
      {"WTDefaultRate", QVariant::fromValue(dec("12.30"))},
      {"Tiny", QVariant::fromValue(dec("-0.000000000000000000000000000000000001"))},
      {"WTCustomRangeBegin", QVariant::fromValue(Date::fromSeconds(1709632800.123456))},
      {"Old", QVariant::fromValue(Date::fromSeconds(-86399.75))}, {"Whole", QVariant::fromValue(Date::fromSeconds(1700000000))},
      {"DateTime", QDateTime::fromMSecsSinceEpoch(1700000000250, Qt::UTC)}, {"At", "@home"},
      {"LooksLikeMarker", "@Decimal(1)"}, {"WTStopsOtherTimes", true}, {"WTLastSelectedProject", qlonglong(1) << 40},
      {"Ratio", 1234567.5}};
  const QStringList expected = {"Decimal 12.30", "Decimal -0.000000000000000000000000000000000001",
      "Date 1709632800.123456", "Date -86399.750000", "Date 1700000000.000000", "Date 1700000000.250000",
      "QString @home", "QString @Decimal(1)", "QString true", "QString 1099511627776", "QString 1234567.5"};
  // clang-format on
  UserDefaults writer(path());
  for (const auto& [key, value] : written) writer.setValue(key, value);
  // `writer` stays alive: everything must already be in the file.
  const UserDefaults reader(path());
  for (const UserDefaults* defaults : {static_cast<const UserDefaults*>(&writer), &reader}) {
    SCOPED_TRACE(defaults == &writer ? "writer" : "reader");
    QStringList read;
    for (const auto& [key, value] : written)
      read << (key == QLatin1String("DateTime") ? described(defaults->dateForKey(key))
                                                : described(defaults->value(key)));
    EXPECT_EQ(read, expected);
    EXPECT_EQ(defaults->integerForKey("WTLastSelectedProject"), qint64(1) << 40);
  }
}

// Text written by hand and registered values, read as boolean, integer, decimal, date and string.
TEST_F(UserDefaultsTest, TypedReads) {
  writeFile(path(),
            "[General]\nyes=YES\nno=no\ntrue=true\nfalse=False\none=1\nzero=0\nfraction=2.9\nnegative=-3\n"
            "word=abc\nrate=80\nrate2=80.5\nspaced=\" 12.30 \"\n"
            "date=2024-03-05T10:00:00Z\nzoned=2024-03-05T11:00:00+01:00\n");
  UserDefaults defaults(path());
  defaults.registerDefaults({{"registeredRate", 80.5},
                             {"decimal", QVariant::fromValue(dec("90.00"))},
                             {"flag", true},
                             {"count", 5u},
                             {"registeredDate", QVariant::fromValue(Date::fromSeconds(42.5))}});
  // clang-format off
  const std::pair<const char*, const char*> rows[] = {
      {"yes", "1 1 - - YES"}, {"no", "0 0 - - no"}, {"true", "1 1 - - true"}, {"false", "0 0 - - False"},
      {"one", "1 1 Decimal 1 - 1"}, {"zero", "0 0 Decimal 0 - 0"}, {"fraction", "1 2 Decimal 2.9 - 2.9"},
      {"negative", "1 -3 Decimal -3 - -3"}, {"word", "0 0 - - abc"}, {"rate", "1 80 Decimal 80 - 80"},
      {"rate2", "1 80 Decimal 80.5 - 80.5"}, {"spaced", "1 12 Decimal 12.30 -  12.30 "}, {"missing", "0 0 - - "},
      {"date", "0 0 - Date 1709632800.000000 2024-03-05T10:00:00Z"},
      {"zoned", "0 0 - Date 1709632800.000000 2024-03-05T11:00:00+01:00"},
      {"registeredRate", "1 80 Decimal 80.5 - 80.5"}, {"decimal", "1 90 Decimal 90.00 - 90.00"},
      {"flag", "1 1 - - true"}, {"count", "1 5 Decimal 5 - 5"}, {"registeredDate", "0 0 - Date 42.500000 "}};
  // clang-format on
  for (const auto& [key, expected] : rows)
    EXPECT_EQ(
        QStringList({QString::number(defaults.boolForKey(key)), QString::number(defaults.integerForKey(key)),
                     described(defaults.decimalForKey(key)), described(defaults.dateForKey(key)),
                     defaults.stringForKey(key)})
            .join(' '),
        expected)
        << key;
}

}  // namespace
