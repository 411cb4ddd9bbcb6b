// libFuzzer target over the store's reading of rows (see README.md): the input becomes up to four rows
// of a real store file, each column a NULL, an integer, a real, a text or a blob. Loading either refuses
// the file as damaged or gives records; records given, saved and loaded again, are the same records.
#include "FuzzCheck.h"
#include "WTStore.h"
#include "WTStoreRows.h"

#include <fuzzer/FuzzedDataProvider.h>

#include <QFile>
#include <QTemporaryDir>

#include <sqlite3.h>

#include <algorithm>
#include <vector>

namespace {

constexpr int kColumns = WTStoreRows::kImportId + 1;

// The entity column mostly holds the names the store knows, so rows reach what depends on them.
const char* const kEntities[] = {"WTClient", "WTProject", "WTTask", "WTTime",
                                 "WTFlat",   "WTExpense", "WTNote", "WTToDo"};

// A NULL, an integer, a real, a text, a blob or an entity's name.
void bindColumn(sqlite3_stmt* insert, int column, FuzzedDataProvider& input) {
  const int parameter = column + 1, kind = input.ConsumeIntegralInRange(0, 5);
  if (kind == 0) sqlite3_bind_null(insert, parameter);
  if (kind == 1) sqlite3_bind_int64(insert, parameter, input.ConsumeIntegral<sqlite3_int64>());
  if (kind == 2) sqlite3_bind_double(insert, parameter, input.ConsumeFloatingPoint<double>());
  if (kind == 3 || kind == 4) {
    const std::string bytes = input.ConsumeRandomLengthString(64);
    if (kind == 3) sqlite3_bind_text(insert, parameter, bytes.data(), int(bytes.size()), SQLITE_TRANSIENT);
    if (kind == 4) sqlite3_bind_blob(insert, parameter, bytes.data(), int(bytes.size()), SQLITE_TRANSIENT);
  }
  if (kind == 5) sqlite3_bind_text(insert, parameter, input.PickValueInArray(kEntities), -1, SQLITE_STATIC);
}

struct Fixture {
  QTemporaryDir dir;
  std::unique_ptr<WTStore> store;
  sqlite3* db = nullptr;
  sqlite3_stmt* insert = nullptr;

  Fixture() {
    const QString path = dir.filePath(QStringLiteral("Tessal.sqlite"));
    store = std::move(WTStore::open(path).value());
    // A second connection writes what the application never would: any value in any column.
    check(sqlite3_open(QFile::encodeName(path).constData(), &db) == SQLITE_OK);
    sqlite3_exec(db, "PRAGMA synchronous = OFF", nullptr, nullptr, nullptr);
    QByteArray sql = "INSERT INTO records VALUES (?1";
    for (int column = 2; column <= kColumns; ++column) sql += ", ?" + QByteArray::number(column);
    check(sqlite3_prepare_v2(db, sql + ")", -1, &insert, nullptr) == SQLITE_OK);
  }
};

std::vector<WTStoreRecord> load(WTStore& store, bool* refused) {
  std::vector<WTStoreRecord> records;
  const Result<void> loaded =
      store.loadAll([&](WTStoreRecord&& record) { records.push_back(std::move(record)); });
  *refused = !loaded.ok();
  if (*refused) check(loaded.error().code == WTStore::ReadFailed);
  return records;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static Fixture fixture;
  FuzzedDataProvider input(data, size);
  check(sqlite3_exec(fixture.db, "DELETE FROM records", nullptr, nullptr, nullptr) == SQLITE_OK);
  const int rows = input.ConsumeIntegralInRange(1, 4);
  for (int row = 0; row < rows; ++row) {
    // The identity is text, as every writer of the file makes it: a record is written back under its
    // identity, so one that reads as some other text (a blob, broken UTF-8) could not be found again.
    const QByteArray uuid = QString::fromStdString(input.ConsumeRandomLengthString(40)).toUtf8();
    sqlite3_bind_text(fixture.insert, 1, uuid.constData(), int(uuid.size()), SQLITE_TRANSIENT);
    for (int column = 1; column < kColumns; ++column) bindColumn(fixture.insert, column, input);
    sqlite3_step(fixture.insert);  // a row the table's constraints refuse is left out
    sqlite3_reset(fixture.insert);
    sqlite3_clear_bindings(fixture.insert);
  }

  bool refused = false;
  std::vector<WTStoreRecord> records = load(*fixture.store, &refused);
  if (refused) return 0;
  // The application never writes a record without identity; it would be refused.
  for (const WTStoreRecord& record : records)
    if (record.uuid.isEmpty()) return 0;
  check(fixture.store->save(records, {}).ok());
  std::vector<WTStoreRecord> again = load(*fixture.store, &refused);
  check(!refused && again.size() == records.size());
  auto byUuid = [](const WTStoreRecord& a, const WTStoreRecord& b) { return a.uuid < b.uuid; };
  std::sort(records.begin(), records.end(), byUuid);
  std::sort(again.begin(), again.end(), byUuid);
  check(again == records);
  // Money keeps its places too (12.30 is not written back as 12.3).
  auto samePlaces = [](const std::optional<Decimal>& a, const std::optional<Decimal>& b) {
    return a.has_value() == b.has_value() && (!a || a->isIdenticalTo(*b));
  };
  for (size_t i = 0; i < records.size(); ++i) {
    check(samePlaces(again[i].rate, records[i].rate) && samePlaces(again[i].budget, records[i].budget) &&
          samePlaces(again[i].expense, records[i].expense));
  }
  return 0;
}
