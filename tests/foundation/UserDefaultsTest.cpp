#include "UserDefaults.h"

#include <gtest/gtest.h>

#include <QFile>
#include <QSignalSpy>
#include <QStandardPaths>
#include <QTemporaryDir>

namespace {

Decimal dec(const char* text) {
  return *Decimal::fromString(QString::fromLatin1(text));
}

class UserDefaultsTest : public ::testing::Test {
 protected:
  QString path() const { return dir_.filePath("Tessal.conf"); }

  void writeFile(const QByteArray& contents) {
    QFile file(path());
    ASSERT_TRUE(file.open(QIODevice::WriteOnly));
    file.write(contents);
  }

  QTemporaryDir dir_;
};

TEST_F(UserDefaultsTest, StoredValuesOverrideRegisteredDefaultsUntilRemovedAndAreAnnounced) {
  const UserDefaults standard;
  EXPECT_EQ(standard.fileName(),
            QStandardPaths::writableLocation(QStandardPaths::GenericConfigLocation) + "/Tessal/Tessal.conf");
  EXPECT_TRUE(standard.fileName().startsWith(qEnvironmentVariable("XDG_CONFIG_HOME")));
  UserDefaults defaults(path());
  EXPECT_EQ(defaults.fileName(), path());
  QSignalSpy spy(&defaults, &UserDefaults::valueChanged);
  defaults.registerDefaults({{"WTIdleTime", 5}, {"wtInvoiceUnit", "h"}});
  EXPECT_EQ(defaults.integerForKey("WTIdleTime"), 5);
  EXPECT_FALSE(defaults.hasStoredValue("WTIdleTime"));
  EXPECT_FALSE(defaults.value("WTShouldIdle").isValid());
  defaults.setValue("WTIdleTime", 10);
  EXPECT_TRUE(defaults.hasStoredValue("WTIdleTime"));
  defaults.registerDefaults({{"WTIdleTime", 7}});  // registering later does not override the user's value
  EXPECT_EQ(defaults.integerForKey("WTIdleTime"), 10);
  defaults.removeValue("WTIdleTime");
  EXPECT_FALSE(defaults.hasStoredValue("WTIdleTime"));
  EXPECT_EQ(defaults.integerForKey("WTIdleTime"), 7);
  EXPECT_EQ(UserDefaults(path()).integerForKey("WTIdleTime"), 0);  // the removal reached the file
  defaults.setValue("wtInvoiceUnit", "d");
  defaults.setValue("wtInvoiceUnit", QVariant());  // null removes as well
  EXPECT_EQ(defaults.stringForKey("wtInvoiceUnit"), "h");
  QStringList announced;
  for (const auto& arguments : spy) announced << arguments[0].toString();
  EXPECT_EQ(announced, QStringList({"WTIdleTime", "WTIdleTime", "wtInvoiceUnit", "wtInvoiceUnit"}));
}

TEST_F(UserDefaultsTest, ValuesRoundTripThroughTheFileExactly) {
  const Date withFraction = Date::fromSeconds(1709632800.123456);
  const Date beforeEpoch = Date::fromSeconds(-86399.75);
  const Date whole = Date::fromSeconds(1700000000);
  UserDefaults writer(path());
  writer.setValue("WTDefaultRate", QVariant::fromValue(dec("12.30")));
  writer.setValue("Tiny", QVariant::fromValue(dec("-0.000000000000000000000000000000000001")));
  writer.setValue("WTCustomRangeBegin", QVariant::fromValue(withFraction));
  writer.setValue("Old", QVariant::fromValue(beforeEpoch));
  writer.setValue("Whole", QVariant::fromValue(whole));
  writer.setValue("DateTime", QDateTime::fromMSecsSinceEpoch(1700000000250, Qt::UTC));
  writer.setValue("WTSyncUser", "anna@example.org");
  writer.setValue("At", "@home");
  writer.setValue("LooksLikeMarker", "@Decimal(1)");
  writer.setValue("WTStopsOtherTimes", true);
  writer.setValue("WTLastSelectedProject", qlonglong(1) << 40);

  // `writer` stays alive: everything must already be in the file.
  const UserDefaults reader(path());
  for (const UserDefaults* defaults : {static_cast<const UserDefaults*>(&writer), &reader}) {
    SCOPED_TRACE(defaults == &writer ? "writer" : "reader");
    const QVariant rate = defaults->value("WTDefaultRate");
    ASSERT_EQ(rate.metaType(), QMetaType::fromType<Decimal>());
    EXPECT_TRUE(rate.value<Decimal>().isIdenticalTo(dec("12.30")));
    EXPECT_TRUE(defaults->decimalForKey("WTDefaultRate")->isIdenticalTo(dec("12.30")));
    EXPECT_EQ(defaults->decimalForKey("Tiny"), dec("-1e-36"));

    const QVariant begin = defaults->value("WTCustomRangeBegin");
    ASSERT_EQ(begin.metaType(), QMetaType::fromType<Date>());
    EXPECT_EQ(begin.value<Date>(), withFraction);
    EXPECT_EQ(defaults->dateForKey("WTCustomRangeBegin"), withFraction);
    EXPECT_EQ(defaults->dateForKey("Old"), beforeEpoch);
    EXPECT_EQ(defaults->dateForKey("Whole"), whole);
    EXPECT_EQ(defaults->dateForKey("DateTime"), Date::fromSeconds(1700000000.25));

    EXPECT_EQ(defaults->value("WTSyncUser"), QVariant(QString("anna@example.org")));
    EXPECT_EQ(defaults->value("At"), QVariant(QString("@home")));
    EXPECT_EQ(defaults->value("LooksLikeMarker"), QVariant(QString("@Decimal(1)")));
    EXPECT_TRUE(defaults->boolForKey("WTStopsOtherTimes"));
    EXPECT_EQ(defaults->integerForKey("WTLastSelectedProject"), qlonglong(1) << 40);
    // Plain numbers and booleans read back as the file's text, the same before and after reloading.
    EXPECT_EQ(defaults->value("WTLastSelectedProject"), QVariant(QString("1099511627776")));
    EXPECT_EQ(defaults->value("WTStopsOtherTimes"), QVariant(QString("true")));
  }
}

TEST_F(UserDefaultsTest, TypedReadsOfTextWrittenByHand) {
  writeFile(
      "[General]\n"
      "yes=YES\nno=no\ntrue=true\nfalse=False\none=1\nzero=0\nfraction=2.9\nnegative=-3\n"
      "word=abc\nrate=80\nrate2=80.5\nspaced=\" 12.30 \"\n"
      "date=2024-03-05T10:00:00Z\nzoned=2024-03-05T11:00:00+01:00\n");
  const UserDefaults defaults(path());
  struct Row {
    const char* key;
    bool boolean;
    qint64 integer;
    std::optional<Decimal> decimal;
  };
  const std::vector<Row> rows = {
      {"yes", true, 1, std::nullopt},      {"no", false, 0, std::nullopt},
      {"true", true, 1, std::nullopt},     {"false", false, 0, std::nullopt},
      {"one", true, 1, dec("1")},          {"zero", false, 0, dec("0")},
      {"fraction", true, 2, dec("2.9")},   {"negative", true, -3, dec("-3")},
      {"word", false, 0, std::nullopt},    {"rate", true, 80, dec("80")},
      {"rate2", true, 80, dec("80.5")},    {"spaced", true, 12, dec("12.30")},
      {"missing", false, 0, std::nullopt},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.key);
    EXPECT_EQ(defaults.boolForKey(row.key), row.boolean);
    EXPECT_EQ(defaults.integerForKey(row.key), row.integer);
    const std::optional<Decimal> decimal = defaults.decimalForKey(row.key);
    ASSERT_EQ(decimal.has_value(), row.decimal.has_value());
    if (decimal) {
      EXPECT_TRUE(decimal->isIdenticalTo(*row.decimal)) << decimal->toString().toStdString();
    }
  }
  EXPECT_EQ(defaults.dateForKey("date"), Date::fromSeconds(1709632800));
  EXPECT_EQ(defaults.dateForKey("zoned"), Date::fromSeconds(1709632800));
  EXPECT_EQ(defaults.dateForKey("word"), std::nullopt);
  EXPECT_EQ(defaults.stringForKey("rate2"), "80.5");
}

TEST_F(UserDefaultsTest, TypedReadsOfRegisteredValues) {
  UserDefaults defaults(path());
  defaults.registerDefaults({{"rate", 80.5},
                             {"decimal", QVariant::fromValue(dec("90.00"))},
                             {"flag", true},
                             {"count", 5u},
                             {"date", QVariant::fromValue(Date::fromSeconds(42.5))}});
  EXPECT_TRUE(defaults.decimalForKey("rate")->isIdenticalTo(dec("80.5")));
  EXPECT_TRUE(defaults.decimalForKey("decimal")->isIdenticalTo(dec("90.00")));
  EXPECT_EQ(defaults.stringForKey("decimal"), "90.00");
  EXPECT_EQ(defaults.integerForKey("decimal"), 90);
  EXPECT_EQ(defaults.decimalForKey("flag"), std::nullopt);
  EXPECT_TRUE(defaults.boolForKey("flag"));
  EXPECT_TRUE(defaults.boolForKey("count"));
  EXPECT_EQ(defaults.integerForKey("count"), 5);
  EXPECT_EQ(defaults.dateForKey("date"), Date::fromSeconds(42.5));
  EXPECT_EQ(defaults.stringForKey("date"), "");
}

}  // namespace
