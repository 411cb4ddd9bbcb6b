#include "UserDefaults.h"

#include <QDateTime>
#include <QStandardPaths>

#include <cmath>

namespace {

// INI files have no types, so the two types that must survive exactly are written as marked text:
// "@Decimal(12.30)" and "@Date(2024-03-05T10:00:00.25Z)". A text that itself starts with "@" gets one
// more "@" in front, which reading takes off again.
const QString kDecimalMarker = QStringLiteral("@Decimal(");
const QString kDateMarker = QStringLiteral("@Date(");

bool isDecimal(const QVariant& value) {
  return value.metaType() == QMetaType::fromType<Decimal>();
}
bool isDate(const QVariant& value) {
  return value.metaType() == QMetaType::fromType<Date>();
}

Date dateFromDateTime(const QDateTime& dateTime) {
  return Date::fromSeconds(static_cast<double>(dateTime.toMSecsSinceEpoch()) / 1000.0);
}

// UTC date-time to the second plus the fraction digits of the shortest decimal that reads back as
// the same double ("2024-03-05T10:00:00.123456Z"). Reading rebuilds that decimal exactly and converts
// it once, so the instant comes back bit for bit.
QString dateText(Date date) {
  const double seconds = date.secondsSince1970();
  if (!std::isfinite(seconds)) return QString::number(seconds);
  const double whole = std::floor(seconds);
  QString text = QDateTime::fromSecsSinceEpoch(static_cast<qint64>(whole), Qt::UTC).toString(Qt::ISODate);
  if (seconds != whole) {
    const Decimal shortest =
        *Decimal::fromString(QString::number(seconds, 'f', QLocale::FloatingPointShortest));
    const QString fraction = (shortest - Decimal(static_cast<std::int64_t>(whole))).toString();  // "0.25"
    text.insert(text.size() - 1, QStringView(fraction).sliced(1));
  }
  return text;
}

std::optional<Date> parseDateText(const QString& text) {
  const qsizetype dot = text.lastIndexOf(u'.');
  if (text.endsWith(u'Z') && dot > 0) {
    const QDateTime base = QDateTime::fromString(text.left(dot) + u'Z', Qt::ISODate);
    const std::optional<Decimal> fraction = Decimal::fromString(u'0' + text.mid(dot, text.size() - 1 - dot));
    if (base.isValid() && fraction && !fraction->isNegative()) {
      const Decimal seconds = Decimal(static_cast<std::int64_t>(base.toSecsSinceEpoch())) + *fraction;
      return Date::fromSeconds(seconds.toString().toDouble());
    }
  }
  const QDateTime dateTime = QDateTime::fromString(text, Qt::ISODateWithMs);
  if (dateTime.isValid()) return dateFromDateTime(dateTime);
  return std::nullopt;
}

// The form written to the file; scalars become the text a later read would find anyway, so a value
// reads the same before and after the file is reloaded.
QVariant encode(const QVariant& value) {
  if (isDecimal(value)) return QString(kDecimalMarker + value.value<Decimal>().toString() + u')');
  if (isDate(value)) return QString(kDateMarker + dateText(value.value<Date>()) + u')');
  switch (value.typeId()) {
    case QMetaType::QDateTime:
      return QString(kDateMarker + dateText(dateFromDateTime(value.toDateTime())) + u')');
    case QMetaType::QString: {
      const QString text = value.toString();
      return text.startsWith(u'@') ? QString(u'@' + text) : text;
    }
    case QMetaType::Bool:
      return value.toBool() ? QStringLiteral("true") : QStringLiteral("false");
    case QMetaType::Double:
    case QMetaType::Float:
      return QString::number(value.toDouble(), 'g', QLocale::FloatingPointShortest);
    case QMetaType::Int:
    case QMetaType::LongLong:
    case QMetaType::Long:
    case QMetaType::Short:
      return QString::number(value.toLongLong());
    case QMetaType::UInt:
    case QMetaType::ULongLong:
    case QMetaType::ULong:
    case QMetaType::UShort:
      return QString::number(value.toULongLong());
    default:
      return value;
  }
}

QVariant decode(const QVariant& stored) {
  if (stored.typeId() != QMetaType::QString) return stored;
  const QString text = stored.toString();
  if (!text.startsWith(u'@')) return text;
  if (text.startsWith(u"@@")) return text.mid(1);
  if (text.endsWith(u')')) {
    if (text.startsWith(kDecimalMarker)) {
      const auto inner = QStringView(text).sliced(kDecimalMarker.size()).chopped(1);
      if (const std::optional<Decimal> decimal = Decimal::fromString(inner))
        return QVariant::fromValue(*decimal);
    } else if (text.startsWith(kDateMarker)) {
      const QString inner = text.sliced(kDateMarker.size()).chopped(1);
      if (const std::optional<Date> date = parseDateText(inner)) return QVariant::fromValue(*date);
    }
  }
  return text;  // hand-written text that merely looks like a marker stays text
}

// "YES"/"true" and "NO"/"false" in any case; none for other text.
std::optional<bool> booleanWord(const QVariant& value) {
  if (value.typeId() != QMetaType::QString) return std::nullopt;
  const QString word = value.toString().trimmed();
  if (word.compare(u"yes", Qt::CaseInsensitive) == 0 || word.compare(u"true", Qt::CaseInsensitive) == 0) {
    return true;
  }
  if (word.compare(u"no", Qt::CaseInsensitive) == 0 || word.compare(u"false", Qt::CaseInsensitive) == 0) {
    return false;
  }
  return std::nullopt;
}

QString defaultSettingsPath() {
  return QStandardPaths::writableLocation(QStandardPaths::GenericConfigLocation) +
         QStringLiteral("/Tessal/Tessal.conf");
}

}  // namespace

