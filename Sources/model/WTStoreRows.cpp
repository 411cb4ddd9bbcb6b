#include "WTStoreRows.h"

#include <sqlite3.h>

#include <array>

namespace WTStoreRows {

namespace {

void readString(sqlite3_stmt* statement, int column, QString& out) {
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
  if (!text) {
    out = QString();
    return;
  }
  const int size = sqlite3_column_bytes(statement, column);
  // fromUtf8 of nothing may give a null string; an empty text must stay distinct from none.
  out = size == 0 ? QString(QLatin1StringView("")) : QString::fromUtf8(text, size);
}

// Entity names repeat on every row: share one string per name instead of making one per row.
void readEntity(sqlite3_stmt* statement, QString& out) {
  static const std::array<QString, 8> kNames = {QStringLiteral("WTClient"), QStringLiteral("WTProject"),
                                                QStringLiteral("WTTask"),   QStringLiteral("WTTime"),
                                                QStringLiteral("WTFlat"),   QStringLiteral("WTExpense"),
                                                QStringLiteral("WTNote"),   QStringLiteral("WTToDo")};
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, kEntity));
  const int size = sqlite3_column_bytes(statement, kEntity);
  const QLatin1StringView name(text, text ? size : 0);
  for (const QString& known : kNames) {
    if (known == name) {
      out = known;
      return;
    }
  }
  readString(statement, kEntity, out);
}

// False when the column holds text that is not a number.
bool readDecimal(sqlite3_stmt* statement, int column, std::optional<Decimal>& out) {
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
  if (!text) {
    out.reset();
    return true;
  }
  const int size = sqlite3_column_bytes(statement, column);
  std::array<char16_t, 64> wide;
  if (size <= int(wide.size())) {
    // Numbers are ASCII; anything else fails to parse either way.
    for (int i = 0; i < size; ++i) wide[i] = char16_t(static_cast<unsigned char>(text[i]));
    out = Decimal::fromString(QStringView(wide.data(), size));
  } else {
    out = Decimal::fromString(QString::fromUtf8(text, size));
  }
  return out.has_value();
}

std::optional<qint64> readInteger(sqlite3_stmt* statement, int column) {
  if (sqlite3_column_type(statement, column) == SQLITE_NULL) return std::nullopt;
  return sqlite3_column_int64(statement, column);
}

std::optional<Date> readDate(sqlite3_stmt* statement, int column) {
  if (sqlite3_column_type(statement, column) == SQLITE_NULL) return std::nullopt;
  return Date::fromSeconds(sqlite3_column_double(statement, column));
}

// ---- Writing rows.

}  // namespace

int bindString(sqlite3_stmt* statement, int column, const QString& text) {
  if (text.isNull()) return sqlite3_bind_null(statement, column + 1);
  // The records outlive the statement's step, so SQLite may read the text where it is.
  return sqlite3_bind_text16(statement, column + 1, text.utf16(), int(text.size() * sizeof(char16_t)),
                             SQLITE_STATIC);
}

namespace {

// The decimal's plain text, except that a positive exponent is written out ("12E+2", not "1200") so that
// the value reads back with its exponent, and a huge exponent does not turn into a million zeros of text.
QByteArray decimalText(const Decimal& value) {
  if (value.exponent() <= 0) return value.toString().toUtf8();
  QString text = value.toString();
  if (!value.isZero()) text.chop(value.exponent());
  return text.toUtf8() + "E+" + QByteArray::number(value.exponent());
}

int bindDecimal(sqlite3_stmt* statement, int column, const std::optional<Decimal>& value) {
  if (!value) return sqlite3_bind_null(statement, column + 1);
  const QByteArray text = decimalText(*value);
  return sqlite3_bind_text(statement, column + 1, text.constData(), int(text.size()), SQLITE_TRANSIENT);
}

int bindDate(sqlite3_stmt* statement, int column, const std::optional<Date>& value) {
  if (!value) return sqlite3_bind_null(statement, column + 1);
  return sqlite3_bind_double(statement, column + 1, value->secondsSince1970());
}

}  // namespace

