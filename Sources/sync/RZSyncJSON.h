#pragma once

#include <QByteArray>
#include <QByteArrayView>
#include <QMap>
#include <QString>
#include <QVariant>

#include <limits>
#include <optional>

// JSON for the change journal and the sync protocol, exact for money: a number with a fraction or an
// exponent is read from its own text into a Decimal and written back from Decimal::toString(), so
// 12.30 stays 12.30 and no value ever passes through binary floating point.
//
// In memory a JSON value is a QVariant: an object a QVariantMap, an array a QVariantList, a string a
// QString, an integer a qint64 (one beyond that range a Decimal), any other number a Decimal, true and
// false a bool, and null a null (invalid) QVariant.
namespace RZSyncJSON {

// Containers nested deeper than this are refused while parsing.
inline constexpr std::size_t kMaxDepth = 64;
// No bound on the number of values (the journal: this installation's own file).
inline constexpr std::size_t kAnyNumberOfValues = std::numeric_limits<std::size_t>::max();

// Parses one JSON text; a bare string or number at the top level is accepted (the caller decides
// whether it wants a container). None for malformed text, nesting deeper than kMaxDepth or more than
// `maxValues` values (every container and every member counts, keys do not), with a description in
// `error` when given. The bound holds while parsing: a refused text is never built whole.
std::optional<QVariant> parse(QByteArrayView text, QString* error = nullptr,
                              std::size_t maxValues = kAnyNumberOfValues);

enum class Style {
  Compact,
  Pretty,  // one member per line, two spaces of indentation per level
};

// Writes a value in the form above. Also takes QStringList, QVariantHash, the other integer types, and
// double (through its shortest decimal text; NaN and infinities become null). Any other type is
// written as its text when it converts to one, else as null.
QByteArray write(const QVariant& value, Style style = Style::Pretty);
// The compact text of an object given member by member in the order a QVariantMap keeps its keys: the
// text write() gives that map, without the map being built.
class CompactObject {
 public:
  void add(const QString& key, const QVariant& value);
  // The object's text; the writer starts a new object after it.
  QByteArray take();

 private:
  QByteArray text_;
};

// Whether two values are the same JSON text (so 12.30 and 12.3 differ, as a server would see them).
bool sameValue(const QVariant& a, const QVariant& b);

// True for a QVariantMap or a QVariantList: what the sync accepts as a reply.
bool isContainer(const QVariant& value);

}  // namespace RZSyncJSON
