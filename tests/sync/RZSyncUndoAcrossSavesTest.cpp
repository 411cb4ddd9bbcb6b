// Undo and redo after the autosave already wrote the change reach the other devices through the real
// server, exactly as the user's own delete and insert do.
#include "RZSyncCommand.h"

#include "SyncTestSupport.h"
#include "WTItem.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"

#include <gtest/gtest.h>

#include <memory>

using synctest::SyncClient;

namespace {

// One record of every entity, each made in its own turn (so each is one undo step), items and tasks
// under owners made before them. Gives the records' identities in the order they were made.
QStringList makeOneOfEach(WTObjectContext& context) {
  auto* project = context.insertNewObject<WTProject>();
  auto* task = context.insertNewObject<WTTask>();
  task->setProject(project);
  context.processPendingChanges();
  QStringList made;
  for (WTEntity entity : WTEntities::kAll) {
    WTObject* record = context.insertNewObject(entity);
    record->setName(QStringLiteral("one ") + WTEntities::name(entity));
    if (entity == WTEntity::Task) static_cast<WTTask*>(record)->setProject(project);
    if (WTEntities::isItem(entity)) static_cast<WTItem*>(record)->setTask(task);
    context.processPendingChanges();
    made.append(record->uuid());
  }
  return made;
}

}  // namespace

class RZSyncUndoAcrossSavesWithServer : public synctest::TwoDevicesTest {
 protected:
  // Undoes or redoes `steps` steps on A and saves.
  void undoOrRedo(int steps, bool undo) {
    for (int i = 0; i < steps; ++i) {
      undo ? a->context->undoManager().undo() : a->context->undoManager().redo();
      a->context->processPendingChanges();
    }
    a->save();
  }
  // A, then B, run the sync command until each is in step with the server.
  static void syncBoth(SyncClient& first, SyncClient& second) {
    for (SyncClient* client : {&first, &second}) {
      QString out, err;
      QTextStream outStream(&out), errStream(&err);
      ASSERT_EQ(runSyncCommand(*client->manager, {QStringLiteral("--timeout"), QStringLiteral("30")},
                               outStream, errStream),
                0)
          << err.toStdString();
    }
  }
};

// With the real server: undo and redo saved between two polls leave the other device as it was; an undo
// that reaches the server takes the records from the other device too, for good, across restarts.
TEST_F(RZSyncUndoAcrossSavesWithServer, AnotherDeviceFollowsUndoAfterTheSave) {
  const QStringList made = makeOneOfEach(*a->context);
  a->save();
  syncBoth(*a, *b);
  for (const QString& uuid : made) ASSERT_NE(b->context->objectWithUUID(uuid), nullptr) << uuid.toStdString();

  undoOrRedo(int(made.size()), true);
  undoOrRedo(int(made.size()), false);
  syncBoth(*a, *b);
  for (const QString& uuid : made) {
    WTObject* there = b->context->objectWithUUID(uuid);
    ASSERT_NE(there, nullptr) << uuid.toStdString();
    EXPECT_EQ(there->name(), "one " + uuid.section(u'@', -1));
  }
  expectSameStores();

  undoOrRedo(int(made.size()), true);
  syncBoth(*a, *b);
  a->reopen();
  b->reopen();
  for (const QString& uuid : made) {
    EXPECT_EQ(a->context->objectWithUUID(uuid), nullptr) << uuid.toStdString();
    EXPECT_EQ(b->context->objectWithUUID(uuid), nullptr) << uuid.toStdString();
  }
  expectSameStores();
  EXPECT_EQ(b->context->count(), 2);  // the project and task the records were filed under
}

// The server keeps a deletion for good and drops whatever later names the deleted identity. A task whose
// deletion reached it and that the user then brings back with undo must still reach every device, with
// its entries and with the time tracked on it afterwards, which the server would otherwise delete with
// the task it is filed under, here as well.
TEST_F(RZSyncUndoAcrossSavesWithServer, UndoingADeletionTheServerHeldBringsTheRecordsBackEverywhere) {
  auto* project = a->context->insertNewObject<WTProject>();
  project->setName(QStringLiteral("Atlas"));
  auto* task = a->context->insertNewObject<WTTask>();
  task->setName(QStringLiteral("Design"));
  task->setProject(project);
  auto* before = a->context->insertNewObject<WTTime>();
  before->setName(QStringLiteral("before"));
  before->setTask(task);
  a->context->processPendingChanges();
  a->save();
  syncBoth(*a, *b);
  ASSERT_EQ(b->context->count(), 3);

  a->context->deleteObject(task);
  a->context->processPendingChanges();
  a->save();
  syncBoth(*a, *b);
  ASSERT_EQ(b->context->count(), 1) << "the deletion reached the other device";

  undoOrRedo(1, true);
  auto* after = a->context->insertNewObject<WTTime>();
  after->setName(QStringLiteral("after"));
  after->setTask(task);
  a->context->processPendingChanges();
  a->save();
  syncBoth(*a, *b);
  a->reopen();
  b->reopen();
  for (SyncClient* device : {a.get(), b.get()}) {
    const QList<WTTask*> tasks = device->context->fetch<WTTask>();
    ASSERT_EQ(tasks.size(), 1) << (device == a.get() ? "here" : "there");
    EXPECT_EQ(tasks.first()->name(), "Design");
    ASSERT_NE(tasks.first()->project(), nullptr);
    EXPECT_EQ(tasks.first()->project()->name(), "Atlas");
    QStringList entries;
    for (const WTItem* item : tasks.first()->items()) entries.append(item->name());
    entries.sort();
    EXPECT_EQ(entries, QStringList({"after", "before"})) << (device == a.get() ? "here" : "there");
  }
  expectSameStores();
}

// Redo of an insertion whose undo reached the server is the same case the other way round.
TEST_F(RZSyncUndoAcrossSavesWithServer,
       RedoingAnInsertionAfterItsUndoReachedTheServerBringsItBackEverywhere) {
  auto* project = a->context->insertNewObject<WTProject>();
  project->setName(QStringLiteral("Atlas"));
  a->context->processPendingChanges();
  a->save();
  syncBoth(*a, *a);
  undoOrRedo(1, true);
  syncBoth(*a, *b);
  ASSERT_EQ(b->context->count(), 0);
  undoOrRedo(1, false);
  syncBoth(*a, *b);
  const QList<WTProject*> there = b->context->fetch<WTProject>();
  ASSERT_EQ(there.size(), 1);
  EXPECT_EQ(there.first()->name(), "Atlas");
  EXPECT_EQ(there.first()->uuid(), project->uuid());
  EXPECT_EQ(a->context->count(), 1);
}