UserDefaults::UserDefaults(const QString& settingsPath, QObject* parent)
    : QObject(parent),
      settings_(std::make_unique<QSettings>(settingsPath.isEmpty() ? defaultSettingsPath() : settingsPath,
                                            QSettings::IniFormat)) {}

UserDefaults::~UserDefaults() = default;

QString UserDefaults::fileName() const {
  return settings_->fileName();
}

void UserDefaults::registerDefaults(const QVariantMap& defaults) {
  for (auto it = defaults.cbegin(); it != defaults.cend(); ++it) registered_.insert(it.key(), it.value());
}

QVariant UserDefaults::value(const QString& key) const {
  if (settings_->contains(key)) return decode(settings_->value(key));
  return registered_.value(key);
}

void UserDefaults::setValue(const QString& key, const QVariant& value) {
  if (!value.isValid() || value.isNull()) {
    removeValue(key);
    return;
  }
  settings_->setValue(key, encode(value));
  sync();
  emit valueChanged(key);
}

void UserDefaults::removeValue(const QString& key) {
  settings_->remove(key);
  sync();
  emit valueChanged(key);
}

bool UserDefaults::hasStoredValue(const QString& key) const {
  return settings_->contains(key);
}

bool UserDefaults::boolForKey(const QString& key) const {
  const QVariant stored = value(key);
  if (const std::optional<bool> word = booleanWord(stored)) return *word;
  const std::optional<Decimal> number = Decimal::fromVariant(stored);
  return number && !number->isZero();
}

qint64 UserDefaults::integerForKey(const QString& key) const {
  const QVariant stored = value(key);
  if (const std::optional<bool> word = booleanWord(stored)) return *word ? 1 : 0;
  const std::optional<Decimal> number = Decimal::fromVariant(stored);
  return number ? number->toInt64() : 0;
}

QString UserDefaults::stringForKey(const QString& key) const {
  const QVariant stored = value(key);
  if (stored.typeId() == QMetaType::QString) return stored.toString();
  if (stored.typeId() == QMetaType::Bool)
    return stored.toBool() ? QStringLiteral("true") : QStringLiteral("false");
  if (const std::optional<Decimal> number = Decimal::fromVariant(stored)) return number->toString();
  return {};
}

std::optional<Date> UserDefaults::dateForKey(const QString& key) const {
  const QVariant stored = value(key);
  if (isDate(stored)) return stored.value<Date>();
  if (stored.typeId() == QMetaType::QDateTime) {
    const QDateTime dateTime = stored.toDateTime();
    return dateTime.isValid() ? std::optional<Date>(dateFromDateTime(dateTime)) : std::nullopt;
  }
  if (stored.typeId() == QMetaType::QString) return parseDateText(stored.toString());
  return std::nullopt;
}

std::optional<Decimal> UserDefaults::decimalForKey(const QString& key) const {
  const QVariant stored = value(key);
  if (stored.typeId() == QMetaType::Bool) return std::nullopt;
  return Decimal::fromVariant(stored);
}

void UserDefaults::sync() {
  settings_->sync();
}
