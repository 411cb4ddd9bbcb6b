// Two installations on one account, each with its own store and journal, talking to the real
// tessal-sync-server over loopback.
#include "Decimal.h"
#include "SyncTestSupport.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <gtest/gtest.h>

using synctest::SyncClient;

namespace {

Decimal dec(const char* text) {
  return *Decimal::fromString(QString::fromLatin1(text));
}

class RZSyncServerExchangeTest : public synctest::TwoDevicesTest {
 protected:
  // Saves and syncs `client` once: its edits go up and whatever others did comes down.
  static void sync(SyncClient& client) {
    client.save();
    ASSERT_TRUE(client.syncOnce());
    EXPECT_FALSE(client.manager->hasNetworkError());
    EXPECT_TRUE(client.presenter.syncErrors.isEmpty())
        << client.presenter.syncErrors.join('\n').toStdString();
  }
  // Both send, then both receive.
  void exchange() {
    sync(*a);
    sync(*b);
    sync(*a);
    EXPECT_FALSE(a->track().hasChanges());
    EXPECT_FALSE(b->track().hasChanges());
  }
};

}  // namespace

TEST_F(RZSyncServerExchangeTest, InsertsUpdatesTaskMovesAndDeletesReachTheOtherClient) {
  // A builds a little world.
  auto* acme = a->context->insertNewObject<WTClient>();
  acme->setName("Acme");
  auto* site = a->context->insertNewObject<WTProject>();
  site->setName("Site");
  site->setClient(acme);
  site->setRate(dec("80.50"));
  QList<WTTask*> tasks;
  for (const char* name : {"One", "Two", "Three"}) {
    auto* task = a->context->insertNewObject<WTTask>();
    task->setName(name);
    task->setProject(site);
    tasks.append(task);
  }
  auto* time = a->context->insertNewObject<WTTime>();
  time->setTask(tasks[0]);
  time->setStartDate(Date::fromSeconds(1700000000));
  time->setEndDate(Date::fromSeconds(1700005400));
  auto* expense = a->context->insertNewObject<WTExpense>();
  expense->setTask(tasks[0]);
  expense->setStartDate(Date::fromSeconds(1700000000));
  expense->setExpense(dec("12.30"));
  auto* todo = a->context->insertNewObject<WTToDo>();
  todo->setTask(tasks[1]);
  todo->setName("Call back");
  exchange();
  expectSameStores();
  auto* siteB = b->find<WTProject>(site->uuid());
  ASSERT_NE(siteB, nullptr);
  EXPECT_EQ(siteB->tasks().size(), 3);
  EXPECT_EQ(siteB->tasks()[2]->name(), "Three");
  EXPECT_EQ(b->find<WTTask>(tasks[0]->uuid())->duration(), 90);
  EXPECT_TRUE(b->find<WTExpense>(expense->uuid())->expense()->isIdenticalTo(dec("12.30")));

  // B edits, moves the last task to the top and deletes the second one with its to-do.
  b->find<WTTask>(tasks[0]->uuid())->setName("One, renamed");
  b->find<WTExpense>(expense->uuid())->setExpense(dec("7.05"));
  siteB->moveTask(b->find<WTTask>(tasks[2]->uuid()), 0);
  b->context->deleteObject(b->find<WTTask>(tasks[1]->uuid()));
  exchange();
  expectSameStores();
  EXPECT_EQ(site->tasks(), (QList<WTTask*>{tasks[2], tasks[0]}));
  EXPECT_EQ(tasks[0]->name(), "One, renamed");
  EXPECT_TRUE(expense->expense()->isIdenticalTo(dec("7.05")));
  EXPECT_EQ(a->context->objectWithUUID(todo->uuid(), false), nullptr);

  // A moves a task into a new project while B renames it: both changes stay.
  auto* other = a->context->insertNewObject<WTProject>();
  other->setName("Other");
  tasks[0]->setProject(other);
  b->find<WTTask>(tasks[0]->uuid())->setNotes("Noted on B");
  exchange();
  expectSameStores();
  auto* movedB = b->find<WTTask>(tasks[0]->uuid());
  EXPECT_EQ(movedB->project()->uuid(), other->uuid());
  EXPECT_EQ(movedB->notes(), "Noted on B");
  EXPECT_EQ(b->find<WTProject>(site->uuid())->tasks().size(), 1);
}

