#include "KeyPath.h"

#include "Date.h"
#include "Decimal.h"
#include "VariantNumbers.h"

#include <QDateTime>
#include <QStringList>
#include <QVarLengthArray>

#include <algorithm>
#include <cmath>
#include <limits>
#include <numeric>
#include <vector>

namespace {

// Key paths are split once per call; every element of a list is then evaluated against the same
// pieces, so a path over 100,000 records costs no further allocation for its keys.
using Segments = QVarLengthArray<QString, 6>;

Segments split(QStringView path) {
  Segments segments;
  while (true) {
    const qsizetype dot = path.indexOf(u'.');
    if (dot < 0) {
      segments.append(path.toString());
      return segments;
    }
    segments.append(path.first(dot).toString());
    path = path.sliced(dot + 1);
  }
}

// The broad families compareValues and the operators care about, decided once per value.
enum class Kind { Null, Signed, Unsigned, Double, Decimal, String, Date, DateTime, Other };

int decimalTypeId() {
  static const int id = QMetaType::fromType<Decimal>().id();
  return id;
}

int dateTypeId() {
  static const int id = QMetaType::fromType<Date>().id();
  return id;
}

int objectTypeId() {
  static const int id = QMetaType::fromType<KeyValueCoding*>().id();
  return id;
}

Kind kindOf(const QVariant& value) {
  if (!value.isValid() || value.isNull()) return Kind::Null;
  const int type = value.typeId();
  if (type == QMetaType::Bool || VariantNumbers::isSignedInteger(type)) return Kind::Signed;
  if (VariantNumbers::isUnsignedInteger(type)) return Kind::Unsigned;
  if (VariantNumbers::isFloatingPoint(type)) return Kind::Double;
  switch (type) {
    case QMetaType::QString:
      return Kind::String;
    case QMetaType::QDateTime:
      return Kind::DateTime;
    default:
      break;
  }
  if (type == decimalTypeId()) return Kind::Decimal;
  if (type == dateTypeId()) return Kind::Date;
  return Kind::Other;
}

template <typename T>
const T& payload(const QVariant& value) {
  return *static_cast<const T*>(value.constData());
}

// Exact conversion of any number to Decimal; none for NaN and infinities.
std::optional<Decimal> decimalOf(const QVariant& value, Kind kind) {
  switch (kind) {
    case Kind::Signed:
      return Decimal(static_cast<std::int64_t>(value.toLongLong()));
    case Kind::Unsigned: {
      const qulonglong number = value.toULongLong();
      if (number <= static_cast<qulonglong>(std::numeric_limits<std::int64_t>::max())) {
        return Decimal(static_cast<std::int64_t>(number));
      }
      return Decimal::fromString(QString::number(number));
    }
    case Kind::Double:
      return Decimal::fromDouble(value.toDouble());
    case Kind::Decimal:
      return payload<Decimal>(value);
    default:
      return Decimal::fromVariant(value);
  }
}

template <typename T>
int threeWay(const T& a, const T& b) {
  return a < b ? -1 : (b < a ? 1 : 0);
}

int compareNumbers(const QVariant& a, Kind ka, const QVariant& b, Kind kb) {
  if (ka == Kind::Decimal || kb == Kind::Decimal) {
    const std::optional<Decimal> da = decimalOf(a, ka);
    const std::optional<Decimal> db = decimalOf(b, kb);
    // Only NaN has no Decimal; it sorts before every other number.
    if (!da || !db) return (da ? 1 : 0) - (db ? 1 : 0);
    const auto order = *da <=> *db;
    return order < 0 ? -1 : (order > 0 ? 1 : 0);
  }
  if (ka != Kind::Double && kb != Kind::Double) {
    auto wide = [](const QVariant& v, Kind k) -> __int128 {
      return k == Kind::Unsigned ? static_cast<__int128>(v.toULongLong())
                                 : static_cast<__int128>(v.toLongLong());
    };
    return threeWay(wide(a, ka), wide(b, kb));
  }
  // 64-bit integers and doubles are all exact in long double's 64-bit mantissa.
  auto extended = [](const QVariant& v, Kind k) -> long double {
    if (k == Kind::Double) return v.toDouble();
    if (k == Kind::Unsigned) return static_cast<long double>(v.toULongLong());
    return static_cast<long double>(v.toLongLong());
  };
  const long double x = extended(a, ka);
  const long double y = extended(b, kb);
  if (std::isnan(x) || std::isnan(y)) return (std::isnan(x) ? 0 : 1) - (std::isnan(y) ? 0 : 1);
  return threeWay(x, y);
}

double secondsOf(const QVariant& value, Kind kind) {
  if (kind == Kind::Date) return payload<Date>(value).secondsSince1970();
  return static_cast<double>(payload<QDateTime>(value).toMSecsSinceEpoch()) / 1000.0;
}

// Families in the order used when two values cannot be compared by content.
int rank(Kind kind) {
  switch (kind) {
    case Kind::Null:
      return 0;
    case Kind::Signed:
    case Kind::Unsigned:
    case Kind::Double:
    case Kind::Decimal:
      return 1;
    case Kind::String:
      return 2;
    case Kind::Date:
    case Kind::DateTime:
      return 3;
    case Kind::Other:
      return 4;
  }
  return 4;
}

int compareKinds(const QVariant& a, Kind ka, const QVariant& b, Kind kb, bool caseInsensitive) {
  const int ra = rank(ka);
  const int rb = rank(kb);
  if (ra != rb) return ra < rb ? -1 : 1;
  switch (ra) {
    case 0:
      return 0;
    case 1:
      return compareNumbers(a, ka, b, kb);
    case 2: {
      const int order = QString::compare(payload<QString>(a), payload<QString>(b),
                                         caseInsensitive ? Qt::CaseInsensitive : Qt::CaseSensitive);
      return order < 0 ? -1 : (order > 0 ? 1 : 0);
    }
    case 3:
      if (ka == Kind::DateTime && kb == Kind::DateTime) {
        return threeWay(payload<QDateTime>(a).toMSecsSinceEpoch(), payload<QDateTime>(b).toMSecsSinceEpoch());
      }
      return threeWay(secondsOf(a, ka), secondsOf(b, kb));
    default:
      break;
  }
  // Other types: by their own ordering when Qt knows one (QDate, QTime, QByteArray...), else by type.
  if (a.metaType() != b.metaType()) return threeWay(a.typeId(), b.typeId());
  const QPartialOrdering order = QVariant::compare(a, b);
  if (order == QPartialOrdering::Less) return -1;
  if (order == QPartialOrdering::Greater) return 1;
  return 0;
}

// Calls `visit` with every element of a QVariantList or QStringList; false for anything else.
template <typename Visit>
bool forEachElement(const QVariant& value, Visit&& visit) {
  if (value.typeId() == QMetaType::QVariantList) {
    for (const QVariant& element : payload<QVariantList>(value)) visit(element);
    return true;
  }
  if (value.typeId() == QMetaType::QStringList) {
    for (const QString& element : payload<QStringList>(value)) visit(QVariant(element));
    return true;
  }
  return false;
}

qsizetype elementCount(const QVariant& value) {
  if (value.typeId() == QMetaType::QVariantList) return payload<QVariantList>(value).size();
  if (value.typeId() == QMetaType::QStringList) return payload<QStringList>(value).size();
  return -1;
}

QVariant evaluate(const QVariant& value, const QString* segment, const QString* end);

// One plain key on one value; lists map it over their elements.
QVariant valueForKey(const QVariant& value, const QString& key) {
  const int type = value.typeId();
  if (type == QMetaType::QVariantMap) return payload<QVariantMap>(value).value(key);
  if (type == QMetaType::QVariantHash) return payload<QVariantHash>(value).value(key);
  if (type == objectTypeId()) {
    if (key == QLatin1String("self")) return value;
    const KeyValueCoding* object = payload<KeyValueCoding*>(value);
    return object ? object->valueForKey(key) : QVariant();
  }
  if (type == QMetaType::QVariantList || type == QMetaType::QStringList) {
    QVariantList mapped;
    mapped.reserve(elementCount(value));
    forEachElement(value, [&](const QVariant& element) { mapped.append(valueForKey(element, key)); });
    return mapped;
  }
  if (key == QLatin1String("self")) return value;
  return {};
}

// Running total of @sum and @avg: integers until a Decimal, double or numeric text (or an overflow)
// turns it into an exact Decimal.
class Total {
 public:
  void add(const QVariant& value) {
    const Kind kind = kindOf(value);
    if (kind == Kind::Null) return;
    const bool fitsInteger =
        kind == Kind::Signed ||
        (kind == Kind::Unsigned && value.toULongLong() <= qulonglong(std::numeric_limits<qint64>::max()));
    if (fitsInteger && !isDecimal_) {
      // On overflow the total so far stays untouched and carries on as a Decimal.
      qint64 next = 0;
      if (!__builtin_add_overflow(integer_, value.toLongLong(), &next)) {
        integer_ = next;
        ++count_;
        return;
      }
    }
    const std::optional<Decimal> number = decimalOf(value, kind);
    if (!number) return;
    if (!isDecimal_) {
      decimal_ = Decimal(static_cast<std::int64_t>(integer_));
      isDecimal_ = true;
    }
    decimal_ += *number;
    ++count_;
  }

