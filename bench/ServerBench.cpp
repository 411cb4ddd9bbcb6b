#include "ChangeSet.h"
#include "SyncStore.h"

#include <QTemporaryDir>

#include <benchmark/benchmark.h>

using namespace tessal::server;

namespace {

std::string entry(int n) {
  return "E" + std::to_string(n) + "@WTTime";
}

// A save that deletes 5,000 entries of an account of 20,000: a device dropping its doubles of a file
// another device imported first. Each deletion looks up its own record, never every reference of the
// account (that made such a save take 45 s).
void BM_SaveDeleting5000Of20000Entries(benchmark::State& state) {
  for (auto _ : state) {
    state.PauseTiming();
    QTemporaryDir dir;
    std::string error;
    const std::unique_ptr<SyncStore> store =
        SyncStore::open(dir.filePath(QStringLiteral("sync.sqlite")).toStdString(), error);
    SyncStore::Account account;
    if (!store || store->createAccount("me@example.org", "hash") != SyncStore::Status::Ok ||
        store->findAccount("me@example.org", account) != SyncStore::Status::Ok) {
      state.SkipWithError(error.c_str());
      return;
    }
    ChangeSet made;
    made.inserted.push_back({"T@WTTask", "WTTask", {{"name", "\"Design\"", {}}}});
    for (int n = 0; n < 20000; ++n)
      made.inserted.push_back({entry(n), "WTTime", {{"task", "\"T@WTTask\"", "T@WTTask"}, {"name", "\"work\"", {}}}});
    const SyncStore::Save first = store->save(account.id, 0, "A", made);
    ChangeSet doubles;
    for (int n = 0; n < 5000; ++n) doubles.deleted.push_back(entry(n * 4));
    state.ResumeTiming();

    const SyncStore::Save second = store->save(account.id, first.iteration, "B", doubles);

    state.PauseTiming();
    if (second.status != SyncStore::Status::Ok || second.refused) state.SkipWithError("the save was refused");
    state.ResumeTiming();
  }
}
BENCHMARK(BM_SaveDeleting5000Of20000Entries)->Unit(benchmark::kMillisecond)->Iterations(3)->UseRealTime();

}  // namespace
