#pragma once

// Application tests' own data folder and settings (defaults registered), and a recording presenter.
#include "UserDefaults.h"
#include "WTAlertPresenter.h"
#include "WTAppDelegate.h"
#include "WTApplication.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTMainWindowController.h"
#include "WTNavigationController.h"
#include "WTObjectContext.h"
#include "WTObjectListModel.h"
#include "WTOutlineView.h"
#include "WTProject.h"
#include "WTProjectsViewController.h"
#include "WTStore.h"
#include "WTTask.h"
#include "WTTime.h"

#include <gtest/gtest.h>

#include <QAction>
#include <QApplication>
#include <QDir>
#include <QFile>
#include <QLineEdit>
#include <QPointer>
#include <QTemporaryDir>
#include <QTest>

#include <memory>

class RecordingPresenter final : public WTAlertPresenter {
 public:
  bool presentError(const QString& message) override { return errors << message, false; }
  bool confirmQuitAnyway() override { return ++questions, quitAnyway; }
  bool confirmDeletion(const QString& question, const QString& detail) override {
    deletionQuestions << (detail.isEmpty() ? question : question + u' ' + detail);
    return deletes;
  }
  bool offerRestore(const QString& message, const QString& backup) override {
    return offers << message + u' ' + backup, restores;
  }
  QStringList errors, deletionQuestions, offers;
  int questions = 0;
  bool quitAnyway = false, deletes = true, restores = false;
};

// The names of the context's records of kind T, sorted.
template <class T>
QStringList namesIn(WTObjectContext& context) {
  QStringList names;
  for (const T* record : context.fetch<T>()) names << record->name();
  names.sort();
  return names;
}
// The same of a store file, as a later start of the application reads it.
template <class T>
QStringList storedNames(const QString& path) {
  WTObjectContext context;
  auto store = WTStore::openReadOnly(path);
  EXPECT_TRUE(store && context.attachStore(std::move(store.value())));
  return namesIn<T>(context);
}

class AppTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(home.isValid());
    qputenv("XDG_DATA_HOME", home.filePath("data").toUtf8());
    defaults = std::make_unique<UserDefaults>(home.filePath("settings.conf"));
    WTApplication::registerDefaults(*defaults);
  }
  void TearDown() override { qputenv("XDG_DATA_HOME", previousData); }
  std::unique_ptr<WTAppDelegate> makeDelegate() {
    return std::make_unique<WTAppDelegate>(defaults.get(), &presenter);
  }

  QTemporaryDir home;
  const QByteArray previousData = qgetenv("XDG_DATA_HOME");
  std::unique_ptr<UserDefaults> defaults;
  RecordingPresenter presenter;
};

// The main window over its own delegate, shown; opened again by open() after a reset.
class WindowTest : public AppTest {
 protected:
  void TearDown() override {
    window.reset();
    delegate.reset();
    AppTest::TearDown();
  }
  void open() {
    if (!delegate) delegate = makeDelegate();
    window = std::make_unique<WTMainWindowController>(*delegate);
    window->show();
    window->activateWindow();
    ASSERT_TRUE(QTest::qWaitForWindowExposed(window.get()));
  }
  QAction* action(const char* name) { return window->findChild<QAction*>(name); }
  // The project's outline, opened the way its row's button opens it.
  WTItemsViewController* openOutline(WTProject* project) {
    window->projectsViewController()->openProject(project);
    EXPECT_TRUE(QTest::qWaitFor(
        [&] { return window->projectsNavigationController()->viewControllers().size() == 2; }));
    return window->projectsViewController()->itemsViewController();
  }

  std::unique_ptr<WTAppDelegate> delegate;
  std::unique_ptr<WTMainWindowController> window;
};
