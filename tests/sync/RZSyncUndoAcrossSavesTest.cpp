// Undo and redo after the autosave wrote the change reach other devices through the real server.
#include "RZSyncCommand.h"

#include "ServerTestSupport.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTItem.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <map>

using synctest::SyncClient;

// Two installations of one account on a real server.
class RZSyncUndoAcrossSavesWithServer : public ::testing::Test {
 protected:
  void expectSameStores() { EXPECT_EQ(synctest::snapshot(*a.context), synctest::snapshot(*b.context)); }
  const servertest::StorageLocation storage{servertest::Storage::SQLite};
  servertest::LocalServer server{storage.location(), "ann@example.org", "correct horse battery"};
  SyncClient a{server.address(), "ann@example.org", "correct horse battery"},
      b{server.address(), "ann@example.org", "correct horse battery"};

  // Undoes or redoes `steps` steps on A and saves; then A, and B, run the sync command until in step.
  void undoOrRedoThenSync(qsizetype steps, bool undo, bool sync = true) {
    for (qsizetype i = 0; i < steps; ++i) {
      undo ? a.context->undoManager().undo() : a.context->undoManager().redo();
      a.context->processPendingChanges();
    }
    a.save();
    for (SyncClient* client : {&a, &b}) {
      if (!sync) break;
      QString out, err;
      QTextStream outStream(&out), errStream(&err);
      ASSERT_EQ(runSyncCommand(*client->manager, {"--timeout", "30"}, outStream, errStream), 0)
          << err.toStdString();
    }
  }
  template <class T>
  T* make(const QString& name, WTTask* task = nullptr) {
    auto* record = a.context->insertNewObject<T>();
    record->setName(name);
    if constexpr (std::is_base_of_v<WTItem, T>) record->setTask(task);
    a.context->processPendingChanges();  // each its own undo step
    return record;
  }
  QStringList madeHere() const {
    QStringList made;
    const QList<WTObject*> records = *a.context->fetchObjectsForEntityName("WTObject");
    for (WTObject* record : records)
      if (record->name().startsWith("one ")) made.append(record->uuid());
    return made;
  }
};

// Undo, redo, and undoing a deletion the server kept for good all reach the other device, each record with
// every key it has.
TEST_F(RZSyncUndoAcrossSavesWithServer, AnotherDeviceFollowsUndoAfterTheSave) {
  auto* task = make<WTTask>("Design");
  task->setProject(make<WTProject>("Atlas"));
  a.context->processPendingChanges();
  // clang-format off
  const std::map<WTEntity, QVariantMap> billing = {
      {WTEntity::Client, {{"currency", "JPY"}, {"address", "1 Main St"}, {"roundingMinutes", 15}, {"roundingMode", "up"}}},
      {WTEntity::Project, {{"budget", "2500.50"}, {"roundingMode", "down"}}},
      {WTEntity::Task, {{"roundingMinutes", 6}}}};
  // clang-format on
  for (WTEntity entity : WTEntities::kAll) {
    WTObject* record = a.context->insertNewObject(entity);
    record->setName(QStringLiteral("one ") + WTEntities::name(entity));
    const QVariantMap values = billing.count(entity) ? billing.at(entity) : QVariantMap();
    for (const auto& [key, value] : values.asKeyValueRange())
      EXPECT_TRUE(record->setValue(key, value)) << key.toStdString();
    if (entity == WTEntity::Task) static_cast<WTTask*>(record)->setProject(task->project());
    if (WTEntities::isItem(entity)) static_cast<WTItem*>(record)->setTask(task);
    a.context->processPendingChanges();
  }
  const qsizetype count = madeHere().size();
  undoOrRedoThenSync(0, true);
  ASSERT_EQ(b.context->count(), 2 + count);
  expectSameStores();
  const QList<WTClient*> clients = b.context->fetch<WTClient>();
  ASSERT_EQ(clients.size(), 1);
  EXPECT_EQ(clients[0]->billingCurrency() + ' ' + clients[0]->address(), "JPY 1 Main St");
  undoOrRedoThenSync(count, true);
  ASSERT_EQ(b.context->count(), 2);  // only the project and task the records are filed under
  undoOrRedoThenSync(count, false);
  ASSERT_EQ(b.context->count(), 2 + count);
  expectSameStores();

  const QStringList made = madeHere();
  undoOrRedoThenSync(count, true, false);
  undoOrRedoThenSync(count, false);
  EXPECT_EQ(madeHere(), made);  // the same identities: nothing reached the server in between
  expectSameStores();
  undoOrRedoThenSync(count, true);
  a.reopen(), b.reopen();
  expectSameStores();
  ASSERT_EQ(b.context->count(), 2);

  task = a.context->fetch<WTTask>().value(0);
  make<WTTime>("before", task);
  undoOrRedoThenSync(0, true);
  a.context->deleteObject(task);
  a.context->processPendingChanges();
  undoOrRedoThenSync(0, true);
  ASSERT_EQ(b.context->count(), 1) << "the deletion reached the other device";
  a.context->undoManager().undo();
  make<WTTime>("after", task);
  undoOrRedoThenSync(0, true);
  a.reopen(), b.reopen();
  expectSameStores();
  const QList<WTTask*> tasks = b.context->fetch<WTTask>();
  ASSERT_TRUE(tasks.size() == 1 && tasks[0]->project());
  QStringList entries{tasks[0]->name(), tasks[0]->project()->name()};
  for (const WTItem* item : tasks[0]->items()) entries.append(item->name());
  std::sort(entries.begin() + 2, entries.end());
  EXPECT_EQ(entries, QStringList({"Design", "Atlas", "after", "before"}));
}