  qsizetype count() const { return count_; }
  Decimal decimal() const { return isDecimal_ ? decimal_ : Decimal(static_cast<std::int64_t>(integer_)); }
  QVariant sum() const { return isDecimal_ ? QVariant::fromValue(decimal_) : QVariant(qlonglong(integer_)); }

 private:
  qint64 integer_ = 0;
  Decimal decimal_;
  bool isDecimal_ = false;
  qsizetype count_ = 0;
};

// "@operator.rest" on a list: `rest` is evaluated on each element and the results combined.
QVariant applyOperator(const QVariant& list, QStringView name, const QString* rest, const QString* end) {
  if (name == u"count") {
    const qsizetype count = elementCount(list);
    return count < 0 ? QVariant() : QVariant(qlonglong(count));
  }
  auto element = [&](const QVariant& value) { return rest == end ? value : evaluate(value, rest, end); };
  if (name == u"sum" || name == u"avg") {
    Total total;
    if (!forEachElement(list, [&](const QVariant& value) { total.add(element(value)); })) return {};
    if (name == u"sum") return total.sum();
    if (total.count() == 0) return {};
    const std::optional<Decimal> average =
        Decimal::divide(total.decimal(), Decimal(std::int64_t(total.count())));
    return average ? QVariant::fromValue(*average) : QVariant();
  }
  if (name == u"max" || name == u"min") {
    const int wanted = name == u"max" ? 1 : -1;
    QVariant best;
    Kind bestKind = Kind::Null;
    if (!forEachElement(list, [&](const QVariant& value) {
          QVariant candidate = element(value);
          const Kind kind = kindOf(candidate);
          if (kind == Kind::Null) return;
          // The first of equal extremes wins.
          if (bestKind == Kind::Null || compareKinds(candidate, kind, best, bestKind, false) == wanted) {
            best = std::move(candidate);
            bestKind = kind;
          }
        })) {
      return {};
    }
    return best;
  }
  return {};
}

QVariant evaluate(const QVariant& value, const QString* segment, const QString* end) {
  QVariant current = value;
  for (; segment != end; ++segment) {
    if (segment->startsWith(u'@')) {
      const QStringView name = QStringView(*segment).sliced(1);
      // A map counts its entries; every other operator needs a list.
      if (name == u"count" && current.typeId() == QMetaType::QVariantMap) {
        return qlonglong(payload<QVariantMap>(current).size());
      }
      if (name == u"count" && current.typeId() == QMetaType::QVariantHash) {
        return qlonglong(payload<QVariantHash>(current).size());
      }
      return applyOperator(current, name, segment + 1, end);
    }
    current = valueForKey(current, *segment);
    if (current.isNull()) return {};
  }
  return current;
}

}  // namespace

