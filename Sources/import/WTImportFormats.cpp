#include "MoneyFormat.h"
#include "WTCSVReader.h"
#include "WTImportFields.h"
#include "WTImportFile.h"
#include "WTImportReaders.h"

#include <QCryptographicHash>
#include <QHash>
#include <QIODevice>

#include <cmath>
#include <limits>

namespace WTImportFormats {

QString detail::when(const Date& date, const QTimeZone& zone) {
  return date.toQDateTime().toTimeZone(zone).toString(u"yyyy-MM-dd HH:mm");
}

namespace {

using detail::when;
using namespace WTImportFields;

// The columns a CSV format names; an empty name is a column the format lacks. A name ending in '('
// matches a header that starts with it and carries the currency in the parentheses.
struct CSVFormat {
  const char* name;
  const char* client;
  const char* project;
  const char* task;
  const char* description;
  const char* billable;
  const char* tags;
  const char* notes;
  const char* startDate;
  const char* startTime;
  const char* endDate;
  const char* endTime;
  const char* duration;
  const char* rate;
  const char* amount;
  const char* currency;
  const char* kind;
  std::vector<const char*> required;
};

const CSVFormat kToggl{"toggl",
                       "Client",
                       "Project",
                       "Task",
                       "Description",
                       "Billable",
                       "Tags",
                       "",
                       "Start date",
                       "Start time",
                       "End date",
                       "End time",
                       "Duration",
                       "",
                       "Amount (",
                       "",
                       "",
                       {"Project", "Description", "Start date", "Start time", "Duration"}};
const CSVFormat kClockify{
    "clockify",
    "Client",
    "Project",
    "Task",
    "Description",
    "Billable",
    "Tags",
    "",
    "Start Date",
    "Start Time",
    "End Date",
    "End Time",
    "Duration (h)",
    "Billable Rate (",
    "",
    "",
    "",
    {"Project", "Client", "Description", "Start Date", "Start Time", "End Date", "End Time"}};
const CSVFormat kKimai{
    "kimai",
    "customer name",
    "project name",
    "activity name",
    "description",
    "billable",
    "tags",
    "",
    "date",
    "begin",
    "",
    "end",
    "duration",
    "hourly_rate",
    "",
    "currency",
    "",
    {"date", "begin", "end", "customer name", "project name", "activity name", "description"}};
const CSVFormat kTessal{
    "tessal",   "client", "project",
    "task",     "name",   "",
    "",         "notes",  "date",
    "start",    "",       "end",
    "duration", "rate",   "amount",
    "currency", "kind",   {"client", "project", "task", "kind", "name", "date", "start", "end"}};

const CSVFormat* const kCSVFormats[] = {&kToggl, &kClockify, &kKimai, &kTessal};

QString folded(const QString& header) {
  return header.trimmed().toCaseFolded();
}

// Where each of a format's columns is in the file's header, and the currency a header carries.
struct Header {
  QHash<QString, qsizetype> index;  // by folded name
  QStringList names;

  explicit Header(const QStringList& fields) : names(fields) {
    for (qsizetype i = 0; i < fields.size(); ++i) index.insert(folded(fields[i]), i);
  }
  // Looked up once per column name: every row asks again.
  qsizetype column(const char* name) const {
    const auto cached = cache_.constFind(name);
    if (cached != cache_.constEnd()) return *cached;
    const qsizetype found = find(name);
    cache_.insert(name, found);
    return found;
  }
  qsizetype find(const char* name) const {
    if (!*name) return -1;
    const QString wanted = folded(QString::fromUtf8(name));
    if (wanted.endsWith(u'(')) {
      for (qsizetype i = 0; i < names.size(); ++i)
        if (folded(names[i]).startsWith(wanted)) return i;
      return -1;
    }
    return index.value(wanted, -1);
  }
  mutable QHash<const char*, qsizetype> cache_;

