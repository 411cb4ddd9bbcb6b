#include "WTCSVExport.h"

#include "Decimal.h"
#include "DurationText.h"
#include "KeyPath.h"
#include "MoneyFormat.h"
#include "RZDate.h"
#include "TessalLogging.h"
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

}  // namespace

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

}  // namespace WTCSVExport
