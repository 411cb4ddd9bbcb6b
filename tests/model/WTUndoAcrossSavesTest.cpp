// Undo and redo after the autosave already wrote the change: the store file and the change journal
// must follow exactly as they follow the user's own delete and insert, across restarts, for every entity.
#include "ModelFixture.h"

#include <algorithm>

namespace {

class WTUndoAcrossSavesTest : public ModelTest, public ::testing::WithParamInterface<WTEntity> {
 protected:
  // A record of the entity under test, owned where it has an owner, in its own undo group.
  WTObject* makeRecord() {
    WTObject* owner = nullptr;
    switch (WTEntities::isItem(GetParam()) ? WTEntity::Time : GetParam()) {
      case WTEntity::Project:
      case WTEntity::Client:
        break;
      case WTEntity::Task:
        owner = WTProject::insertNewObject(context.get());
        break;
      default:
        owner = makeTask(WTProject::insertNewObject(context.get()));
        break;
    }
    endTurn();
    WTObject* record = context->insertNewObject(GetParam());
    record->setName(QStringLiteral("the record"));
    if (owner) record->setValue(ownerKey(), KeyPath::variantFromObject(owner));
    endTurn();
    return record;
  }
  void endTurn() { context->processPendingChanges(); }
  // The to-one relationship to the owner, for entities that have one.
  QString ownerKey() const {
    return GetParam() == WTEntity::Task ? QStringLiteral("project") : QStringLiteral("task");
  }
  bool hasOwner() const { return GetParam() != WTEntity::Client && GetParam() != WTEntity::Project; }
  QString ownerUuidOf(WTObject* record) const {
    if (!hasOwner()) return {};
    auto* owner = static_cast<WTObject*>(KeyPath::objectFromVariant(record->valueForKey(ownerKey())));
    return owner ? owner->uuid() : QString();
  }
  void save() {
    const Result<void> saved = context->save();
    ASSERT_TRUE(saved.ok()) << saved.error().message.toStdString();
  }
  // Whether the store file holds the identity, read back by a fresh context.
  bool stored(const QString& uuid) {
    openContext();
    return context->objectWithUUID(uuid) != nullptr;
  }
  std::vector<QString> journaled(const QString& uuid) {
    std::vector<QString> kinds;
    for (const auto& call : journal.callsFor(uuid)) kinds.push_back(call.kind);
    journal.calls.clear();
    return kinds;
  }
  bool anythingJournaledWithoutIdentity() const {
    return std::any_of(journal.calls.begin(), journal.calls.end(),
                       [](const auto& c) { return c.uuid.isEmpty(); });
  }
};

TEST_P(WTUndoAcrossSavesTest, AnUndoneSavedInsertionLeavesTheStoreAndIsJournaledAsADeletion) {
  WTObject* record = makeRecord();
  const QString uuid = record->uuid();
  save();
  journal.calls.clear();

  context->undoManager().undo();
  endTurn();
  EXPECT_EQ(record->uuid(), uuid);  // identity is never undone
  save();
  EXPECT_EQ(journaled(uuid), std::vector<QString>{"delete"});
  EXPECT_FALSE(anythingJournaledWithoutIdentity());
  EXPECT_FALSE(stored(uuid));
}

TEST_P(WTUndoAcrossSavesTest, ARedoneInsertionComesBackUnderItsIdentity) {
  WTObject* record = makeRecord();
  const QString uuid = record->uuid();
  save();
  context->undoManager().undo();
  endTurn();
  save();
  journal.calls.clear();

  context->undoManager().redo();
  endTurn();
  save();
  EXPECT_EQ(journaled(uuid), std::vector<QString>{"insert"});
  ASSERT_TRUE(stored(uuid));
  WTObject* back = context->objectWithUUID(uuid);
  EXPECT_EQ(back->name(), "the record");
  EXPECT_EQ(!ownerUuidOf(back).isEmpty(), hasOwner());
}

TEST_P(WTUndoAcrossSavesTest, DeleteSaveUndoSaveRestoresTheRecordInStoreAndJournal) {
  WTObject* record = makeRecord();
  const QString uuid = record->uuid();
  const QString ownerUuid = ownerUuidOf(record);
  save();
  context->deleteObject(record);
  endTurn();
  save();
  journal.calls.clear();

  context->undoManager().undo();
  endTurn();
  save();
  EXPECT_EQ(journaled(uuid), std::vector<QString>{"insert"});
  ASSERT_TRUE(stored(uuid));
  WTObject* back = context->objectWithUUID(uuid);
  EXPECT_EQ(ownerUuidOf(back), ownerUuid);
}

TEST_P(WTUndoAcrossSavesTest, AnUndoneSavedRenameWritesTheOldName) {
  WTObject* record = makeRecord();
  const QString uuid = record->uuid();
  save();
  record->setName(QStringLiteral("renamed"));
  endTurn();
  save();
  journal.calls.clear();

  context->undoManager().undo();
  endTurn();
  save();
  const auto calls = journal.callsFor(uuid);
  ASSERT_EQ(calls.size(), 1u);
  EXPECT_EQ(calls[0].kind, "update");
  EXPECT_EQ(calls[0].values.value("name").toString(), "the record");
  ASSERT_TRUE(stored(uuid));
  EXPECT_EQ(context->objectWithUUID(uuid)->name(), "the record");
}

INSTANTIATE_TEST_SUITE_P(EveryEntity, WTUndoAcrossSavesTest,
                         ::testing::ValuesIn(std::vector<WTEntity>(std::begin(WTEntities::kAll),
                                                                   std::end(WTEntities::kAll))),
                         [](const ::testing::TestParamInfo<WTEntity>& info) {
                           return WTEntities::name(info.param).toStdString();
                         });

// Undoing a whole project with its tasks and items, after the save that wrote them, removes all of them
// from the file and tells the journal about each; redo brings all back.
TEST_F(ModelTest, UndoingASavedProjectWithItsContentsReachesTheStoreForEachRecord) {
  auto* project = WTProject::insertNewObject(context.get());
  WTTask* task = makeTask(project);
  WTTime* time = makeTime(task, berlin(2026, 11, 24, 9), berlin(2026, 11, 24, 10));
  const QStringList uuids{project->uuid(), task->uuid(), time->uuid()};
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  journal.calls.clear();

  context->undoManager().undo();
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  for (const QString& uuid : uuids) {
    const auto calls = journal.callsFor(uuid);
    ASSERT_EQ(calls.size(), 1u) << uuid.toStdString();
    EXPECT_EQ(calls[0].kind, "delete");
  }
  journal.calls.clear();
  context->undoManager().redo();
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  for (const QString& uuid : uuids) {
    const auto calls = journal.callsFor(uuid);
    ASSERT_EQ(calls.size(), 1u) << uuid.toStdString();
    EXPECT_EQ(calls[0].kind, "insert");
  }
  openContext();
  for (const QString& uuid : uuids) EXPECT_NE(context->objectWithUUID(uuid), nullptr) << uuid.toStdString();
}

}  // namespace
