#include "GXTemplateValue.h"

#include "Decimal.h"
#include "KeyPath.h"
#include "VariantNumbers.h"

#include <QDateTime>
#include <QStringList>
#include <QTimeZone>

#include <cmath>
#include <limits>

namespace {

int saturate(long double value) {
  if (std::isnan(value)) return 0;
  if (value >= static_cast<long double>(std::numeric_limits<int>::max()))
    return std::numeric_limits<int>::max();
  if (value <= static_cast<long double>(std::numeric_limits<int>::min()))
    return std::numeric_limits<int>::min();
  return static_cast<int>(value);
}

int saturate(qint64 value) {
  if (value > std::numeric_limits<int>::max()) return std::numeric_limits<int>::max();
  if (value < std::numeric_limits<int>::min()) return std::numeric_limits<int>::min();
  return int(value);
}

// Deeper nesting than this is written as "..." (descriptions recurse).
constexpr int kMaxDescriptionDepth = 64;

// Strings inside a collection are quoted unless they are a plain word.
QString quotedIfNeeded(const QString& text) {
  bool plain = !text.isEmpty();
  for (QChar c : text) {
    if (!(c.isLetterOrNumber() || c == u'_' || c == u'.' || c == u'$' || c == u'/' || c == u':')) {
      plain = false;
      break;
    }
  }
  if (plain) return text;
  QString quoted = text;
  quoted.replace(u'\\', QLatin1String("\\\\")).replace(u'"', QLatin1String("\\\""));
  return u'"' + quoted + u'"';
}

void describe(const QVariant& value, int depth, QString& out);

void describeMember(const QVariant& value, int depth, QString& out) {
  if (value.typeId() == QMetaType::QString) {
    out += quotedIfNeeded(value.toString());
  } else {
    describe(value, depth, out);
  }
}

void describe(const QVariant& value, int depth, QString& out) {
  if (depth > kMaxDescriptionDepth) {
    out += QLatin1String("...");
    return;
  }
  const QString indent(4 * (depth + 1), u' ');
  const QString closingIndent(4 * depth, u' ');
  if (GXTemplateValue::isList(value)) {
    const QVariantList list = value.toList();
    out += u'(';
    for (qsizetype i = 0; i < list.size(); ++i) {
      out += i == 0 ? QLatin1String("\n") : QLatin1String(",\n");
      out += indent;
      describeMember(list[i], depth + 1, out);
    }
    out += u'\n' + closingIndent + u')';
    return;
  }
  if (GXTemplateValue::isMap(value)) {
    const QVariantMap map = value.typeId() == QMetaType::QVariantHash ? [&] {
      QVariantMap sorted;
      const QVariantHash hash = value.toHash();
      for (auto it = hash.cbegin(); it != hash.cend(); ++it) sorted.insert(it.key(), it.value());
      return sorted;
    }()
                                                                      : value.toMap();
    out += QLatin1String("{\n");
    for (auto it = map.cbegin(); it != map.cend(); ++it) {
      out += indent + quotedIfNeeded(it.key()) + QLatin1String(" = ");
      describeMember(it.value(), depth + 1, out);
      out += QLatin1String(";\n");
    }
    out += closingIndent + u'}';
    return;
  }
  out += GXTemplateValue::description(value);
}

using VariantNumbers::isSignedInteger;
using VariantNumbers::isUnsignedInteger;

}  // namespace

bool GXTemplateValue::isMap(const QVariant& value) {
  return value.typeId() == QMetaType::QVariantMap || value.typeId() == QMetaType::QVariantHash;
}

bool GXTemplateValue::isList(const QVariant& value) {
  return value.typeId() == QMetaType::QVariantList || value.typeId() == QMetaType::QStringList;
}

bool GXTemplateValue::isColor(const QVariant& value) {
  return value.typeId() == QMetaType::QColor;
}

std::optional<QVariantList> GXTemplateValue::elements(const QVariant& value) {
  if (isList(value)) return value.toList();
  if (value.typeId() == QMetaType::QVariantMap) return value.toMap().values();
  if (value.typeId() == QMetaType::QVariantHash) {
    QVariantMap sorted;
    const QVariantHash hash = value.toHash();
    for (auto it = hash.cbegin(); it != hash.cend(); ++it) sorted.insert(it.key(), it.value());
    return sorted.values();
  }
  return std::nullopt;
}