// The same key changed on both sides: whoever reaches the server first wins everywhere.
TEST_F(RZSyncServerExchangeTest, ConcurrentEditsOfOneKeyConverge) {
  auto* task = a->context->insertNewObject<WTTask>();
  task->setName("Start");
  exchange();
  task->setName("From A");
  b->find<WTTask>(task->uuid())->setName("From B");
  b->find<WTTask>(task->uuid())->setBudget(dec("100.00"));
  sync(*a);
  sync(*b);  // B's head brings A's name, which replaces B's pending one
  sync(*a);
  expectSameStores();
  EXPECT_EQ(task->name(), "From A");
  EXPECT_TRUE(task->budget()->isIdenticalTo(dec("100.00")));
}

// A deletes a project while B files a new item under one of its tasks: the delete wins everywhere and
// no fragment of the project comes back.
TEST_F(RZSyncServerExchangeTest, DeletedOwnerTakesWhatTheOtherClientFiledUnderIt) {
  auto* project = a->context->insertNewObject<WTProject>();
  auto* task = a->context->insertNewObject<WTTask>();
  task->setProject(project);
  exchange();
  const QString taskId = task->uuid();
  a->context->deleteObject(project);
  auto* late = b->context->insertNewObject<WTToDo>();
  late->setTask(b->find<WTTask>(taskId));
  late->setName("Filed late");
  const QString lateId = late->uuid();
  sync(*a);
  sync(*b);
  sync(*a);
  sync(*b);
  expectSameStores();
  EXPECT_EQ(b->context->objectWithUUID(taskId, false), nullptr);
  EXPECT_EQ(b->context->objectWithUUID(lateId, false), nullptr);
  EXPECT_EQ(a->context->count(), 0);
}

// B deletes a task while A, not knowing it, renames it: B's deletion is still pending when A's rename
// arrives, and neither brings the task back.
TEST_F(RZSyncServerExchangeTest, PendingDeleteWinsOverARemoteEdit) {
  auto* task = a->context->insertNewObject<WTTask>();
  auto* time = a->context->insertNewObject<WTTime>();
  time->setTask(task);
  exchange();
  const QString taskId = task->uuid();
  b->context->deleteObject(b->find<WTTask>(taskId));
  b->save();
  task->setName("Renamed on A");
  sync(*a);
  sync(*b);
  sync(*a);
  expectSameStores();
  EXPECT_EQ(a->context->objectWithUUID(taskId, false), nullptr);
  EXPECT_EQ(a->context->count(), 0);
}

// Clearing a value (an inherited rate, a project's client, a budget) reaches the other installation.
TEST_F(RZSyncServerExchangeTest, ClearedValuesReachTheOtherClient) {
  auto* acme = a->context->insertNewObject<WTClient>();
  auto* project = a->context->insertNewObject<WTProject>();
  project->setClient(acme);
  project->setRate(dec("90.00"));
  auto* task = a->context->insertNewObject<WTTask>();
  task->setProject(project);
  task->setBudget(dec("500.00"));
  exchange();
  ASSERT_TRUE(b->find<WTProject>(project->uuid())->storedRate().has_value());
  project->setRate(std::nullopt);
  project->setClient(nullptr);
  b->find<WTTask>(task->uuid())->setBudget(std::nullopt);
  exchange();
  expectSameStores();
  auto* projectB = b->find<WTProject>(project->uuid());
  EXPECT_FALSE(projectB->storedRate().has_value());
  EXPECT_EQ(projectB->client(), nullptr);
  EXPECT_FALSE(task->budget().has_value());
}
