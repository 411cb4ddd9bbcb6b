// Kills a process that is saving at random moments and checks that the file still holds every save the
// process had seen complete, and each save whole or not at all.
#include "WTStore.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <QFile>
#include <QHash>
#include <QTemporaryDir>

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <random>
#include <thread>

namespace {

constexpr int kRounds = 50;
constexpr int kRecordsPerSave = 10;
const QString kCounter = QStringLiteral("counter@WTTask");

QString itemUuid(int save, int index) {
  return QStringLiteral("s%1-%2@WTNote").arg(save).arg(index);
}

// Save k adds its items, deletes the extra item of save k - 1, adds its own extra item and sets the counter
// to k: one transaction, so either all of it shows or none.
std::vector<WTStoreRecord> recordsOfSave(int save) {
  std::vector<WTStoreRecord> records;
  for (int i = 0; i <= kRecordsPerSave; ++i) {
    WTStoreRecord record;
    record.uuid = i < kRecordsPerSave ? itemUuid(save, i) : QStringLiteral("extra-%1@WTNote").arg(save);
    record.entity = QStringLiteral("WTNote");
    record.name = QStringLiteral("Save %1, item %2. ").arg(save).arg(i).repeated(3);
    record.taskUuid = kCounter;
    records.push_back(record);
  }
  WTStoreRecord counter;
  counter.uuid = kCounter;
  counter.entity = QStringLiteral("WTTask");
  counter.position = save;
  records.push_back(counter);
  return records;
}

// The child: saves from `first` on until killed, reporting each completed save's number on `pipe`.
[[noreturn]] void saveUntilKilled(const QString& path, int first, int pipe) {
  auto store = WTStore::open(path);
  if (!store) _exit(2);
  for (int save = first;; ++save) {
    const QStringList deleted = {QStringLiteral("extra-%1@WTNote").arg(save - 1)};
    if (!store.value()->save(recordsOfSave(save), deleted)) _exit(3);
    if (write(pipe, &save, sizeof save) != sizeof save) _exit(4);
  }
}

QString integrityCheck(const QString& path) {
  sqlite3* db = nullptr;
  sqlite3_open_v2(QFile::encodeName(path).constData(), &db, SQLITE_OPEN_READONLY, nullptr);
  sqlite3_stmt* statement = nullptr;
  QString verdict = QStringLiteral("(no answer)");
  if (sqlite3_prepare_v2(db, "PRAGMA integrity_check", -1, &statement, nullptr) == SQLITE_OK &&
      sqlite3_step(statement) == SQLITE_ROW) {
    verdict = QString::fromUtf8(reinterpret_cast<const char*>(sqlite3_column_text(statement, 0)));
  }
  sqlite3_finalize(statement);
  sqlite3_close(db);
  return verdict;
}

TEST(WTStoreCrashTest, AKilledSaverLosesNoSaveItReported) {
  QTemporaryDir dir;
  const QString path = dir.filePath(QStringLiteral("Tessal.sqlite"));
  {
    // Save 0: the counter and the first extra item, no items.
    auto store = WTStore::open(path);
    ASSERT_TRUE(store.ok());
    std::vector<WTStoreRecord> initial = recordsOfSave(0);
    initial.erase(initial.begin(), initial.begin() + kRecordsPerSave);
    ASSERT_TRUE(store.value()->save(initial, {}).ok());
  }

  const unsigned seed = std::random_device()();
  SCOPED_TRACE(testing::Message() << "seed " << seed);
  std::mt19937 random(seed);
  std::uniform_int_distribution<int> delayMs(2, 50);

  int committed = 0;  // the last save found in the file
  int killedMidSave = 0;
  for (int round = 0; round < kRounds; ++round) {
    SCOPED_TRACE(testing::Message() << "round " << round);
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      close(fds[0]);
      saveUntilKilled(path, committed + 1, fds[1]);
    }
    close(fds[1]);
    std::this_thread::sleep_for(std::chrono::milliseconds(delayMs(random)));
    kill(child, SIGKILL);
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFSIGNALED(status)) << "the saver stopped by itself with status " << WEXITSTATUS(status);
    int reported = committed, save = 0;
    while (read(fds[0], &save, sizeof save) == sizeof save) reported = save;
    close(fds[0]);

    auto store = WTStore::open(path);
    ASSERT_TRUE(store.ok()) << store.error().message.toStdString();
    QHash<QString, WTStoreRecord> records;
    ASSERT_TRUE(
        store.value()->loadAll([&](WTStoreRecord&& r) { records.insert(r.uuid, std::move(r)); }).ok());
    store.value().reset();
    ASSERT_EQ(integrityCheck(path), QStringLiteral("ok"));

    ASSERT_TRUE(records.contains(kCounter));
    const int last = records.value(kCounter).position;
    // Every reported save is there; at most the one in flight got in without being reported.
    ASSERT_GE(last, reported);
    ASSERT_LE(last, reported + 1);
    if (last > reported) ++killedMidSave;
    // Each save whole: all items of every save up to the counter, none beyond, one extra item.
    ASSERT_EQ(records.size(), qsizetype(last) * kRecordsPerSave + 2);
    for (int k = 1; k <= last; ++k) {
      for (int i = 0; i < kRecordsPerSave; ++i)
        ASSERT_TRUE(records.contains(itemUuid(k, i))) << k << "/" << i;
    }
    ASSERT_TRUE(records.contains(QStringLiteral("extra-%1@WTNote").arg(last)));
    committed = last;
  }
  EXPECT_GT(committed, kRounds);  // the saver got through many saves, not just its open
  RecordProperty("saves", committed);
  RecordProperty("killedBetweenCommitAndReport", killedMidSave);
}

}  // namespace