std::optional<Date> GXTemplateValue::dateValue(const QVariant& value) {
  if (value.typeId() == QMetaType::fromType<Date>().id()) return value.value<Date>();
  if (value.typeId() == QMetaType::QDateTime) {
    const QDateTime dateTime = value.toDateTime();
    if (dateTime.isValid()) return Date::fromQDateTime(dateTime);
  }
  return std::nullopt;
}

QString GXTemplateValue::description(const QVariant& value) {
  if (isNil(value)) return QStringLiteral("(null)");
  const int type = value.typeId();
  if (type == QMetaType::QString) return value.toString();
  if (type == QMetaType::Bool) return value.toBool() ? QStringLiteral("1") : QStringLiteral("0");
  if (isSignedInteger(type)) return QString::number(value.toLongLong());
  if (isUnsignedInteger(type)) return QString::number(value.toULongLong());
  if (type == QMetaType::Double || type == QMetaType::Float) {
    const double number = value.toDouble();
    if (std::isnan(number)) return QStringLiteral("nan");
    if (std::isinf(number)) return number > 0 ? QStringLiteral("inf") : QStringLiteral("-inf");
    const std::optional<Decimal> decimal = Decimal::fromDouble(number);
    return decimal ? decimal->toString() : QString::number(number, 'g', 17);
  }
  if (type == QMetaType::fromType<Decimal>().id()) return value.value<Decimal>().toString();
  if (const std::optional<Date> date = dateValue(value)) {
    return date->toQDateTime().toUTC().toString(QStringLiteral("yyyy-MM-dd HH:mm:ss")) +
           QLatin1String(" +0000");
  }
  if (isList(value) || isMap(value)) {
    QString out;
    describe(value, 0, out);
    return out;
  }
  if (const KeyValueCoding* object = KeyPath::objectFromVariant(value)) {
    const QVariant uuid = object->valueForKey(QStringLiteral("uuid"));
    return uuid.typeId() == QMetaType::QString ? QLatin1Char('<') + uuid.toString() + QLatin1Char('>')
                                               : QStringLiteral("<object>");
  }
  // Types of other modules (QColor, QUrl...) as their own text, when they have one.
  if (value.canConvert<QString>()) return value.toString();
  return QLatin1Char('<') + QString::fromLatin1(value.metaType().name()) + QLatin1Char('>');
}

bool GXTemplateValue::answersIntValue(const QVariant& value) {
  const int type = value.typeId();
  return type == QMetaType::QString || type == QMetaType::Bool || isSignedInteger(type) ||
         isUnsignedInteger(type) || type == QMetaType::Double || type == QMetaType::Float ||
         type == QMetaType::fromType<Decimal>().id();
}

int GXTemplateValue::intValue(QStringView text) {
  qsizetype i = 0;
  while (i < text.size() && text[i].isSpace()) ++i;
  bool negative = false;
  if (i < text.size() && (text[i] == u'+' || text[i] == u'-')) {
    negative = text[i] == u'-';
    ++i;
  }
  qint64 magnitude = 0;
  for (; i < text.size() && text[i] >= u'0' && text[i] <= u'9'; ++i) {
    magnitude = magnitude * 10 + (text[i].unicode() - u'0');
    if (magnitude > qint64(std::numeric_limits<int>::max()) + 1) break;  // saturates below
  }
  return saturate(negative ? -magnitude : magnitude);
}

int GXTemplateValue::intValue(const QVariant& value) {
  const int type = value.typeId();
  if (type == QMetaType::QString)
    return intValue(QStringView(*static_cast<const QString*>(value.constData())));
  if (type == QMetaType::Bool) return value.toBool() ? 1 : 0;
  if (isSignedInteger(type)) return saturate(qint64(value.toLongLong()));
  if (isUnsignedInteger(type)) {
    const qulonglong number = value.toULongLong();
    return number > qulonglong(std::numeric_limits<int>::max()) ? std::numeric_limits<int>::max()
                                                                : int(number);
  }
  if (type == QMetaType::Double || type == QMetaType::Float)
    return saturate(static_cast<long double>(value.toDouble()));
  if (type == QMetaType::fromType<Decimal>().id()) return saturate(qint64(value.value<Decimal>().toInt64()));
  return 0;
}