int bindRecord(sqlite3_stmt* s, const WTStoreRecord& r) {
  const int codes[] = {
      bindString(s, kUuid, r.uuid),
      bindString(s, kEntity, r.entity),
      bindString(s, kName, r.name),
      bindString(s, kNotes, r.notes),
      bindDecimal(s, kRate, r.rate),
      bindString(s, kColor, r.color),
      sqlite3_bind_int(s, kArchived + 1, r.archived),
      bindString(s, kAddressBookUID, r.addressBookUID),
      bindString(s, kTotalsUID, r.totalsUID),
      bindString(s, kClientUuid, r.clientUuid),
      bindString(s, kProjectUuid, r.projectUuid),
      sqlite3_bind_int(s, kPosition + 1, r.position),
      bindDecimal(s, kBudget, r.budget),
      bindString(s, kTaskUuid, r.taskUuid),
      bindDate(s, kStartDate, r.startDate),
      bindDate(s, kEndDate, r.endDate),
      sqlite3_bind_int(s, kRunning + 1, r.running),
      r.minutes ? sqlite3_bind_int64(s, kMinutes + 1, *r.minutes) : sqlite3_bind_null(s, kMinutes + 1),
      bindDecimal(s, kExpense, r.expense),
      sqlite3_bind_int(s, kCompleted + 1, r.completed),
      bindString(s, kCurrency, r.currency),
      bindString(s, kAddress, r.address),
      r.roundingMinutes ? sqlite3_bind_int64(s, kRoundingMinutes + 1, *r.roundingMinutes)
                        : sqlite3_bind_null(s, kRoundingMinutes + 1),
      bindString(s, kRoundingMode, r.roundingMode),
      bindString(s, kImportId, r.importId),
  };
  for (int code : codes) {
    if (code != SQLITE_OK) return code;
  }
  return SQLITE_OK;
}

void SharedUuids::read(sqlite3_stmt* statement, int column, QString& out) {
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
  if (!text) {
    out = QString();
    return;
  }
  const QByteArray bytes = QByteArray::fromRawData(text, sqlite3_column_bytes(statement, column));
  if (const auto found = known_.constFind(bytes); found != known_.cend()) {
    out = *found;
    return;
  }
  readString(statement, column, out);
  known_.insert(QByteArray(bytes.constData(), bytes.size()), out);
}

bool readRecord(sqlite3_stmt* s, WTStoreRecord& record, SharedUuids* owners) {
  const auto readOwner = [&](int column, QString& out) {
    if (owners)
      owners->read(s, column, out);
    else
      readString(s, column, out);
  };
  readString(s, kUuid, record.uuid);
  readEntity(s, record.entity);
  readString(s, kName, record.name);
  readString(s, kNotes, record.notes);
  readString(s, kColor, record.color);
  record.archived = sqlite3_column_int(s, kArchived) != 0;
  readString(s, kAddressBookUID, record.addressBookUID);
  readString(s, kTotalsUID, record.totalsUID);
  readOwner(kClientUuid, record.clientUuid);
  readOwner(kProjectUuid, record.projectUuid);
  record.position = sqlite3_column_int(s, kPosition);
  readOwner(kTaskUuid, record.taskUuid);
  record.startDate = readDate(s, kStartDate);
  record.endDate = readDate(s, kEndDate);
  record.running = sqlite3_column_int(s, kRunning) != 0;
  record.minutes = readInteger(s, kMinutes);
  record.completed = sqlite3_column_int(s, kCompleted) != 0;
  readString(s, kCurrency, record.currency);
  readString(s, kAddress, record.address);
  record.roundingMinutes = readInteger(s, kRoundingMinutes);
  readString(s, kRoundingMode, record.roundingMode);
  readString(s, kImportId, record.importId);
  return readDecimal(s, kRate, record.rate) && readDecimal(s, kBudget, record.budget) &&
         readDecimal(s, kExpense, record.expense);
}

}  // namespace WTStoreRows