namespace KeyPath {

QVariant variantFromObject(const KeyValueCoding* object) {
  if (!object) return {};
  return QVariant::fromValue(const_cast<KeyValueCoding*>(object));
}

KeyValueCoding* objectFromVariant(const QVariant& value) {
  if (value.typeId() != objectTypeId()) return nullptr;
  return payload<KeyValueCoding*>(value);
}

QVariant valueForKeyPath(const QVariant& root, QStringView keyPath) {
  if (keyPath.isEmpty()) return root;
  const Segments segments = split(keyPath);
  return evaluate(root, segments.cbegin(), segments.cend());
}

int compareValues(const QVariant& a, const QVariant& b, bool caseInsensitive) {
  return compareKinds(a, kindOf(a), b, kindOf(b), caseInsensitive);
}

QVariantList sorted(QVariantList values, const QList<SortDescriptor>& descriptors) {
  if (descriptors.isEmpty() || values.size() < 2) return values;
  const qsizetype count = values.size();
  const qsizetype width = descriptors.size();
  // Every sort key is read once per element up front, not once per comparison.
  std::vector<QVariant> keys(static_cast<size_t>(count * width));
  std::vector<Kind> kinds(keys.size());
  for (qsizetype d = 0; d < width; ++d) {
    const Segments segments = split(descriptors[d].keyPath);
    const bool whole = descriptors[d].keyPath.isEmpty();
    for (qsizetype i = 0; i < count; ++i) {
      const size_t slot = static_cast<size_t>(i * width + d);
      keys[slot] = whole ? values[i] : evaluate(values[i], segments.cbegin(), segments.cend());
      kinds[slot] = kindOf(keys[slot]);
    }
  }
  std::vector<qsizetype> order(static_cast<size_t>(count));
  std::iota(order.begin(), order.end(), qsizetype(0));
  std::stable_sort(order.begin(), order.end(), [&](qsizetype x, qsizetype y) {
    for (qsizetype d = 0; d < width; ++d) {
      const size_t sx = static_cast<size_t>(x * width + d);
      const size_t sy = static_cast<size_t>(y * width + d);
      int result = compareKinds(keys[sx], kinds[sx], keys[sy], kinds[sy], descriptors[d].caseInsensitive);
      if (!descriptors[d].ascending) result = -result;
      if (result != 0) return result < 0;
    }
    return false;
  });
  QVariantList result;
  result.reserve(count);
  for (qsizetype index : order) result.append(std::move(values[index]));
  return result;
}

}  // namespace KeyPath
