// Kills a process that saves random edits, with -9 at a random moment, over and over, and checks after
// each kill what the next start finds: the store opens, PRAGMA integrity_check says ok, every save that
// returned before the kill is there (and nothing but whole saves), and the sync journal holds what the
// store holds. The saver saves as the commands do (the records and their journal rows in one
// transaction) and tells the loop through a pipe what each save will leave and when it returned.
//
//   tessal_kill_loop [--kills N] [--seed S] [--dir FOLDER] [--max-delay-ms MS]
//
// Prints the figures; exits 1 when any restart found a fault.
#include "RZSyncTrack.h"
#include "WTClient.h"
#include "WTNote.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"

#include <QCryptographicHash>
#include <QElapsedTimer>
#include <QFile>
#include <QStringList>
#include <QTemporaryDir>

#include <sqlite3.h>

#include <array>
#include <cstdio>
#include <cstring>
#include <map>
#include <optional>
#include <random>
#include <thread>

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

const QString kCounterName = QStringLiteral("kill-loop counter");

// What the saver says: save `number` will leave the records with `digest` (phase 0), and it returned,
// journal written (phase 1). Small enough for one atomic write to the pipe.
struct Message {
  int number = 0;
  int phase = 0;
  std::array<char, 20> digest{};
};

QList<WTObject*> everything(const WTObjectContext& context) {
  return context.fetchObjectsForEntityName(QStringLiteral("WTObject")).value_or(QList<WTObject*>());
}

std::array<char, 20> digestOf(const WTObjectContext& context) {
  QStringList lines;
  for (const WTObject* object : everything(context))
    lines.append(object->uuid() + u'\t' + object->name() + u'\t' + object->notes());
  lines.sort();
  const QByteArray hash = QCryptographicHash::hash(lines.join(u'\n').toUtf8(), QCryptographicHash::Sha1);
  std::array<char, 20> digest{};
  std::memcpy(digest.data(), hash.constData(), digest.size());
  return digest;
}

WTClient* counterOf(const WTObjectContext& context) {
  for (WTClient* client : context.fetch<WTClient>())
    if (client->name() == kCounterName) return client;
  return nullptr;
}

// One save's edits: a few notes filed under the tasks, renamed or deleted, so that the store stays a
// few hundred records large while every save changes it.
void edit(WTObjectContext& context, std::mt19937& random, int number) {
  auto roll = [&](int n) { return std::uniform_int_distribution<int>(0, n - 1)(random); };
  QList<WTTask*> tasks = context.fetch<WTTask>();
  if (tasks.isEmpty()) {
    auto* project = context.insertNewObject<WTProject>();
    project->setName(QStringLiteral("Project"));
    for (int i = 0; i < 3; ++i) {
      auto* task = context.insertNewObject<WTTask>();
      task->setName(QStringLiteral("Task %1").arg(i));
      task->setProject(project);
      tasks.append(task);
    }
  }
  for (int edits = 1 + roll(6); edits > 0; --edits) {
    QList<WTNote*> notes = context.fetch<WTNote>();
    const int action = roll(10);
    if (action < 5 || notes.size() < 20) {
      auto* note = context.insertNewObject<WTNote>();
      note->setName(QStringLiteral("note of save %1 ").arg(number).repeated(1 + roll(8)));
      note->setTask(tasks[roll(int(tasks.size()))]);
    } else if (action < 8 || notes.size() < 200) {
      notes[roll(int(notes.size()))]->setNotes(QStringLiteral("changed by save %1").arg(number));
    } else {
      context.deleteObject(notes[roll(int(notes.size()))]);
    }
  }
  WTClient* counter = counterOf(context);
  if (!counter) {
    counter = context.insertNewObject<WTClient>();
    counter->setName(kCounterName);
  }
  counter->setNotes(QString::number(number));
}

