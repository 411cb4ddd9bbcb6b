#include "ModelFixture.h"

#include <QColor>
#include <QCoreApplication>
#include <QSignalSpy>

class WTObjectContextTest : public ModelTest {};

// Forced, only an identity naming a concrete entity makes a record; fetches take an entity's descendants.
TEST_F(WTObjectContextTest, IdentitiesAndFetchesByEntityName) {
  WTTask* task = makeTask();
  auto* time = makeItem<WTTime>(task, berlin(2026, 1, 1, 9));
  makeItem<WTNote>(task, berlin(2026, 1, 1));
  EXPECT_TRUE(time->uuid().endsWith("@WTTime") && task->uuid().endsWith("@WTTask"));
  EXPECT_EQ(
      std::tuple(WTTime::objectWithUUID(time->uuid(), context.get()), context->objectWithUUID(time->uuid()),
                 WTTask::objectWithUUID(time->uuid(), context.get())),
      std::tuple(time, static_cast<WTObject*>(time), nullptr));
  const qsizetype before = context->count();
  for (const QVariant& refused :
       {QVariant(42), QVariant(), QVariant("ABC@WTNothing"), QVariant("ABC@WTItem")})
    EXPECT_EQ(context->objectWithUUID(refused, true), nullptr) << refused.toString().toStdString();
  EXPECT_EQ(context->objectWithUUID(QStringLiteral("ABC@WTFlat"), false), nullptr);
  EXPECT_EQ(context->count(), before);
  WTObject* made = context->objectWithUUID(QStringLiteral("X-1@Y@WTFlat"), true);
  ASSERT_NE(made, nullptr);
  EXPECT_TRUE(made->entity() == WTEntity::Flat && made->uuid() == "X-1@Y@WTFlat" &&
              context->objectWithUUID(QStringLiteral("X-1@Y@WTFlat"), true) == made);

  auto* b = WTProject::insertNewObject(context.get());
  auto* a = WTProject::insertNewObject(context.get());
  a->setName("alpha");
  b->setName("Beta");
  EXPECT_FALSE(context->fetchObjectsForEntityName("WTInvoice").has_value());
  EXPECT_EQ(context->fetchObjectsForEntityName("WTItem")->size(), 3);
  EXPECT_EQ(context->fetchObjectsForEntityName("WTObject")->size(), 6);
  EXPECT_EQ(*context->fetchObjectsForEntityName("WTProject", {{"name", false, true}}),
            (QList<WTObject*>{b, a}));
  EXPECT_EQ(*context->fetchObjectsForEntityName("WTProject", {},
                                                [](const WTObject* o) { return o->name() == "alpha"; }),
            QList<WTObject*>{a});
  EXPECT_EQ(WTProject::fetchByPredicate({}, context.get()).size(), 2);
}

// Every stored value of every record as text: decimals with their places, dates to the millisecond,
// colours with their alpha, relationships by identity.
QMap<QString, QString> storedValues(WTObjectContext& context) {
  QMap<QString, QString> values;
  const auto objects = context.fetchObjectsForEntityName("WTObject");
  for (WTObject* object : objects.value()) {
    for (const QString& key : object->storedKeys()) {
      const QVariant value = object->valueForKey(key);
      QString text = value.toString();
      if (const auto* related = static_cast<WTObject*>(KeyPath::objectFromVariant(value))) {
        text = related->uuid();
      } else if (value.metaType() == QMetaType::fromType<Date>()) {
        text = QString::number(value.value<Date>().secondsSince1970(), 'f', 3);
      } else if (value.typeId() == QMetaType::QColor) {
        text = value.value<QColor>().name(QColor::HexArgb);
      }
      values.insert(object->uuid() + '.' + key, value.isNull() ? QStringLiteral("none") : text);
    }
  }
  return values;
}

