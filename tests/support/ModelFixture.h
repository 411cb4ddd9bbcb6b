#pragma once

#include "Date.h"
#include "RZDate.h"
#include "UserDefaults.h"
#include "WTChangeJournal.h"
#include "WTClient.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTNote.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"

#include <gtest/gtest.h>

#include <QDateTime>
#include <QTemporaryDir>
#include <QTimeZone>

#include <algorithm>
#include <memory>
#include <vector>

// A journal that remembers the kind of every call ("insert", "update" or "delete"), in order. A record
// reported without identity could never be matched on another device: any test that makes the context do
// so fails.
class RecordingJournal final : public WTChangeJournal {
 public:
  void insertValues(const QVariantMap&, const QString& uuid) override { record("insert", uuid); }
  void updateValues(const QVariantMap&, const QString& uuid) override { record("update", uuid); }
  void deleteObjectWithId(const QString& uuid) override { record("delete", uuid); }
  void record(const char* kind, const QString& uuid) {
    if (uuid.isEmpty()) ADD_FAILURE() << "journaled " << kind << " of a record without identity";
    calls.append(QString::fromLatin1(kind));
  }
  QStringList calls;
};

// A context over a real store file in a temporary folder, with its own settings file and a fixed clock
// in a fixed zone.
class ModelTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(dir.isValid());
    ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin")));
    defaults = std::make_unique<UserDefaults>(dir.filePath(QStringLiteral("settings.conf")));
    openContext();
  }

  void TearDown() override {
    Date::setClockForTesting({});
    context.reset();
    RZDate::setDefaultTimeZone(QStringLiteral("UTC"));
  }

  void openContext() {
    context.reset();  // the old context goes before the new one opens the file
    context = std::make_unique<WTObjectContext>(defaults.get());
    WTObjectContext::setDefaultContext(context.get());
    auto store = WTStore::open(storePath());
    ASSERT_TRUE(store.ok()) << store.error().message.toStdString();
    ASSERT_TRUE(context->attachStore(std::move(store.value())).ok());
    context->setChangeJournal(&journal);
  }

  // Saves, then reads everything back into a fresh context from the file.
  void saveAndReopen() {
    const Result<void> saved = context->save();
    ASSERT_TRUE(saved.ok()) << saved.error().message.toStdString();
    openContext();
  }

  QString storePath() const { return dir.filePath(QStringLiteral("Tessal.sqlite")); }

  // An instant given as local wall-clock time in Europe/Berlin.
  static Date berlin(int year, int month, int day, int hour = 0, int minute = 0, int second = 0) {
    const QDateTime local(QDate(year, month, day), QTime(hour, minute, second), QTimeZone("Europe/Berlin"));
    return Date::fromSeconds(double(local.toSecsSinceEpoch()));
  }

  void setNow(Date now) {
    Date::setClockForTesting([this] { return clockNow; });
    clockNow = now;
  }

  WTTask* makeTask(WTProject* project = nullptr, const QString& name = QStringLiteral("Task")) {
    auto* task = WTTask::insertNewObject(context.get());
    task->setName(name);
    if (project) task->setProject(project);
    return task;
  }

  WTClient* makeClient(const QString& name) {
    auto* client = WTClient::insertNewObject(context.get());
    client->setName(name);
    return client;
  }

  WTProject* makeProject(const QString& name, WTClient* client = nullptr) {
    auto* project = WTProject::insertNewObject(context.get());
    project->setName(name);
    project->setClient(client);
    return project;
  }

  template <class T>
  T* makeItem(WTTask* task, Date start) {
    auto* item = T::insertNewObject(context.get());
    item->setTask(task);
    item->setStartDate(start);
    return item;
  }

  WTTime* makeTime(WTTask* task, Date start, Date end) {
    auto* time = makeItem<WTTime>(task, start);
    time->setEndDate(end);
    return time;
  }

  QTemporaryDir dir;
  std::unique_ptr<UserDefaults> defaults;
  std::unique_ptr<WTObjectContext> context;
  RecordingJournal journal;
  Date clockNow;
};

inline Decimal dec(const char* text) {
  return *Decimal::fromString(QString::fromLatin1(text));
}

// Counts announcements of one key of one record.
class KeyCounter {
 public:
  KeyCounter(WTObjectContext& context, const WTObject* object, const QString& key)
      : context_(context),
        id_(context.addObserver(object, key, [this](WTObject*, const QString&) { ++count; })) {}
  ~KeyCounter() { context_.removeObserver(id_); }
  int count = 0;

 private:
  WTObjectContext& context_;
  WTObjectContext::ObserverId id_;
};