[[noreturn]] void saveUntilKilled(const QString& storePath, unsigned seed, int fd) {
  auto store = RZSyncTrack::openStore(storePath, nullptr, WTStore::Check::Header);
  if (!store) _exit(2);
  WTObjectContext context(nullptr);
  if (!context.attachStore(std::move(store.value()))) _exit(3);
  context.undoManager().disableRegistration();
  // As a command saves: the journal's rows of each save go into the save's own transaction.
  RZSyncTrack journal(context.store(), RZSyncTrack::Loading::OnDemand);
  context.setChangeJournal(&journal);
  const WTClient* counter = counterOf(context);
  for (int number = counter ? counter->notes().toInt() + 1 : 1;; ++number) {
    std::mt19937 random(seed * 7919u + unsigned(number));
    edit(context, random, number);
    Message message{number, 0, digestOf(context)};
    if (write(fd, &message, sizeof message) != sizeof message) _exit(4);
    if (!context.save()) _exit(5);
    message.phase = 1;
    if (write(fd, &message, sizeof message) != sizeof message) _exit(4);
  }
}

QString integrity(const QString& path) {
  sqlite3* db = nullptr;
  QString verdict = QStringLiteral("(not opened)");
  if (sqlite3_open_v2(QFile::encodeName(path).constData(), &db, SQLITE_OPEN_READWRITE, nullptr) ==
      SQLITE_OK) {
    sqlite3_stmt* statement = nullptr;
    if (sqlite3_prepare_v2(db, "PRAGMA integrity_check", -1, &statement, nullptr) == SQLITE_OK &&
        sqlite3_step(statement) == SQLITE_ROW)
      verdict = QString::fromUtf8(reinterpret_cast<const char*>(sqlite3_column_text(statement, 0)));
    sqlite3_finalize(statement);
  }
  sqlite3_close(db);
  return verdict;
}

