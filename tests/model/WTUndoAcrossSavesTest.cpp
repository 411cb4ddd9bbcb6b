// Undo and redo after the autosave already wrote the change: the store file and the change journal
// must follow exactly as they follow the user's own delete and insert, across restarts, for every entity.
#include "ModelFixture.h"

#include <algorithm>

namespace {

// Every row of the store file, read through a connection of its own while the context stays open.
QMap<QString, WTStoreRecord> rowsOf(const QString& path) {
  QMap<QString, WTStoreRecord> rows;
  auto store = WTStore::open(path);
  EXPECT_TRUE(store.ok()) << store.error().message.toStdString();
  if (!store.ok()) return rows;
  const Result<void> loaded =
      store.value()->loadAll([&](WTStoreRecord&& row) { rows.insert(row.uuid, row); });
  EXPECT_TRUE(loaded.ok()) << loaded.error().message.toStdString();
  return rows;
}

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
  // What the user's Ctrl+Z (Ctrl+Shift+Z) and the autosave after it do.
  void undoAndSave() {
    context->undoManager().undo();
    endTurn();
    save();
  }
  void redoAndSave() {
    context->undoManager().redo();
    endTurn();
    save();
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

// Undone after its save, an insertion is a deletion of its identity in file and journal; redone, an
// insertion under the same identity with its values.
TEST_P(WTUndoAcrossSavesTest, AnUndoneSavedInsertionIsADeletionAndItsRedoAnInsertion) {
  WTObject* record = makeRecord();
  const QString uuid = record->uuid();
  save();
  const WTStoreRecord saved = rowsOf(storePath()).value(uuid);
  ASSERT_EQ(saved.uuid, uuid);
  journal.calls.clear();

  context->undoManager().undo();
  endTurn();
  EXPECT_EQ(record->uuid(), uuid);  // identity is never undone
  save();
  EXPECT_EQ(journaled(uuid), std::vector<QString>{"delete"});
  EXPECT_FALSE(anythingJournaledWithoutIdentity());
  EXPECT_FALSE(rowsOf(storePath()).contains(uuid));
  EXPECT_FALSE(rowsOf(storePath()).contains(QString()));

  redoAndSave();
  const auto calls = journal.callsFor(uuid);
  ASSERT_EQ(calls.size(), 1u);
  EXPECT_EQ(calls[0].kind, "insert");
  EXPECT_EQ(calls[0].values.value("name").toString(), "the record");
  EXPECT_EQ(rowsOf(storePath()).value(uuid), saved);
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
  const WTStoreRecord saved = rowsOf(storePath()).value(uuid);
  journal.calls.clear();
  context->deleteObject(record);
  endTurn();
  save();
  EXPECT_EQ(journaled(uuid), std::vector<QString>{"delete"});
  EXPECT_FALSE(rowsOf(storePath()).contains(uuid));

  undoAndSave();
  EXPECT_EQ(journaled(uuid), std::vector<QString>{"insert"});
  EXPECT_EQ(rowsOf(storePath()).value(uuid), saved);
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

  undoAndSave();
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

void expectJournaledOnceEach(const RecordingJournal& journal, const QStringList& uuids, const QString& kind) {
  for (const QString& uuid : uuids) {
    const auto calls = journal.callsFor(uuid);
    ASSERT_EQ(calls.size(), 1u) << uuid.toStdString();
    EXPECT_EQ(calls[0].kind, kind);
  }
}

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
  expectJournaledOnceEach(journal, uuids, "delete");
  journal.calls.clear();
  context->undoManager().redo();
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  expectJournaledOnceEach(journal, uuids, "insert");
  openContext();
  for (const QString& uuid : uuids) EXPECT_NE(context->objectWithUUID(uuid), nullptr) << uuid.toStdString();
}

// Undoing the deletion of a saved project brings back every task and item that went with it, with their
// order and links, into the file and the journal; undoing a client's deletion gives its projects their
// client back. Both survive a restart.
TEST_F(ModelTest, UndoingASavedDeletionRestoresCascadedContentsAndLinks) {
  auto* client = WTClient::insertNewObject(context.get());
  auto* project = WTProject::insertNewObject(context.get());
  project->setClient(client);
  WTTask* first = makeTask(project, QStringLiteral("first"));
  WTTask* second = makeTask(project, QStringLiteral("second"));
  QStringList items;
  for (WTEntity entity : WTEntities::kAll) {
    if (!WTEntities::isItem(entity)) continue;
    WTObject* item = context->insertNewObject(entity);
    item->setName(WTEntities::name(entity));
    static_cast<WTItem*>(item)->setTask(first);
    items.append(item->uuid());
  }
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  const QMap<QString, WTStoreRecord> before = rowsOf(storePath());
  const QStringList cascaded = QStringList{project->uuid(), first->uuid(), second->uuid()} + items;
  const QString clientUuid = client->uuid(), projectUuid = project->uuid();
  journal.calls.clear();

  context->deleteObject(project);
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  for (const QString& uuid : cascaded) {
    EXPECT_FALSE(rowsOf(storePath()).contains(uuid)) << uuid.toStdString();
    ASSERT_EQ(journal.callsFor(uuid).size(), 1u) << uuid.toStdString();
    EXPECT_EQ(journal.callsFor(uuid)[0].kind, "delete");
  }
  journal.calls.clear();

  context->undoManager().undo();
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(rowsOf(storePath()), before);
  for (const QString& uuid : cascaded) {
    const auto calls = journal.callsFor(uuid);
    ASSERT_EQ(calls.size(), 1u) << uuid.toStdString();
    EXPECT_EQ(calls[0].kind, "insert");
  }
  EXPECT_EQ(KeyPath::objectFromVariant(journal.callsFor(projectUuid)[0].values.value("client")), client);
  EXPECT_EQ(KeyPath::objectFromVariant(journal.callsFor(first->uuid())[0].values.value("project")), project);
  journal.calls.clear();

  context->deleteObject(client);
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  EXPECT_TRUE(rowsOf(storePath()).value(projectUuid).clientUuid.isEmpty());
  context->undoManager().undo();
  context->processPendingChanges();
  ASSERT_TRUE(context->save().ok());
  EXPECT_EQ(rowsOf(storePath()), before);
  const auto projectCalls = journal.callsFor(projectUuid);
  ASSERT_FALSE(projectCalls.empty());
  EXPECT_EQ(projectCalls.back().kind, "update");
  EXPECT_EQ(KeyPath::objectFromVariant(projectCalls.back().values.value("client")), client);

  openContext();
  auto* back = WTProject::objectWithUUID(projectUuid, context.get());
  ASSERT_NE(back, nullptr);
  ASSERT_NE(back->client(), nullptr);
  EXPECT_EQ(back->client()->uuid(), clientUuid);
  ASSERT_EQ(back->tasks().size(), 2);
  EXPECT_EQ(back->tasks()[0]->name(), "first");
  EXPECT_EQ(back->tasks()[1]->name(), "second");
  QStringList itemsBack;
  for (WTItem* item : back->tasks()[0]->items()) itemsBack.append(item->uuid());
  std::sort(itemsBack.begin(), itemsBack.end());
  std::sort(items.begin(), items.end());
  EXPECT_EQ(itemsBack, items);
}

// A record that lost its identity is refused loudly by the save: nothing reaches the file or the
// journal, the change stays pending, and the save goes through once the record has an identity again.
TEST_F(ModelTest, ARecordWithoutIdentityIsNeverSavedOrJournaled) {
  auto* flat = WTFlat::insertNewObject(context.get());
  const QString uuid = flat->uuid();
  flat->setUuid(QString());
  context->processPendingChanges();
  const Result<void> refused = context->save();
  ASSERT_FALSE(refused.ok());
  EXPECT_TRUE(refused.error().message.contains("WTFlat")) << refused.error().message.toStdString();
  EXPECT_TRUE(journal.calls.empty());
  EXPECT_TRUE(rowsOf(storePath()).isEmpty());
  EXPECT_TRUE(context->hasChanges());

  flat->setUuid(uuid);
  ASSERT_TRUE(context->save().ok());
  EXPECT_TRUE(rowsOf(storePath()).contains(uuid));
}

// The store file itself takes no row without identity and no deletion of one, and stays usable.
TEST_F(ModelTest, TheStoreRefusesRowsWithoutIdentity) {
  auto store = WTStore::open(dir.filePath(QStringLiteral("other.sqlite")));
  ASSERT_TRUE(store.ok());
  WTStoreRecord nameless;
  nameless.entity = QStringLiteral("WTClient");
  WTStoreRecord named = nameless;
  named.uuid = QStringLiteral("A@WTClient");
  EXPECT_FALSE(store.value()->save({named, nameless}, {}).ok());
  EXPECT_FALSE(store.value()->save({named}, {QString()}).ok());
  EXPECT_TRUE(rowsOf(store.value()->path()).isEmpty());
  ASSERT_TRUE(store.value()->save({named}, {}).ok());
  EXPECT_EQ(rowsOf(store.value()->path()).keys(), QStringList{named.uuid});
}

}  // namespace