TEST_F(WTObjectContextTest, EveryValueSurvivesTheStoreFile) {
  auto* client = makeClient("Client Ü");
  client->setAddressBookUID("ab:1");
  client->setTotalsUID("tot");
  client->setRate(dec("120.00"));
  client->setColor(QColor(10, 20, 30, 40));
  client->setArchived(true);
  client->setCurrency("KWD");
  client->setAddress("1 Main St\nSpringfield");
  client->setRoundingMinutes(15);
  client->setRoundingMode("up");
  auto* project = makeProject({}, client);
  project->setBudget(dec("2500.00"));
  project->setRoundingMinutes(6);
  WTTask* first = makeTask(project, "first");
  WTTask* second = makeTask(project, "second");
  makeTask(project, "third");
  project->moveTask(project->tasks()[2], 0);
  second->setBudget(dec("1000.50"));
  second->setRoundingMode("down");
  second->setNotes("notes\nwith lines");
  const Date start = Date::fromSeconds(1767000000.25);
  makeTime(first, start, start.addingSeconds(3600));
  makeItem<WTFlat>(first, start)->setMinutes(45);
  makeItem<WTExpense>(second, start)->setExpense(dec("12.30"));
  makeItem<WTToDo>(project->tasks()[0], start)->setCompleted(true);
  project->tasks()[0]->toggleTimer();
  const QMap<QString, QString> before = storedValues(*context);
  EXPECT_EQ(before.value(client->uuid() + ".rate"), "120.00");
  EXPECT_EQ(before.value(client->uuid() + ".color"), "#280a141e");
  EXPECT_EQ(before.value(project->uuid() + ".budget") + before.value(second->uuid() + ".roundingMode"),
            "2500.00down");
  EXPECT_GE(before.size(), 9 * 6);  // nine records, each with at least the six keys every record keeps

  saveAndReopen();
  EXPECT_EQ(storedValues(*context), before);
  const QList<WTTask*> tasks = context->fetch<WTProject>()[0]->tasks();
  ASSERT_EQ(tasks.size(), 3);
  EXPECT_EQ(tasks[0]->name() + tasks[1]->name() + tasks[2]->name(), "thirdfirstsecond");
  EXPECT_TRUE(tasks[0]->running());
  EXPECT_EQ(tasks[2]->roundingRule(), (WTRoundingRule{6, WTRoundingRule::Mode::Down}));
  EXPECT_EQ(tasks[2]->billingCurrency(), "KWD");
  EXPECT_FALSE(context->hasChanges());
}

// Undo takes back one event-loop turn at a time, each step under the name of what made it.
TEST_F(WTObjectContextTest, UndoStepsAreTurnsAndKeepTheirNames) {
  WTUndoManager& undo = context->undoManager();
  QSignalSpy changed(context.get(), &WTObjectContext::undoStateChanged);
  WTTask* task = makeTask(nullptr, "before");
  context->processPendingChanges();
  EXPECT_EQ(undo.undoActionName(), "");  // nobody named it
  task->toggleTimer();
  context->processPendingChanges();
  EXPECT_EQ(undo.undoActionName(), "Start Timer");
  task->setName("after");
  task->setRate(dec("90"));
  undo.setActionName("Typing");
  undo.setActionName("Rename");       // the last name of the turn wins
  QCoreApplication::processEvents();  // the turn ends
  // A name given in a turn that changed nothing names nothing.
  undo.setActionName("Nothing");
  { const WTUndoManager::NamedStep unchanged(undo, "Unchanged"); }
  context->processPendingChanges();
  EXPECT_EQ(undo.undoActionName(), "Rename");
  {
    const WTUndoManager::NamedStep step(undo, "Typing");
    task->setBudget(dec("5"));
  }
  EXPECT_EQ(undo.undoActionName(), "Typing");  // the open step already answers to its name
  context->processPendingChanges();

  // The task's name, budget and own rate, and the names of the next undo and redo.
  const auto state = [&] {
    return QStringList{task->name(), task->budget() ? task->budget()->toString() : "-",
                       task->storedRate() ? task->storedRate()->toString() : "-", undo.undoActionName(),
                       undo.redoActionName()};
  };
  changed.clear();
  undo.undo();
  EXPECT_EQ(state(), QStringList({"after", "-", "90", "Rename", "Typing"}));
  undo.undo();
  EXPECT_EQ(state(), QStringList({"before", "-", "-", "Start Timer", "Rename"}));
  undo.redo();
  EXPECT_EQ(state(), QStringList({"after", "-", "90", "Rename", "Typing"}));
  EXPECT_EQ(changed.count(), 3);
  task->setNotes("n");
  EXPECT_TRUE(!undo.canRedo() && state().last().isEmpty() && changed.count() == 4);

  while (undo.canUndo()) undo.undo();
  EXPECT_TRUE(context->count() == 0 && !context->hasChanges());
}

TEST_F(WTObjectContextTest, UndoingADeleteBringsBackTheRecordsAndTheirTotals) {
  auto* project = WTProject::insertNewObject(context.get());
  auto* client = WTClient::insertNewObject(context.get());
  WTTask* task = makeTask(project);
  task->setRate(dec("60"));
  const Date start = berlin(2026, 6, 1, 9);
  makeTime(task, start, start.addingSeconds(1800));
  makeTime(task, start, start.addingSeconds(600));
  ASSERT_TRUE(context->save().ok());
  client->setName(QStringLiteral("Renamed"));  // not saved before the delete: its undo must keep it
  context->processPendingChanges();

  context->deleteObject(task);
  context->deleteObject(client);
  context->processPendingChanges();
  EXPECT_TRUE(project->duration() == 0 && context->fetch<WTTime>().isEmpty());
  context->undoManager().undo();
  EXPECT_EQ(std::tuple(project->tasks(), project->duration(), project->cost(),
                       context->objectWithUUID(task->uuid())),
            std::tuple(QList<WTTask*>{task}, 40, dec("40"), static_cast<WTObject*>(task)));
  journal.calls.clear();  // the undone delete must not reach the file or the journal
  saveAndReopen();
  EXPECT_EQ(context->fetch<WTTime>().size(), 2);
  EXPECT_EQ(context->fetch<WTClient>().value(0)->name(), "Renamed");
  EXPECT_FALSE(journal.calls.contains("delete"));
}

