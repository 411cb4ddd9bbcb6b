#include "Date.h"
#include "GXTemplateStandardFilters.h"
#include "RZDate.h"
#include "TemplateTestSupport.h"

#include <QColor>
#include <QDateTime>

namespace {

class FilterTest : public TemplateTest {
 protected:
  QString filtered(const QVariant& value, const QString& filter) {
    return render(QStringLiteral("{{ v | %1 }}").arg(filter), {{"v", value}});
  }
};

TEST(FilterFunctions, CapitalizedStartsEveryWord) {
  struct Case {
    const char* text;
    const char* capitalized;
  };
  const Case cases[] = {{"hello world", "Hello World"},           {"HELLO wORLD", "Hello World"},
                        {"o'neil-smith", "O'neil-Smith"},         {"123abc 4U", "123Abc 4U"},
                        {"élan\tvital\nend", "Élan\tVital\nEnd"}, {"", ""}};
  for (const Case& c : cases) {
    EXPECT_EQ(GXTemplateStandardFilters::capitalized(QString::fromUtf8(c.text)),
              QString::fromUtf8(c.capitalized))
        << c.text;
  }
}

TEST_F(FilterTest, DateTextsOfOneDayComeFromTheRightDay) {
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("America/New_York")));
  // Hourly items across a local midnight, and one pattern with times: every text must match its own date.
  QVariantList items;
  const double start =
      Date::fromQDateTime(QDateTime(QDate(2024, 11, 2), QTime(20, 0), Qt::UTC)).secondsSince1970();
  for (int i = 0; i < 60; ++i) items.append(QVariant::fromValue(Date::fromSeconds(start + 1800.0 * i)));
  const QString output = render(QStringLiteral("{% for d in items %}{{ d | date_format: \"yyyy-MM-dd\" }} "
                                               "{{ d | date_format: \"d HH:mm\" }};{% /for %}"),
                                {{"items", items}});
  QString expected;
  for (const QVariant& item : items) {
    const Date date = item.value<Date>();
    expected += RZDate::stringWithPattern(date, QStringLiteral("yyyy-MM-dd")) + QLatin1Char(' ') +
                RZDate::stringWithPattern(date, QStringLiteral("d HH:mm")) + QLatin1Char(';');
  }
  EXPECT_EQ(output, expected);
  // After a change of zone the same instant may fall on another day.
  const QVariantMap late{
      {"d", QVariant::fromValue(Date::fromSeconds(start + 4 * 3600.0))}};  // 00:00 UTC, 3 Nov
  EXPECT_EQ(render(QStringLiteral("{{ d | date_format: \"d\" }}"), late), QStringLiteral("2"));
  ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin")));
  EXPECT_EQ(render(QStringLiteral("{{ d | date_format: \"d\" }}"), late), QStringLiteral("3"));
  RZDate::setDefaultTimeZone(QStringLiteral("UTC"));
}

TEST(FilterFunctions, OnlyPatternsOfDayFieldsShareADaysText) {
  for (const char* pattern : {"yyyy-MM-dd", "EEEE d. MMMM y 'um' QQQ", "w/W D F g e c", "'HH:mm' yy"}) {
    EXPECT_TRUE(GXTemplateStandardFilters::patternHasOnlyDayFields(QString::fromUtf8(pattern))) << pattern;
  }
  for (const char* pattern : {"HH:mm", "yyyy a", "d z", "dd 'x''' ss", "yyyy-MM-dd'T'HH"}) {
    EXPECT_FALSE(GXTemplateStandardFilters::patternHasOnlyDayFields(QString::fromUtf8(pattern))) << pattern;
  }
}

TEST_F(FilterTest, ColorFormatWritesHexForHex) {
  const QVariant red = QColor(255, 0, 0);
  EXPECT_EQ(filtered(red, QStringLiteral("color_format: hex")), QStringLiteral("ff0000"));
  EXPECT_EQ(filtered(red, QStringLiteral("color_format: HEX")), QStringLiteral("ff0000"));
  EXPECT_EQ(filtered(QColor(18, 52, 86, 128), QStringLiteral("color_format: hex")), QStringLiteral("123456"));
  EXPECT_EQ(filtered(QColor::fromHsv(240, 255, 255), QStringLiteral("color_format: hex")),
            QStringLiteral("0000ff"));
  EXPECT_EQ(filtered(QColor(), QStringLiteral("color_format: hex")), QStringLiteral("000000"));
  // Anything else leaves the value as it is.
  GXTemplateStandardFilters filters;
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("color_format"), {QStringLiteral("rgb")}, red), red);
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("color_format"), {}, red), red);
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("color_format"), {QStringLiteral("hex")},
                                  QStringLiteral("ff0000")),
            QVariant(QStringLiteral("ff0000")));
  EXPECT_EQ(filters.filterInvoked(QStringLiteral("nosuch"), {}, red), red);
}

}  // namespace
