#pragma once

#include "Date.h"
#include "RZDate.h"
#include "UserDefaults.h"
#include "WTExpense.h"
#include "WTFlat.h"
#include "WTItemsViewController.h"
#include "WTNote.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"
#include "WTTime.h"
#include "WTToDo.h"
#include "WTViewController.h"

#include <gtest/gtest.h>

#include <QAbstractItemModelTester>
#include <QDateTime>
#include <QMainWindow>
#include <QTemporaryDir>
#include <QTest>
#include <QTimeZone>

#include <memory>

// A window that hosts one navigation stack, as the main window does. Asked about a deletion, it
// records the question and its detail and answers `deletes`.
class TestHostWindow : public QMainWindow, public WTNavigationHost {
 public:
  WTNavigationController* stack = nullptr;
  int clientsShown = 0;
  QStringList questions;
  bool deletes = true;
  WTNavigationController* currentNavigationController() const override { return stack; }
  void showProjects() override {}
  void showClients() override { ++clientsShown; }
  bool confirmDeletion(const QString& question, const QString& detail) override {
    questions << (detail.isEmpty() ? question : question + u' ' + detail);
    return deletes;
  }
};

// A project's items outline shown in a host window, as the main window shows it, with its first
// screen displayed. The window gives the view back before either goes.
struct ShownOutline {
  ShownOutline(WTObjectContext* context, WTProject* project, QSize size = QSize(900, 600))
      : controller(context) {
    controller.setProject(project);
    window.setCentralWidget(controller.view());
    window.resize(size);
    window.show();
    EXPECT_TRUE(QTest::qWaitForWindowExposed(&window));
    controller.willDisplayView();
  }
  ~ShownOutline() { window.takeCentralWidget(); }
  WTItemsViewController controller;
  TestHostWindow window;
};

// A context without a store (records live in memory), its own settings file, a fixed zone and a
// clock that tests move by hand.
class UiTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(dir.isValid());
    previousZone = QString::fromUtf8(QTimeZone::systemTimeZoneId());
    ASSERT_TRUE(RZDate::setDefaultTimeZone(QStringLiteral("Europe/Berlin")));
    defaults = std::make_unique<UserDefaults>(dir.filePath(QStringLiteral("settings.conf")));
    context = std::make_unique<WTObjectContext>(defaults.get());
    WTObjectContext::setDefaultContext(context.get());
    now = at(2024, 3, 14, 10, 0);
    Date::setClockForTesting([this] { return now; });
  }
  void TearDown() override {
    Date::setClockForTesting({});
    WTObjectContext::setDefaultContext(nullptr);
    context.reset();
    RZDate::setDefaultTimeZone(previousZone);
  }

  static Date at(int year, int month, int day, int hour = 12, int minute = 0) {
    RZDate::DateComponents components;
    components.year = year;
    components.month = month;
    components.day = day;
    components.hour = hour;
    components.minute = minute;
    components.second = 0;
    return RZDate::dateFromComponents(components);
  }

  WTProject* makeProject(const QString& name) {
    auto* project = WTProject::insertNewObject(context.get());
    project->setName(name);
    return project;
  }
  WTTask* makeTask(WTProject* project, const QString& name) {
    auto* task = WTTask::insertNewObject(context.get());
    task->setName(name);
    task->setProject(project);
    return task;
  }
  template <class T>
  T* makeItem(WTTask* task, const QString& name, Date date) {
    auto* item = T::insertNewObject(context.get());
    item->setName(name);
    item->setTask(task);
    item->setStartDate(date);
    if constexpr (std::is_same_v<T, WTTime>) item->setEndDate(date.addingSeconds(30 * 60));
    return item;
  }
  // Ends the event-loop turn, as the application does after every event.
  void endTurn() {
    context->processPendingChanges();
    QCoreApplication::processEvents();
  }

  QTemporaryDir dir;
  QString previousZone;
  std::unique_ptr<UserDefaults> defaults;
  std::unique_ptr<WTObjectContext> context;
  Date now;
};