// Lists follow the store through these announcements: a record changed in two turns is announced twice.
TEST_F(WTObjectContextTest, EachTurnAnnouncesWhatChangedInItOnce) {
  QSignalSpy spy(context.get(), &WTObjectContext::objectsDidChange);
  WTTask* task = makeTask();
  // Renames (unless null), ends the turn: announcements so far, the last one's inserted (0) or changed (1)
  const auto turn = [&](const char* name, int which) {
    if (name) task->setName(name);
    QCoreApplication::processEvents();
    return std::pair{int(spy.count()),
                     spy.isEmpty() ? QList<WTObject*>() : spy.last()[which].value<QList<WTObject*>>()};
  };
  const QList<WTObject*> justTask{task};
  EXPECT_EQ(turn("a", 0), std::pair(1, justTask));
  EXPECT_EQ(turn(nullptr, 0).first, 1);
  EXPECT_EQ(turn("inserted, then changed in a later turn", 1), std::pair(2, justTask));
  ASSERT_TRUE(context->save());
  EXPECT_EQ(turn("changed after a save", 1), std::pair(3, justTask));
  EXPECT_EQ(turn("and changed again", 1), std::pair(4, justTask));
  EXPECT_TRUE(context->hasChanges());
}

TEST_F(WTObjectContextTest, SettingByKeyRefusesWrongKinds) {
  WTTask* task = makeTask();
  auto* expense = makeItem<WTExpense>(task, berlin(2026, 1, 1));
  EXPECT_EQ(QList<bool>({expense->setValue("expense", QStringLiteral("7.10")),
                         expense->setValue("expense", QStringLiteral("seven")), expense->setValue("cost", 3),
                         expense->setValue("task", QStringLiteral("not a record"))}),
            QList<bool>({true, false, false, false}));
  EXPECT_TRUE(expense->expense()->isIdenticalTo(dec("7.10")) && expense->task() == task);
  EXPECT_TRUE(expense->setValue("task", QVariant()));
  EXPECT_TRUE(expense->task() == nullptr && task->items().isEmpty());
  // A currency is three letters, taken in capitals; a rounding mode one of three words.
  auto* client = WTClient::insertNewObject(context.get());
  EXPECT_EQ(
      QList<bool>({client->setValue("currency", "kwd"), client->setValue("currency", "EURO"),
                   client->setValue("currency", 978), task->setValue("roundingMode", "up"),
                   task->setValue("roundingMode", "sideways"), task->setValue("roundingMinutes", "six")}),
      QList<bool>({true, false, false, true, false, false}));
  EXPECT_EQ(client->currency() + ' ' + task->roundingMode(), "KWD up");
  EXPECT_TRUE(client->setValue("currency", QString()) && client->currency().isNull());
}

// An item deleted before any lookup still leaves the file; an identity deleted and made again is kept.
TEST_F(WTObjectContextTest, DeletionsAndIdentitiesMadeAgain) {
  WTTask* task = makeTask();
  const QString noteId = makeItem<WTNote>(task, berlin(2026, 1, 1))->uuid();
  const QString keptId = makeItem<WTNote>(task, berlin(2026, 1, 2))->uuid();
  const QString projectId = WTProject::insertNewObject(context.get())->uuid();
  saveAndReopen();
  const QList<WTItem*> items = context->fetch<WTTask>().value(0)->items();
  ASSERT_EQ(items.size(), 2);
  context->deleteObject(items[items[0]->uuid() == noteId ? 0 : 1]);
  WTObject* project = context->objectWithUUID(projectId);
  context->deleteObject(project);
  WTObject* again = context->objectWithUUID(projectId, true);
  ASSERT_NE(again, nullptr);
  EXPECT_NE(again, project);
  again->setName("second life");
  saveAndReopen();
  EXPECT_EQ(context->objectWithUUID(noteId), nullptr);
  EXPECT_NE(context->objectWithUUID(keptId), nullptr);
  ASSERT_NE(WTProject::objectWithUUID(projectId, context.get()), nullptr);
  EXPECT_EQ(WTProject::objectWithUUID(projectId, context.get())->name(), "second life");

  // A record that lost its identity is refused loudly, before anything is written or journaled.
  auto* flat = WTFlat::insertNewObject(context.get());
  const QString flatId = flat->uuid();
  flat->setUuid(QString());
  journal.calls.clear();
  const Result<void> refused = context->save();
  EXPECT_TRUE(!refused.ok() && refused.error().message.contains("WTFlat") && journal.calls.isEmpty() &&
              context->hasChanges());
  flat->setUuid(flatId);
  saveAndReopen();
  EXPECT_NE(context->objectWithUUID(flatId), nullptr);
}