  QString currencyIn(const char* name) const {
    const qsizetype at = column(name);
    if (at < 0 || !QString::fromUtf8(name).endsWith(u'(')) return QString();
    const QString header = names[at].trimmed();
    const qsizetype open = header.lastIndexOf(u'(');
    return header.mid(open + 1).chopped(header.endsWith(u')') ? 1 : 0).trimmed().toUpper();
  }
};

// Columns that only one format has: a header with one of them is that format's, and a column it lacks
// is named rather than the file taken for another format.
bool marked(const Header& header, const CSVFormat& format) {
  static const QHash<QString, std::vector<const char*>> markers = {
      {QStringLiteral("toggl"), {"Duration", "Amount ("}},
      {QStringLiteral("clockify"), {"Duration (h)", "Duration (decimal)", "Billable Rate ("}},
      {QStringLiteral("kimai"), {"activity name", "customer name", "hourly_rate"}},
      {QStringLiteral("tessal"), {"billed duration", "kind"}}};
  for (const char* name : markers.value(QString::fromUtf8(format.name)))
    if (header.column(name) >= 0) return true;
  return false;
}

qsizetype requiredPresent(const Header& header, const CSVFormat& format) {
  return std::count_if(format.required.begin(), format.required.end(),
                       [&](const char* name) { return header.column(name) >= 0; });
}

// Formats without ids of their own: the entry's own fields, so that the same entry read again is known.
QString hashedId(const QString& format, const WTImportRow& row) {
  QByteArray key;
  for (const QString* field : {&row.client, &row.project, &row.task, &row.name})
    key += field->toUtf8() + '\x1f';
  key += QByteArray::number(qint64(row.start.secondsSince1970()));
  return format + u':' + QString::fromLatin1(QCryptographicHash::hash(key, QCryptographicHash::Sha1).toHex());
}

// A zone's dates and times as instants. Most days keep one offset from UTC all day: that offset is worked
// out once per day; a day with a change goes through the zone's rules for each time.
class ZoneDays {
 public:
  explicit ZoneDays(const QTimeZone& zone) : zone_(zone) {}

  Date at(const QDate& day, const QTime& time) {
    auto offset = offsetOn(day);
    if (!*offset) return Date::fromQDateTime(QDateTime(day, time, zone_));
    // The seconds a QDateTime in UTC would count, without making one for every row.
    static const qint64 kDayOf1970 = QDate(1970, 1, 1).toJulianDay();
    const qint64 utc = (day.toJulianDay() - kDayOf1970) * 86400 + time.msecsSinceStartOfDay() / 1000;
    return Date::fromSeconds(double(utc - **offset) + time.msec() / 1000.0);
  }

  // Whether the clocks show `time` on `day`: not in the hour skipped when they go forward.
  bool shows(const QDate& day, const QTime& time) {
    if (*offsetOn(day)) return true;
    const QDateTime shown(day, time, zone_);
    return shown.isValid() && shown.time() == time;
  }

 private:
  QHash<qint64, std::optional<int>>::const_iterator offsetOn(const QDate& day) {
    auto offset = offsets_.constFind(day.toJulianDay());
    if (offset == offsets_.constEnd()) offset = offsets_.insert(day.toJulianDay(), steadyOffset(day));
    return offset;
  }

  // The offset when no change falls within a day of either side of the date (offsets stay within a
  // day), else none.
  std::optional<int> steadyOffset(const QDate& day) const {
    if (!zone_.isValid()) return std::nullopt;
    const QDateTime from(day.addDays(-1), QTime(0, 0), QTimeZone::utc());
    if (zone_.hasTransitions()) {
      const QTimeZone::OffsetData change = zone_.nextTransition(from);
      if (change.atUtc.isValid() && change.atUtc < from.addDays(3)) return std::nullopt;
    }
    return zone_.offsetFromUtc(from);
  }

