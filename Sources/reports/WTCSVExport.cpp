#include "WTCSVExport.h"

#include "Decimal.h"
#include "DurationText.h"
#include "KeyPath.h"
#include "MoneyFormat.h"
#include "RZDate.h"
#include "TessalLogging.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTItem.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTReportGenerator.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QSaveFile>

#include <algorithm>

namespace WTCSVExport {

namespace {

QString text(const QVariant& value) {
  if (value.isNull() || !value.isValid()) return QString();
  if (value.metaType() == QMetaType::fromType<Decimal>()) {
    return value.value<Decimal>().toString();
  }
  return value.toString();
}

// Appends to `out` in place: a year's report is tens of thousands of lines.
void appendQuotedLine(QString& out, const QStringList& fields) {
  for (qsizetype i = 0; i < fields.size(); ++i) {
    if (i) out += QLatin1Char(',');
    out += QLatin1Char('"');
    out += escapedString(fields[i]);
    out += QLatin1Char('"');
  }
  out += QLatin1Char('\n');
}

QString money(const QVariant& value) {
  return MoneyFormat::format(Decimal::fromVariant(value).value_or(Decimal()));
}

QString minutes(const QVariant& value) {
  return DurationText::stringWithMinutes(std::int32_t(value.toLongLong()));
}

QString shortDate(const WTItem* item, const QString& key) {
  bool ok = false;
  const std::optional<Date> date = dateFromVariant(item->valueForKey(key), &ok);
  return date ? RZDate::shortFormat(*date) : QString();
}

QString twoDigits(int value) {
  return QStringLiteral("%1").arg(value, 2, 10, QLatin1Char('0'));
}

// The spreadsheet's dates and times are read by programs: ASCII digits in the local zone, whatever
// digits and calendar the user's locale writes.
QString isoDay(const std::optional<Date>& date) {
  if (!date) return QString();
  RZDate::DateComponents fields;
  RZDate::assignFlags(*date, RZDate::DayUnits, fields);
  return QStringLiteral("%1-%2-%3")
      .arg(fields.year, 4, 10, QLatin1Char('0'))
      .arg(twoDigits(fields.month), twoDigits(fields.day));
}

QString clockTime(const std::optional<Date>& date) {
  if (!date) return QString();
  RZDate::DateComponents fields;
  RZDate::assignFlags(*date, RZDate::Hour | RZDate::Minute, fields);
  return twoDigits(fields.hour) + QLatin1Char(':') + twoDigits(fields.minute);
}

// Hours are not padded and never roll into days, so a spreadsheet sums them as durations.
QString hoursAndMinutes(int minutes) {
  const qint64 magnitude = qAbs(qint64(minutes));
  return (minutes < 0 ? QStringLiteral("-") : QString()) + QString::number(magnitude / 60) +
         QLatin1Char(':') + twoDigits(int(magnitude % 60));
}

// '.' and no grouping, so that the number reads the same in every program: at least `places` decimals,
// more where the value has them (a rate may be finer than the currency's minor unit).
QString plainNumber(const Decimal& value, int places) {
  QString text = value.toString();
  if (!text.contains(QLatin1Char('.'))) text += QLatin1Char('.');
  const qsizetype point = text.indexOf(QLatin1Char('.'));
  while (text.size() - point - 1 > places && text.endsWith(QLatin1Char('0'))) text.chop(1);
  const qsizetype missing = places - (text.size() - point - 1);
  if (missing > 0) text += QString(missing, QLatin1Char('0'));
  if (text.endsWith(QLatin1Char('.'))) text.chop(1);
  return text;
}

QString spreadsheetField(const QString& text) {
  const bool plain = std::none_of(text.begin(), text.end(), [](QChar c) {
    return c == QLatin1Char('"') || c == QLatin1Char(',') || c == QLatin1Char('\r') || c == QLatin1Char('\n');
  });
  if (plain) return text;
  QString quoted = text;
  quoted.replace(QLatin1Char('"'), QLatin1String("\"\""));
  return QLatin1Char('"') + quoted + QLatin1Char('"');
}

// A spreadsheet opening the file takes a cell beginning with = + - @ (or a tab or CR before them) for a
// formula, which a name someone else typed must never become: such text is written behind an
// apostrophe, the spreadsheets' own mark for "text". Tessal's import takes it off again.
QString inertText(const QString& text) {
  return text.isEmpty() || !QStringView(u"=+-@\t\r").contains(text.front()) ? text : u'\'' + text;
}

void appendSpreadsheetRow(QString& out, const QStringList& fields) {
  for (qsizetype i = 0; i < fields.size(); ++i) {
    if (i) out += QLatin1Char(',');
    out += spreadsheetField(fields[i]);
  }
  out += QLatin1String("\r\n");
}

QString kindOf(const WTItem* item) {
  switch (item->entity()) {
    case WTEntity::Time:
      return QStringLiteral("time");
    case WTEntity::Flat:
      return QStringLiteral("flat fee");
    default:
      return QStringLiteral("expense");
  }
}

}  // namespace

const QStringList& spreadsheetColumns() {
  static const QStringList columns = {QStringLiteral("client"),   QStringLiteral("project"),
                                      QStringLiteral("task"),     QStringLiteral("kind"),
                                      QStringLiteral("name"),     QStringLiteral("date"),
                                      QStringLiteral("start"),    QStringLiteral("end"),
                                      QStringLiteral("duration"), QStringLiteral("billed duration"),
                                      QStringLiteral("rate"),     QStringLiteral("amount"),
                                      QStringLiteral("currency"), QStringLiteral("notes"),
                                      QStringLiteral("rounding")};
  return columns;
}

QList<WTItem*> billableItemsMatching(const WTObjectContext& context, const WTItemPredicate& predicate,
                                     const WTProject* project) {
  const auto accepts = [&](const WTItem* item) {
    if (project && (!item->task() || item->task()->project() != project)) return false;
    return !predicate || predicate(item);
  };
  QList<WTItem*> items;
  for (WTTime* time : context.fetch<WTTime>(accepts)) items.append(time);
  for (WTFlat* flat : context.fetch<WTFlat>(accepts)) items.append(flat);
  for (WTExpense* expense : context.fetch<WTExpense>(accepts)) items.append(expense);
  return items;
}

QString spreadsheetCSV(QList<WTItem*> items) {
  struct Row {
    QString names[3];  // client, project, task
    std::optional<Date> date;
    WTItem* item;
  };
  std::vector<Row> rows;
  rows.reserve(size_t(items.size()));
  for (WTItem* item : items) {
    const WTTask* task = item->task();
    const WTProject* project = task ? task->project() : nullptr;
    const WTClient* client = project ? project->client() : nullptr;
    rows.push_back({{client ? client->name() : QString(), project ? project->name() : QString(),
                     task ? task->name() : QString()},
                    item->startDate(),
                    item});
  }
  std::stable_sort(rows.begin(), rows.end(), [](const Row& a, const Row& b) {
    for (int i = 0; i < 3; ++i) {
      const int order = KeyPath::compareValues(a.names[i], b.names[i]);
      if (order != 0) return order < 0;
    }
    return a.date < b.date;
  });
  QString out;
  appendSpreadsheetRow(out, spreadsheetColumns());
  for (const Row& row : rows) {
    const WTItem* item = row.item;
    const auto* time = item->entity() == WTEntity::Time ? static_cast<const WTTime*>(item) : nullptr;
    // An expense is an amount as typed: no time, no rate.
    const bool expense = item->entity() == WTEntity::Expense;
    const std::optional<Decimal> rate = item->rate();
    const QString currency = item->billingCurrency();
    const int places = MoneyFormat::minorUnitDigits(currency);
    appendSpreadsheetRow(
        out, {inertText(row.names[0]), inertText(row.names[1]), inertText(row.names[2]), kindOf(item),
              inertText(item->name()), isoDay(row.date), time ? clockTime(time->startDate()) : QString(),
              time ? clockTime(time->endDate()) : QString(),
              expense ? QString() : hoursAndMinutes(item->duration()),
              expense ? QString() : hoursAndMinutes(item->billedDuration()),
              expense || !rate ? QString() : plainNumber(*rate, places),
              plainNumber(item->billedCost(), places), currency, inertText(item->notes()),
              time && time->task() ? time->task()->roundingRule().toText() : QString()});
  }
  return out;
}

QString escapedString(const QVariant& value) {
  if (value.isNull() || !value.isValid()) return QStringLiteral("");
  QString result = text(value);
  result.replace(QLatin1String("\""), QLatin1String("\\\""));
  return result;
}

QString reportCSV(const QList<WTProject*>& projects, int mode, const std::optional<RZDate::Range>& period) {
  static const QString patterns[] = {QString(), QStringLiteral("yyyy-MM-dd HH:mm"),
                                     QStringLiteral("yyyy-MM-dd"), QStringLiteral("yyyy-MM")};
  static const QString lists[] = {QString(), QStringLiteral("valuableItems"), QStringLiteral("dailyItems"),
                                  QStringLiteral("monthlyItems")};
  const QString pattern = mode >= 0 && mode <= 3 ? patterns[mode] : QString();
  QString out;
  WTReportGenerator generator(projects, mode);
  generator.setPeriod(period);
  // What the template receives: the records, or their views over the period.
  for (const QVariant& project : generator.variables().value(QStringLiteral("projects")).toList()) {
    for (const QVariant& task : KeyPath::valueForKeyPath(project, u"tasks").toList()) {
      if (mode == 0) {
        appendQuotedLine(out, {text(KeyPath::valueForKeyPath(project, u"name")),
                               text(KeyPath::valueForKeyPath(task, u"name")),
                               minutes(KeyPath::valueForKeyPath(task, u"duration")),
                               money(KeyPath::valueForKeyPath(task, u"cost"))});
      }
      const QVariant items =
          mode >= 1 && mode <= 3 ? KeyPath::valueForKeyPath(task, lists[mode]) : QVariant();
      for (const QVariant& entry : items.toList()) {
        const QVariant date = KeyPath::valueForKeyPath(entry, u"date");
        bool ok = false;
        const std::optional<Date> day = dateFromVariant(date, &ok);
        appendQuotedLine(out,
                         {text(KeyPath::valueForKeyPath(entry, u"task.project.name")),
                          text(KeyPath::valueForKeyPath(entry, u"task.name")),
                          day && !pattern.isEmpty() ? RZDate::stringWithPattern(*day, pattern) : QString(),
                          minutes(KeyPath::valueForKeyPath(entry, u"duration")),
                          money(KeyPath::valueForKeyPath(entry, u"cost"))});
      }
    }
  }
  return out;
}

QString timesCSV(QList<WTTime*> times) {
  static const QString keys[] = {QStringLiteral("task.project.name"), QStringLiteral("task.title"),
                                 QStringLiteral("flatDateBegin"), QStringLiteral("startTime")};
  struct Keyed {
    QVariant values[4];
    WTTime* time;
  };
  std::vector<Keyed> keyed;
  keyed.reserve(size_t(times.size()));
  for (WTTime* time : times) {
    Keyed entry{{}, time};
    const QVariant root = KeyPath::variantFromObject(time);
    for (int i = 0; i < 4; ++i) entry.values[i] = KeyPath::valueForKeyPath(root, keys[i]);
    keyed.push_back(std::move(entry));
  }
  std::stable_sort(keyed.begin(), keyed.end(), [](const Keyed& a, const Keyed& b) {
    for (int i = 0; i < 4; ++i) {
      const int order = KeyPath::compareValues(a.values[i], b.values[i]);
      if (order != 0) return order < 0;
    }
    return false;
  });
  QString out;
  for (const Keyed& entry : keyed) {
    const WTTime* time = entry.time;
    const WTTask* task = time->task();
    const WTProject* project = task ? task->project() : nullptr;
    appendQuotedLine(out, {project ? project->name() : QString(), task ? task->name() : QString(),
                           task ? text(task->valueForKey(QStringLiteral("rate"))) : QString(), time->name(),
                           shortDate(time, QStringLiteral("startDate")),
                           shortDate(time, QStringLiteral("endDate")), QString::number(time->duration())});
  }
  return out;
}

Result<void> writeTextAtomically(const QString& path, const QString& text) {
  QSaveFile file(path);
  if (!file.open(QIODevice::WriteOnly)) {
    return Error{1, QStringLiteral("%1: %2").arg(path, file.errorString())};
  }
  const QByteArray data = text.toUtf8();
  if (file.write(data) != data.size() || !file.commit()) {
    return Error{1, QStringLiteral("%1: %2").arg(path, file.errorString())};
  }
  return Result<void>::success();
}

Result<int> exportTimes(const WTObjectContext& context, const WTItemPredicate& predicate,
                        const WTProject* project, const QString& path) {
  const QList<WTTime*> times = WTRangePredicate::timesMatching(context, predicate, project);
  qCDebug(lcExport, "%s",
          qPrintable(QStringLiteral("Exporting %1 items to: %2").arg(times.size()).arg(path)));
  const Result<void> written = writeTextAtomically(path, timesCSV(times));
  if (!written) return written.error();
  return int(times.size());
}

Result<int> exportSpreadsheet(const WTObjectContext& context, const WTItemPredicate& predicate,
                              const WTProject* project, const QString& path) {
  const QList<WTItem*> items = billableItemsMatching(context, predicate, project);
  qCDebug(lcExport, "%s",
          qPrintable(QStringLiteral("Exporting %1 items to: %2").arg(items.size()).arg(path)));
  const Result<void> written = writeTextAtomically(path, spreadsheetCSV(items));
  if (!written) return written.error();
  return int(items.size());
}

}  // namespace WTCSVExport
