#include "WTImportFields.h"
#include "WTImportFile.h"

#include <gtest/gtest.h>

#include <QBuffer>
#include <QFile>

namespace {

QString summary(const WTImportRow& row) {
  const auto utc = [](const Date& date) { return date.toQDateTime().toUTC().toString(Qt::ISODate); };
  QString span =
      row.end ? QString::number(qint64(row.end->secondsSince1970() - row.start.secondsSince1970()) / 60)
              : QStringLiteral("running to ") + (row.lastKnown ? utc(*row.lastKnown) : QString());
  return QStringLiteral("%1 %2/%3/%4|%5|%6|%7|%8 %9|%10|%11|%12")
      .arg(row.line)
      .arg(row.client, row.project, row.task, row.name, utc(row.start), span,
           row.rate ? row.rate->toString() : QStringLiteral("-"), row.currency)
      .arg(row.billable ? "billable" : "not billable", row.tags.join(u';'), row.notes);
}

struct Sample {
  const char* file;
  const char* format;  // as given with --format; empty: told by the content
  const char* zone;
  QStringList tags;
  const char* expectedFormat;
  QStringList rows;
  QStringList problems;
};

class ImportSampleTest : public testing::TestWithParam<Sample> {};

TEST_P(ImportSampleTest, ReadsEveryAwkwardCase) {
  const Sample& sample = GetParam();
  SCOPED_TRACE(sample.file);
  QFile file(QStringLiteral(TESSAL_TEST_DATA_DIR "/import/") + QLatin1String(sample.file));
  ASSERT_TRUE(file.open(QIODevice::ReadOnly));
  WTImportFormats::Options options;
  options.format = QLatin1String(sample.format);
  options.zone = QTimeZone(sample.zone);
  if (!sample.tags.isEmpty()) options.tags = sample.tags;
  options.fileTime = Date::fromQDateTime(QDateTime(QDate(2024, 11, 1), QTime(12, 0), QTimeZone::utc()));
  const Result<WTImportFile> read = WTImportFormats::read(file, options);
  ASSERT_TRUE(read.ok()) << read.error().message.toStdString();
  EXPECT_EQ(read.value().format, QLatin1String(sample.expectedFormat));
  QStringList rows, problems;
  for (const WTImportRow& row : read.value().rows) rows.append(summary(row));
  for (const WTImportProblem& problem : read.value().problems)
    problems.append(QStringLiteral("%1: %2").arg(problem.line).arg(problem.reason));
  for (const WTImportProblem& row : read.value().leftOut)
    problems.append(QStringLiteral("%1: left out, a %2").arg(row.line).arg(row.reason));
  EXPECT_EQ(rows, sample.rows);
  EXPECT_EQ(problems, sample.problems);
}

// Zones change in the samples: Berlin's clocks went forward on 2024-03-31 and back on 2024-10-27, New
// York's forward on 2024-03-10.
// clang-format off
INSTANTIATE_TEST_SUITE_P(
    Formats, ImportSampleTest,
    testing::Values(
        Sample{"toggl.csv", "", "Europe/Berlin", {}, "toggl",
               {"2 Acme/Website/Design|Header, \"hero\" image|2024-03-30T22:30:00Z|180|50.00 EUR|billable|web;"
                "design|",
                "3 Acme/Website/|Call\nwith client|2024-03-11T08:00:00Z|45|- EUR|not billable||",
                "5 /Internal/|Running thing|2024-03-12T09:00:00Z|running to 2024-03-12T09:30:00Z|- "
                "EUR|billable||"},
               {"6: the entry ends (2024-03-31 11:00) before it starts (2024-03-31 12:00)"}},
        Sample{"toggl-import.csv", "toggl", "Europe/Berlin", {}, "toggl",
               {"2 Acme/Website/Design|Imported plan|2024-03-30T22:30:00Z|75|- |billable||"},
               {}},
        Sample{"clockify.csv", "", "America/New_York", {}, "clockify",
               {"2 Globex/Mobile App/|Night shift|2024-03-10T06:30:00Z|60|80.50 USD|billable||",
                "3 Globex/Mobile App/Code|Review|2024-03-12T03:45:00Z|30|1080.00 USD|not billable|x;y|",
                "4 Globex/Mobile App/Code|Lunch|2024-03-13T16:00:00Z|60|- USD|billable||"},
               {"5: the date “31/02/2024” cannot be read"}},
        // Dates written both ways, amounts that could be a thousand times more or less, an hour the
        // clocks skip: those rows are not read as something else.
        Sample{"toggl-mixed.csv", "", "Europe/Berlin", {}, "toggl",
               {"2 Tyrell/Armor/|Month first|2026-09-25T08:00:00Z|60|1080.00 USD|billable||",
                "3 Tyrell/Armor/|Day first|2026-09-26T08:00:00Z|60|80.00 USD|billable||",
                "8 Tyrell/Armor/|Euro style|2026-09-23T07:00:00Z|60|1234.50 USD|billable||",
                // The rate that bills 28.33 for twenty minutes, not 28.33 over a third of an hour.
                "9 Tyrell/Armor/|A third of an hour|2026-09-24T07:00:00Z|20|85.00 USD|billable||"},
               {"4: the date “03/09/2026” could be day or month first, as the file writes dates both ways",
                "5: the amount “1,000” could be 1 or 1000", "6: the amount “1e3” cannot be read",
                "7: there is no 02:30 on 2026-03-29 in Europe/Berlin: the clocks go forward then (--tz names "
                "the file's zone)"}},
        Sample{"clockify-day-first.csv", "", "UTC", {}, "clockify",  // one date can only be day first
               {"2 Globex/App/|Ambiguous|2024-04-03T09:00:00Z|60|- USD|billable||",
                "3 Globex/App/|Only day first|2024-04-25T09:00:00Z|30|- USD|billable||"},
               {}},
        Sample{"timewarrior.json", "", "UTC", {}, "timewarrior",
               {"2 /Website/|design, logo, print|2023-10-01T10:30:00Z|90|- |billable||first \"draft\"",
                "3 //||2023-10-29T00:30:00Z|60|- |billable||",
                "4 /Internal/||2023-10-30T08:00:00Z|running to 2024-11-01T12:00:00Z|- |billable||"},
               {"5: the entry ends (2023-10-31 07:00) before it starts (2023-10-31 08:00)"}},
        Sample{"timewarrior.json", "timewarrior", "UTC", {"client", "project"}, "timewarrior",
               {"2 Website/design, logo/|print|2023-10-01T10:30:00Z|90|- |billable||first \"draft\"",
                "3 //||2023-10-29T00:30:00Z|60|- |billable||",
                "4 Internal//||2023-10-30T08:00:00Z|running to 2024-11-01T12:00:00Z|- |billable||"},
               {"5: the entry ends (2023-10-31 07:00) before it starts (2023-10-31 08:00)"}},
        Sample{"kimai.csv", "", "Europe/Berlin", {}, "kimai",
               {"2 Initech/TPS/Reports|cover; sheet|2024-10-26T23:30:00Z|180|60.00 EUR|billable||",
                "3 Initech/TPS/|Standup|2024-10-28T08:00:00Z|60|60.00 EUR|not billable|meeting|",
                "6 Initech/TPS/|Night shift|2024-10-28T21:00:00Z|210|60.00 EUR|billable||"},
               {"4: the entry ends (2024-10-28 10:00) before it starts (2024-10-28 11:00)",
                "5: the start time “nine” cannot be read"}},
        Sample{"tessal.csv", "", "Europe/Berlin", {}, "tessal",
               {"2 Acme/Website/Design|Late, late|2024-03-30T22:30:00Z|90|50.00 EUR|billable||two\nlines",
                "5 /Solo/|Own time|2024-04-02T07:00:00Z|30|- |billable||",
                "6 /Solo/|End typed over|2024-04-02T08:00:00Z|360|- |billable||",
                // Its own plain numbers: three places are a currency's, never a thousand.
                "7 Gulf Co/Portal/Dev|Dev work|2024-04-04T06:00:00Z|20|33.330 KWD|billable||"},
               {"4: left out, a flat fee"}}));
// clang-format on

// Numbers as spreadsheets and locales write them, and what is no such number or could be two.
TEST(WTImportFields, NumbersAreReadOnlyAsWrittenAndNeverAThousandTimesOff) {
  const std::pair<const char*, const char*> cases[] = {
      // clang-format off
      {"50.00", "50.00"}, {"50,5", "50.5"}, {"1,234.50", "1234.50"}, {"1.234,50", "1234.50"},
      {"1 234,50", "1234.50"}, {"1.234.567,89", "1234567.89"}, {"1,000,000", "1000000"},
      {"€ 12", "12"}, {"12 EUR", "12"}, {"-1,5", "-1.5"}, {"0,500", "0.500"}, {"1,2345", "1.2345"},
      {"1,500", "ambiguous"}, {"1.500", "ambiguous"}, {"$1,000", "ambiguous"},
      {"1e3", "none"}, {"1,23,456", "none"}, {"1.234.56", "none"}, {"1,234.567,8", "none"}, {"12-", "none"},
      {"EUR", "none"}, {"1..2", "none"}, {"12 34", "none"}, {"1\u00a0234\u00a0567,5", "1234567.5"},
      // clang-format on
  };
  for (const auto& [text, read] : cases) {
    bool ambiguous = false;
    const std::optional<Decimal> number = WTImportFields::parseNumber(QString::fromUtf8(text), &ambiguous);
    EXPECT_EQ(number ? number->toString() : QString(ambiguous ? "ambiguous" : "none"), read) << text;
  }
}

struct Refusal {
  const char* name;
  QByteArray content;
  const char* format;
  const char* error;  // empty: read, with `rows` entries and `problems` rows that cannot be read
  int rows = 0;
  int problems = 0;
};

class ImportRefusalTest : public testing::TestWithParam<Refusal> {};

TEST_P(ImportRefusalTest, RefusesOrReads) {
  const Refusal& refusal = GetParam();
  QByteArray content = refusal.content;
  QBuffer buffer(&content);
  buffer.open(QIODevice::ReadOnly);
  WTImportFormats::Options options;
  options.format = QLatin1String(refusal.format);
  options.zone = QTimeZone::utc();
  const Result<WTImportFile> read = WTImportFormats::read(buffer, options);
  if (*refusal.error) {
    ASSERT_FALSE(read.ok());
    EXPECT_EQ(read.error().message, QString::fromUtf8(refusal.error));
  } else {
    ASSERT_TRUE(read.ok()) << read.error().message.toStdString();
    EXPECT_EQ(read.value().rows.size(), size_t(refusal.rows));
    EXPECT_EQ(read.value().problemCount(), refusal.problems);
    EXPECT_EQ(read.value().problems.size(), std::min<size_t>(refusal.problems, WTImportFile::kProblemsKept));
  }
}

const QByteArray kTogglHeader = "Client,Project,Task,Description,Billable,Start date,Start time,Duration\r\n";
const QByteArray kGoodRow = ",P,,ok,Yes,2024-01-01,10:00,1:00:00\n";
const QByteArray kBadRow = ",P,,bad,Yes,someday,10:00,1:00:00\n";

const char* const kNoFormat =
    "the file is none of the formats Tessal imports (toggl, clockify, timewarrior, kimai, tessal)";

// clang-format off
INSTANTIATE_TEST_SUITE_P(
    Files, ImportRefusalTest,
    testing::Values(
        Refusal{"Empty", "", "", "the file is empty"},
        Refusal{"Blank", "\xEF\xBB\xBF\n \n", "", "the file is empty"},
        Refusal{"AnotherFormat", "name,amount\nrent,100\n", "", kNoFormat},
        Refusal{"AnotherJSON", "{\"start\": \"20231001T103000Z\"}", "", kNoFormat},
        Refusal{"UnknownName", "a\n", "harvest",
                "there is no format named “harvest”; the formats are toggl, clockify, timewarrior, kimai, tessal"},
        Refusal{"MissingColumn", "Client,Project,Description,Start date,Duration\nA,B,C,2024-01-01,1:00:00\n",
                "", "line 1: the header lacks the column “Start time” of a toggl file"},
        Refusal{"InvalidUTF8", kTogglHeader + kGoodRow + ",P,,caf\xE9,Yes,2024-01-01,11:00,1:00:00\n",
                "", "line 3 is not UTF-8 text"},
        Refusal{"UnclosedQuote", kTogglHeader + ",P,,\"open,Yes,2024-01-01,10:00,1:00:00\n", "",
                "line 2: a quoted field is never closed"},
        Refusal{"LongLine", kTogglHeader + QByteArray(2 << 20, 'x'), "", "line 2 is longer than 1048576 bytes"},
        Refusal{"LongJSON", "[{\"annotation\": \"" + QByteArray(2 << 20, 'x') + "\"}]", "",
                "line 1: an entry longer than 1048576 bytes"},
        Refusal{"BrokenJSON", "[{\"start\": \"20231001T103000Z\",\n\"tags\": [}]", "",
                "line 2: the JSON cannot be read"},
        Refusal{"BOMAndCRLF",
                "\xEF\xBB\xBF" + kTogglHeader + ",P,,\"two\r\nlines\",Yes,2024-01-01,10:00,1:00:00\r\n\r\n",
                "", "", 1},
        Refusal{"Semicolons", "Client;Project;Task;Description;Billable;Start date;Start time;Duration\n"
                              ";P;;\"a;b\";Yes;2024-01-01;10:00;1:00:00\n", "", "", 1},
        Refusal{"ManyBadRows", kTogglHeader + kGoodRow + kBadRow.repeated(1500), "", "", 1, 1500}),
    [](const testing::TestParamInfo<Refusal>& info) { return std::string(info.param.name); });
// clang-format on

}  // namespace