// What in the journal disagrees with the store; empty when nothing. Every live record is journaled as
// inserted with its values as they are; every other record the journal knows is deleted.
QString journalDifference(const WTObjectContext& context, const RZSyncTrack& journal) {
  QSet<QString> live;
  for (const WTObject* object : everything(context)) {
    live.insert(object->uuid());
    if (journal.isPendingDeletion(object->uuid()))
      return object->uuid() + QStringLiteral(" is journaled as deleted");
    const QVariantMap entry = journal.entry(RZSyncTrack::Section::Inserted, object->uuid());
    if (entry.isEmpty()) return object->uuid() + QStringLiteral(" is not in the journal");
    const QVariantMap values = object->setValues();
    for (auto it = values.begin(); it != values.end(); ++it) {
      const std::optional<QVariant> value = RZSyncTrack::transformedValue(it.value());
      if (value && entry.value(it.key()) != *value)
        return object->uuid() + QStringLiteral(" has another %1 in the journal").arg(it.key());
    }
  }
  for (const QString& uuid : journal.entries(RZSyncTrack::Section::Inserted).keys())
    if (!live.contains(uuid) && !journal.isPendingDeletion(uuid))
      return uuid + QStringLiteral(" is in the journal but not in the store");
  return {};
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 5 && QByteArray(argv[1]) == "--saver") {
    const QString dir = QFile::decodeName(argv[4]);
    saveUntilKilled(dir + QStringLiteral("/Tessal.sqlite"), unsigned(strtoul(argv[3], nullptr, 10)),
                    atoi(argv[2]));
  }
  int kills = 1000, maxDelayMs = 250;
  unsigned seed = std::random_device()();
  QString folder;
  for (int i = 1; i + 1 < argc; i += 2) {
    const QByteArray option = argv[i];
    if (option == "--kills")
      kills = atoi(argv[i + 1]);
    else if (option == "--seed")
      seed = unsigned(strtoul(argv[i + 1], nullptr, 10));
    else if (option == "--dir")
      folder = QString::fromLocal8Bit(argv[i + 1]);
    else if (option == "--max-delay-ms")
      maxDelayMs = atoi(argv[i + 1]);
    else
      return std::fprintf(stderr, "unknown option %s\n", argv[i]), 2;
  }
  QTemporaryDir temporary;
  if (folder.isEmpty()) folder = temporary.path();
  const QString storePath = folder + QStringLiteral("/Tessal.sqlite");
  for (const char* suffix : {"", "-wal", "-shm"}) QFile::remove(storePath + QLatin1String(suffix));
  std::printf("seed %u, %d kills, in %s\n", seed, kills, qPrintable(folder));
  std::mt19937 random(seed);
  std::map<QString, int> faults;
  int made = 0, returned = 0, lastCommitted = 0, inFlightKept = 0, killedWhileOpening = 0;
  std::map<int, std::array<char, 20>> intended{{0, {}}};
  QElapsedTimer clock;
  clock.start();
  for (int kill = 0; kill < kills; ++kill, ++made) {
    int fds[2];
    if (pipe(fds) != 0) return std::perror("pipe"), 1;
    const pid_t child = fork();
    if (child < 0) return std::perror("fork"), 1;
    if (child == 0) {
      // A process of its own, as every start of Tessal is: a forked copy would share this one's
      // generator of identities, and every saver would make the same ones.
      close(fds[0]);
      const QByteArray fd = QByteArray::number(fds[1]), childSeed = QByteArray::number(seed + unsigned(kill));
      const QByteArray dir = QFile::encodeName(folder);
      execl("/proc/self/exe", argv[0], "--saver", fd.constData(), childSeed.constData(), dir.constData(),
            static_cast<char*>(nullptr));
      _exit(6);
    }
    close(fds[1]);
    std::this_thread::sleep_for(
        std::chrono::microseconds(std::uniform_int_distribution<int>(1000, maxDelayMs * 1000)(random)));
    ::kill(child, SIGKILL);
    int status = 0;
    waitpid(child, &status, 0);
    int lastReturned = lastCommitted, messages = 0;
    Message message;
    while (read(fds[0], &message, sizeof message) == sizeof message) {
      ++messages;
      if (message.phase == 0)
        intended[message.number] = message.digest;
      else
        lastReturned = message.number, ++returned;
    }
    close(fds[0]);
    if (!WIFSIGNALED(status)) {
      ++faults[QStringLiteral("the saver stopped by itself with status %1").arg(WEXITSTATUS(status))];
      break;
    }
    if (messages == 0) ++killedWhileOpening;

    auto fault = [&](const QString& what) {
      ++faults[what];
      std::printf("kill %d: %s\n", kill, qPrintable(what));
    };
    if (const QString verdict = integrity(storePath);
        verdict != QLatin1String("ok") && QFile::exists(storePath)) {
      fault(QStringLiteral("integrity_check: ") + verdict);
      break;
    }
    auto store = WTStore::open(storePath);
    if (!store) {
      if (QFile::exists(storePath)) fault(QStringLiteral("does not open: ") + store.error().message);
      continue;
    }
    WTObjectContext context(nullptr);
    if (!context.attachStore(std::move(store.value()))) {
      fault(QStringLiteral("does not load"));
      break;
    }
    const WTClient* counter = counterOf(context);
    const int found = counter ? counter->notes().toInt() : 0;
    if (found < lastReturned) {
      fault(QStringLiteral("a returned save is lost"));
      break;
    }
    if (found > lastReturned + 1 || !intended.count(found) ||
        (found > 0 && digestOf(context) != intended[found])) {
      fault(QStringLiteral("the store holds no whole save"));
      std::printf("  (at save %d; the last that returned: %d)\n", found, lastReturned);
      break;
    }
    inFlightKept += found == lastReturned + 1;
    lastCommitted = found;
    const RZSyncTrack journal(context.store(), RZSyncTrack::Loading::Whole);
    if (const QString difference = journalDifference(context, journal); !difference.isEmpty()) {
      fault(QStringLiteral("the journal does not match the store"));
      std::printf("  (%s)\n", qPrintable(difference));
      break;
    }
  }
  int failures = 0;
  for (const auto& [what, count] : faults) failures += count;
  std::printf(
      "%d kills in %.1f s: %d saves returned, the store at save %d at the end; in %d kills a save "
      "was in the store without having returned, %d kills came before the first save\n",
      made, double(clock.elapsed()) / 1000, returned, lastCommitted, inFlightKept, killedWhileOpening);
  std::printf("failures: %d\n", failures);
  for (const auto& [what, count] : faults) std::printf("  %d × %s\n", count, qPrintable(what));
  return failures == 0 ? 0 : 1;
}