  QTimeZone zone_;
  QHash<qint64, std::optional<int>> offsets_;
};

// One CSV record as an entry, or the reason it is none; `leftOut` when that reason is its kind alone.
std::optional<WTImportRow> readRecord(const CSVFormat& format, const Header& header,
                                      const QStringList& fields, const Options& options, ZoneDays& days,
                                      SlashedDates slashed, QString& problem, bool& leftOut) {
  const auto value = [&](const char* name) {
    const qsizetype column = header.column(name);
    return column >= 0 && column < fields.size() ? fields[column].trimmed() : QString();
  };
  WTImportRow row;
  if (format.kind[0] && !value(format.kind).isEmpty() && value(format.kind) != u"time") {
    problem = value(format.kind);
    leftOut = true;
    return std::nullopt;
  }
  // Tessal's own file writes text a spreadsheet would take for a formula behind an apostrophe.
  const auto text = [&](const char* name) {
    QString field = value(name);
    if (&format == &kTessal && field.size() > 1 && field.front() == u'\'' &&
        QStringView(u"=+-@\t\r").contains(field[1]))
      field.remove(0, 1);
    return field;
  };
  row.client = text(format.client);
  row.project = text(format.project);
  row.task = text(format.task);
  row.name = text(format.description);
  row.notes = text(format.notes);
  row.tags = splitTags(value(format.tags));
  const std::optional<bool> billable = parseFlag(value(format.billable));
  if (!billable) {
    problem = QStringLiteral("“%1” is neither yes nor no").arg(value(format.billable));
    return std::nullopt;
  }
  row.billable = *billable;

  const QString startDay = value(format.startDate);
  const std::optional<QDate> day = parseDate(startDay, slashed);
  if (!day) {
    problem = slashed == SlashedDates::OnlyOneWay && parseDate(startDay)
                  ? QStringLiteral(
                        "the date “%1” could be day or month first, as the file writes dates both "
                        "ways")
                        .arg(startDay)
                  : QStringLiteral("the date “%1” cannot be read").arg(startDay);
    return std::nullopt;
  }
  const std::optional<QTime> startTime = parseTime(value(format.startTime));
  if (!startTime) {
    problem = QStringLiteral("the start time “%1” cannot be read").arg(value(format.startTime));
    return std::nullopt;
  }
  // A time the clocks skip was written in another zone than the one it is read in: moved to the next
  // hour, the entry would bill an hour less or more than the file says.
  const auto skipped = [&](const QDate& on, const QTime& time) {
    if (days.shows(on, time)) return false;
    problem =
        QStringLiteral(
            "there is no %1 on %2 in %3: the clocks go forward then (--tz names the file's "
            "zone)")
            .arg(time.toString(u"HH:mm"), on.toString(Qt::ISODate), QString::fromUtf8(options.zone.id()));
    return true;
  };
  if (skipped(*day, *startTime)) return std::nullopt;
  row.start = days.at(*day, *startTime);
  const QString durationText = value(format.duration);
  const std::optional<qint64> duration = parseDuration(durationText);
  const QString endText = value(format.endTime);
  if (!endText.isEmpty()) {
    const std::optional<QTime> endTime = parseTime(endText);
    const QString endDayText = value(format.endDate);
    const std::optional<QDate> endDay = endDayText.isEmpty() ? day : parseDate(endDayText, slashed);
    if (!endTime || !endDay) {
      problem = QStringLiteral("the end “%1 %2” cannot be read").arg(endDayText, endText).trimmed();
      return std::nullopt;
    }
    if (skipped(*endDay, *endTime)) return std::nullopt;
    row.end = days.at(*endDay, *endTime);
    if (&format == &kTessal || (!format.endDate[0] && duration)) {
      // A file that writes one date (Tessal's own, kimai's): the end is on the day that brings it nearest to
      // what the duration says (a night shift ends the next morning, a timer left running over a weekend
      // days later; an end time edited by hand moves less than a day), and never before the start.
      const double wanted = row.start.secondsSince1970() + double(duration.value_or(0));
      const auto away = [&](Date end) {
        return end < row.start ? std::numeric_limits<double>::infinity()
                               : std::abs(end.secondsSince1970() - wanted);
      };
      const QDate endOn = endDay->addDays(qint64((wanted - row.end->secondsSince1970()) / 86400));
      for (const QDate& candidate : {endOn.addDays(-1), endOn, endOn.addDays(1)}) {
        if (const Date end = days.at(candidate, *endTime); away(end) < away(*row.end)) row.end = end;
      }
    }
  } else if (duration && header.column(format.endTime) < 0) {
    row.end = row.start.addingSeconds(double(*duration));
  } else {
    row.lastKnown =
        duration ? std::optional<Date>(row.start.addingSeconds(double(*duration))) : options.fileTime;
  }
  if (row.end && *row.end < row.start) {
    problem = QStringLiteral("the entry ends (%1) before it starts (%2)")
                  .arg(when(*row.end, options.zone), when(row.start, options.zone));
    return std::nullopt;
  }

  // Tessal's own file writes numbers plainly, a point before the places and no grouping ("11.110" in a
  // currency of three places); another tracker's may follow any convention.
  const auto number = [&](const char* name) {
    if (&format == &kTessal)
      if (std::optional<Decimal> plain = Decimal::fromString(value(name))) return plain;
    return parseNumber(value(name));
  };
  row.currency = format.currency[0] ? value(format.currency).toUpper()
                                    : header.currencyIn(format.rate[0] ? format.rate : format.amount);
  if (format.amount[0] && row.billable && !value(format.amount).isEmpty()) {
    row.amount = number(format.amount);
    if (!row.amount) {
      problem = numberProblem("amount", value(format.amount));
      return std::nullopt;
    }
  }
  // Tessal's own file says by which rule each entry was billed (a later column: older files lack it).
  if (const QString rule = &format == &kTessal ? value("rounding") : QString(); !rule.isEmpty()) {
    row.rounding = WTRoundingRule::fromText(rule);
    if (!row.rounding) {
      problem = QStringLiteral("the rounding “%1” cannot be read").arg(rule);
      return std::nullopt;
    }
  }
  if (format.rate[0] && !value(format.rate).isEmpty()) {
    row.rate = number(format.rate);
    if (!row.rate) {
      problem = numberProblem("rate", value(format.rate));
      return std::nullopt;
    }
  } else if (!format.rate[0] && format.amount[0] && !value(format.amount).isEmpty() && row.end &&
             row.billable) {
    // A file without rates: the rate the tracker billed the amount by.
    const qint64 seconds = qint64(std::llround(row.end->secondsSince1970() - row.start.secondsSince1970()));
    if (seconds >= 60)
      row.rate = rateOfAmount(*row.amount, seconds,
                              row.currency.isEmpty() ? 2 : MoneyFormat::minorUnitDigits(row.currency));
  }
  row.importId = hashedId(QString::fromUtf8(format.name), row);
  return row;
}

Result<WTImportFile> readCSV(QIODevice& device, const Options& options) {
  WTCSVReader reader(device);
  QStringList fields;
  const WTCSVReader::Status status = reader.next(fields);
  if (status == WTCSVReader::Status::Failed) return Error{1, reader.error()};
  if (status == WTCSVReader::Status::End) return Error{1, QStringLiteral("the file is empty")};
  const Header header(fields);
  const CSVFormat* format = nullptr;
  for (const CSVFormat* candidate : kCSVFormats) {
    if (!options.format.isEmpty()) {
      if (options.format == QLatin1String(candidate->name)) format = candidate;
    } else if (marked(header, *candidate) &&
               (!format || requiredPresent(header, *candidate) > requiredPresent(header, *format))) {
      format = candidate;
    }
  }
  if (!format) {
    return Error{1, options.format.isEmpty()
                        ? QStringLiteral("the file is none of the formats Tessal imports (%1)")
                              .arg(names().join(QStringLiteral(", ")))
                        : QStringLiteral("there is no format named “%1”; the formats are %2")
                              .arg(options.format, names().join(QStringLiteral(", ")))};
  }
  for (const char* name : format->required) {
    if (header.column(name) < 0)
      return Error{1, QStringLiteral("line 1: the header lacks the column “%1” of a %2 file")
                          .arg(QString::fromUtf8(name), QString::fromUtf8(format->name))};
  }
  WTImportFile file;
  file.format = QString::fromUtf8(format->name);
  // Read whole first: one date that can only be day first (25/04/2024) says how the file writes the
  // others (03/04/2024), unless another can only be month first.
  std::vector<std::pair<qint64, QStringList>> records;
  bool dayFirst = false, monthFirst = false;
  for (;;) {
    const WTCSVReader::Status next = reader.next(fields);
    if (next == WTCSVReader::Status::Failed) return Error{1, reader.error()};
    if (next == WTCSVReader::Status::End) break;
    for (const char* name : {format->startDate, format->endDate}) {
      const QString date = fields.value(header.column(name)).trimmed();
      const bool asDay = bool(parseDate(date, SlashedDates::DayFirst, true));
      const bool asMonth = bool(parseDate(date, SlashedDates::MonthFirst, true));
      dayFirst = dayFirst || (asDay && !asMonth);
      monthFirst = monthFirst || (asMonth && !asDay);
    }
    records.emplace_back(reader.line(), std::move(fields));
  }
  const SlashedDates slashed = dayFirst && monthFirst ? SlashedDates::OnlyOneWay
                               : dayFirst             ? SlashedDates::DayFirst
                                                      : SlashedDates::MonthFirst;
  ZoneDays days(options.zone);
  for (const auto& [line, record] : records) {
    QString problem;
    bool leftOut = false;
    if (std::optional<WTImportRow> row =
            readRecord(*format, header, record, options, days, slashed, problem, leftOut)) {
      row->line = line;
      file.rows.push_back(std::move(*row));
    } else if (leftOut) {
      file.leftOut.push_back({line, problem});
    } else {
      file.addProblem(line, problem);
    }
  }
  return file;
}

// The first character that is not blank (past a byte order mark): '[' begins a JSON array.
int firstCharacter(QIODevice& device) {
  const QByteArray start = device.peek(4096);
  qsizetype i = start.startsWith("\xEF\xBB\xBF") ? 3 : 0;
  while (i < start.size() && QChar::isSpace(uchar(start.at(i)))) ++i;
  return i < start.size() ? uchar(start.at(i)) : -1;
}

}  // namespace

const QStringList& names() {
  static const QStringList all = {QStringLiteral("toggl"), QStringLiteral("clockify"),
                                  QStringLiteral("timewarrior"), QStringLiteral("kimai"),
                                  QStringLiteral("tessal")};
  return all;
}

Result<WTImportFile> read(QIODevice& device, const Options& options) {
  if (!options.format.isEmpty() && !names().contains(options.format))
    return Error{2, QStringLiteral("there is no format named “%1”; the formats are %2")
                        .arg(options.format, names().join(QStringLiteral(", ")))};
  const int first = firstCharacter(device);
  if (first < 0) return Error{1, QStringLiteral("the file is empty")};
  if (options.format == u"timewarrior" || (options.format.isEmpty() && first == '['))
    return detail::readTimewarrior(device, options);
  return readCSV(device, options);
}

}  // namespace WTImportFormats
