// Undo and redo after the autosave wrote the change reach other devices through the real server.
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

// One record of every entity, each its own undo step, under a project and task made before them.
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

// Redo after its undo reached the server brings records back everywhere; undo+redo between polls changes
// nothing there; an undo that reaches the server removes them there for good.
TEST_F(RZSyncUndoAcrossSavesWithServer, AnotherDeviceFollowsUndoAfterTheSave) {
  QStringList made = makeOneOfEach(*a->context);
  a->save();
  syncBoth(*a, *a);
  undoOrRedo(int(made.size()), true);
  syncBoth(*a, *b);
  ASSERT_EQ(b->context->count(), 2);  // only the project and task the records are filed under
  undoOrRedo(int(made.size()), false);
  syncBoth(*a, *b);
  expectSameStores();
  ASSERT_EQ(b->context->count(), 2 + made.size());
  made.clear();  // back under new identities, since the server keeps deletions for good
  const QList<WTObject*> records = *a->context->fetchObjectsForEntityName("WTObject");
  for (WTObject* record : records)
    if (record->name().startsWith("one ")) made.append(record->uuid());

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

// The server keeps deletions for good; a task whose deletion reached it, brought back by undo, must still
// reach every device with its entries and with time tracked on it afterwards.
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
