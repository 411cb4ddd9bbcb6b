#pragma once

#include <QList>
#include <QMetaType>
#include <QString>
#include <QVariant>

// Key-value access shared by the model, sorting, filtering and the template engine.
//
// Anything that answers keys by name implements KeyValueCoding and travels in a QVariant as a
// `KeyValueCoding*` (see variantFromObject). The pointer is not owned by the variant.
class KeyValueCoding {
 public:
  virtual ~KeyValueCoding() = default;
  // The value stored or derived under `key`, or a null variant when the key is unknown or empty.
  virtual QVariant valueForKey(const QString& key) const = 0;
};

Q_DECLARE_METATYPE(KeyValueCoding*)

namespace KeyPath {

// A null pointer gives a null variant.
QVariant variantFromObject(const KeyValueCoding* object);
// The object in a variant made by variantFromObject, or null for any other variant.
KeyValueCoding* objectFromVariant(const QVariant& value);

// Evaluates a dotted key path against maps (QVariantMap, QVariantHash), records and lists:
//  - a map answers the key's entry, a record its valueForKey;
//  - a list answers a plain key by mapping it over its elements (a list of the results, nulls kept);
//  - on a list, "@count" is the element count, and "@sum.rest", "@max.rest", "@min.rest", "@avg.rest"
//    evaluate "rest" on every element and combine the non-null results.
// @sum of integers (and booleans) is an integer; once a Decimal or double is involved it is a Decimal.
// @avg is a Decimal. @sum of nothing is the integer 0; @max, @min and @avg of nothing are null.
// Numeric text counts as a Decimal in @sum and @avg; other non-numbers are skipped there. An operator
// with no rest ("@max") uses the elements themselves; "@count" on a map counts its entries.
// "self" answers the value itself (a map answers its entry); an empty key path answers the root.
// Anything that cannot be answered yields a null variant, never an error.
QVariant valueForKeyPath(const QVariant& root, QStringView keyPath);

// Orders two values: numbers (integers, booleans, doubles, Decimal) by value, strings (optionally
// case-insensitively), Date, QDateTime; null sorts before everything. Returns <0, 0 or >0.
int compareValues(const QVariant& a, const QVariant& b, bool caseInsensitive = false);

struct SortDescriptor {
  QString keyPath;
  bool ascending = true;
  bool caseInsensitive = false;
};

// Stable sort of `values` by the descriptors in turn, each reading its key path from the element.
QVariantList sorted(QVariantList values, const QList<SortDescriptor>& descriptors);

}  // namespace KeyPath
