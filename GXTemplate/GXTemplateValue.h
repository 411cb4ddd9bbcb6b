#pragma once

#include "Date.h"
#include "KeyPath.h"

#include <QHashFunctions>
#include <QString>
#include <QStringView>
#include <QVariant>

#include <optional>

// How template values behave, shared by the engine, its markers and its filters. Values are QVariants:
// maps (QVariantMap, QVariantHash), lists (QVariantList, QStringList), strings, integers, booleans, doubles,
// Decimal, Date and QDateTime, colours (QColor) and records (KeyValueCoding*).
class GXTemplateValue {
 public:
  // No value: an invalid variant, or a null record pointer.
  static bool isNil(const QVariant& value) {
    if (!value.isValid()) return true;
    return value.metaType() == QMetaType::fromType<KeyValueCoding*>() &&
           *static_cast<KeyValueCoding* const*>(value.constData()) == nullptr;
  }

  // The text a value is written as: strings as they are, integers and Decimal as plain decimal text,
  // booleans as 1 and 0, doubles as the shortest decimal that reads back the same, dates as
  // "2024-01-05 09:30:00 +0000" (UTC), lists as "(\n    a,\n    b\n)", maps as "{\n    key = value;\n}",
  // records by their "uuid", no value as "(null)".
  static QString description(const QVariant& value);

  // Whether the value has an integer value: numbers and strings.
  static bool answersIntValue(const QVariant& value);
  // The integer value: numbers truncated toward zero, strings by their leading integer (blanks skipped,
  // optional sign, 0 when there are no digits); beyond 32 bits it saturates. 0 for anything else.
  static int intValue(const QVariant& value);
  static int intValue(QStringView text);

  // The instant of a Date or QDateTime value.
  static std::optional<Date> dateValue(const QVariant& value);
  // Whether the value is a colour (QColor).
  static bool isColor(const QVariant& value);

  static bool isMap(const QVariant& value);
  static bool isList(const QVariant& value);
  // The elements of a list, or the values of a map in key order; none for anything else.
  static std::optional<QVariantList> elements(const QVariant& value);

  // A cheap hash of a string for the engine's own tables of names (QHash's seeded string hash costs
  // more than everything else a marker takes).
  struct StringHash {
    std::size_t operator()(const QString& text) const noexcept { return qHash(QStringView(text), 0); }
  };
};
