// Undo and redo after the autosave: file and journal follow as they follow the user's own changes.
#include "ModelFixture.h"

#include <utility>

namespace {

// Every row of the store file, read through a connection of its own while the context stays open.
QMap<QString, WTStoreRecord> rowsOf(const QString& path) {
  QMap<QString, WTStoreRecord> rows;
  auto store = WTStore::open(path);
  EXPECT_TRUE(store.ok()) << store.error().message.toStdString();
  if (store.ok()) {
    EXPECT_TRUE(store.value()->loadAll([&](WTStoreRecord&& row) { rows.insert(row.uuid, row); }));
  }
  return rows;
}

class UndoAcrossSaves : public ModelTest {
 protected:
  // Ends the turn and autosaves, after the user's Ctrl+Z (-1), Ctrl+Shift+Z (1) or own change (0).
  void save(int undo = 0) {
    if (undo) undo < 0 ? context->undoManager().undo() : context->undoManager().redo();
    context->processPendingChanges();
    const Result<void> saved = context->save();
    ASSERT_TRUE(saved.ok()) << saved.error().message.toStdString();
  }
  // Each of `uuids`' journal calls since the last look ("+"-joined kinds, with names if `names`).
  QString journaled(const QStringList& uuids, bool names = true) {
    QStringList each;
    for (const QString& uuid : uuids) {
      QStringList kinds;
      for (const auto& call : journal.callsFor(uuid))
        kinds.append(call.kind +
                     (names && call.values.contains("name") ? " " + call.values["name"].toString() : ""));
      each.append(kinds.join('+'));
    }
    journal.calls.clear();
    return each.join(", ");
  }
};

// Each undone or redone step autosaves as the user's own change: a rename, the insertion of every kind of
// record (a deletion of its identity, redone under it), a project deleted with its tasks and items (a
// client's deletion only unlinks it) comes back whole.
TEST_F(UndoAcrossSaves, UndoingSavedChangesReachesTheStoreForEachRecordAndLink) {
  auto* client = makeClient(QStringLiteral("client"));
  auto* project = makeProject(QStringLiteral("project"), client);
  WTTask* first = makeTask(project, QStringLiteral("first"));
  makeTask(project, QStringLiteral("second"));
  QStringList items;
  for (WTEntity entity : WTEntities::kAll) {
    if (!WTEntities::isItem(entity)) continue;
    WTObject* item = context->insertNewObject(entity);
    static_cast<WTItem*>(item)->setTask(first);
    item->setName(QStringLiteral("item"));
    items.append(item->uuid());
  }
  const QStringList cascaded =
      QStringList{project->uuid(), first->uuid(), project->tasks()[1]->uuid()} + items;
  const QString clientUuid = client->uuid(), projectUuid = project->uuid();
  const auto once = [&](const QStringList& uuids, const QString& kind) {
    return QStringList(uuids.size(), kind).join(", ");
  };
  save();
  const QMap<QString, WTStoreRecord> before = rowsOf(storePath());
  first->setName(QStringLiteral("renamed"));
  save();
  journal.calls.clear();
  save(-1);
  EXPECT_EQ(journaled({first->uuid()}), "update first");
  EXPECT_EQ(rowsOf(storePath()), before);
  save(-1);
  EXPECT_EQ(journaled(cascaded + QStringList{clientUuid}),
            once(cascaded + QStringList{clientUuid}, "delete"));
  EXPECT_TRUE(rowsOf(storePath()).isEmpty());
  save(1);
  EXPECT_EQ(journaled(cascaded),
            "insert project, insert first, insert second, " + once(items, "insert item"));
  EXPECT_EQ(rowsOf(storePath()), before);

  context->deleteObject(project);
  context->processPendingChanges();
  EXPECT_TRUE(context->fetch<WTTask>().isEmpty());
  save();
  EXPECT_EQ(journaled(cascaded, false), once(cascaded, "delete"));
  EXPECT_EQ(rowsOf(storePath()).keys(), QStringList{clientUuid});
  save(-1);
  EXPECT_EQ(rowsOf(storePath()), before);
  EXPECT_EQ(KeyPath::objectFromVariant(journal.callsFor(projectUuid)[0].values.value("client")), client);
  EXPECT_EQ(KeyPath::objectFromVariant(journal.callsFor(first->uuid())[0].values.value("project")), project);
  EXPECT_EQ(journaled(cascaded, false), once(cascaded, "insert"));

  context->deleteObject(client);
  EXPECT_EQ(project->client(), nullptr);
  save();
  EXPECT_TRUE(rowsOf(storePath()).value(projectUuid).clientUuid.isEmpty());
  ASSERT_TRUE(rowsOf(storePath()).contains(projectUuid));
  save(-1);
  EXPECT_EQ(rowsOf(storePath()), before);
  const auto projectCalls = journal.callsFor(projectUuid);
  ASSERT_FALSE(projectCalls.empty());
  EXPECT_EQ(std::pair(projectCalls.back().kind,
                      KeyPath::objectFromVariant(projectCalls.back().values.value("client"))),
            std::pair(QString("update"), static_cast<KeyValueCoding*>(client)));

  openContext();
  auto* back = WTProject::objectWithUUID(projectUuid, context.get());
  ASSERT_TRUE(back && back->client() && back->tasks().size() == 2);
  EXPECT_EQ(back->client()->uuid() + back->tasks()[0]->name() + back->tasks()[1]->name(),
            clientUuid + "firstsecond");
  QSet<QString> itemsBack;
  for (WTItem* item : back->tasks()[0]->items()) itemsBack.insert(item->uuid());
  EXPECT_EQ(itemsBack, QSet<QString>(items.begin(), items.end()));
}

// A record that lost its identity is refused loudly; the save goes through once it has one again.
TEST_F(UndoAcrossSaves, ARecordWithoutIdentityIsNeverSavedOrJournaled) {
  auto* flat = WTFlat::insertNewObject(context.get());
  const QString uuid = flat->uuid();
  flat->setUuid(QString());
  context->processPendingChanges();
  const Result<void> refused = context->save();
  ASSERT_FALSE(refused.ok());
  EXPECT_TRUE(refused.error().message.contains("WTFlat")) << refused.error().message.toStdString();
  EXPECT_TRUE(journal.calls.empty() && rowsOf(storePath()).isEmpty() && context->hasChanges());
  flat->setUuid(uuid);
  ASSERT_TRUE(context->save().ok());
  EXPECT_TRUE(rowsOf(storePath()).contains(uuid));
}

}  // namespace
