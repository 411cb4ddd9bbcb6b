#include "AppFixture.h"
#include "WTAppDelegate.h"
#include "WTHelpDialogs.h"
#include "WTMainWindowController.h"

#include <gtest/gtest.h>

#include <QAction>
#include <QDialog>
#include <QLabel>
#include <QMenu>
#include <QMenuBar>
#include <QTableView>
#include <QTest>

namespace {

class WTHelpMenuTest : public WindowTest {
 protected:
  void SetUp() override {
    WindowTest::SetUp();
    open();
  }
  static bool lists(const QList<WTHelpDialogs::Shortcut>& all, const QString& menu, const QString& command,
                    const QString& keys) {
    return std::any_of(all.begin(), all.end(), [&](const WTHelpDialogs::Shortcut& shortcut) {
      return shortcut.menu == menu && shortcut.action == command && shortcut.keys == keys;
    });
  }
};

TEST_F(WTHelpMenuTest, AboutNamesTheLicence) {
  QAction* about = action("about");
  ASSERT_NE(about, nullptr);
  about->trigger();
  auto* dialog = window->findChild<QDialog*>("aboutDialog");
  ASSERT_NE(dialog, nullptr);
  EXPECT_TRUE(dialog->isVisible());
  const QString text = dialog->findChild<QLabel*>("aboutText")->text();
  EXPECT_TRUE(text.contains("GNU General Public License")) << text.toStdString();
  dialog->close();
}

TEST_F(WTHelpMenuTest, TheShortcutsListIsReadFromTheMenusActions) {
  const QString undoKeys = QKeySequence(QKeySequence::Undo).toString(QKeySequence::NativeText);
  ASSERT_FALSE(undoKeys.isEmpty());
  QList<WTHelpDialogs::Shortcut> all = WTHelpDialogs::shortcutsOf(window->menuBar());
  EXPECT_TRUE(lists(all, "Edit", "Undo", undoKeys));
  EXPECT_TRUE(lists(all, "File", "Add", "Ctrl+N"));
  EXPECT_TRUE(lists(all, "Record", "Start/Stop Timer", "Ctrl+T"));
  EXPECT_TRUE(lists(all, "View", "Clients", "Ctrl+2"));
  for (const auto& shortcut : all) EXPECT_FALSE(shortcut.keys.isEmpty()) << shortcut.action.toStdString();

  // A key changed on an action is what the list shows next time.
  action("toggleTimer")->setShortcut(QKeySequence(Qt::CTRL | Qt::SHIFT | Qt::Key_Y));
  all = WTHelpDialogs::shortcutsOf(window->menuBar());
  EXPECT_FALSE(lists(all, "Record", "Start/Stop Timer", "Ctrl+T"));
  EXPECT_TRUE(lists(all, "Record", "Start/Stop Timer", "Ctrl+Shift+Y"));

  action("keyboardShortcuts")->trigger();
  auto* dialog = window->findChild<QDialog*>("shortcutsDialog");
  ASSERT_NE(dialog, nullptr);
  EXPECT_TRUE(dialog->isVisible());
  auto* table = dialog->findChild<QTableView*>("shortcutsTable");
  ASSERT_NE(table, nullptr);
  EXPECT_EQ(table->model()->rowCount(), all.size());
  dialog->close();
}

}  // namespace
