#include "AppFixture.h"
#include "WTHelpDialogs.h"

#include <QDialog>
#include <QLabel>
#include <QMenuBar>
#include <QTableView>

namespace {

class WTHelpMenuTest : public WindowTest {
 protected:
  void SetUp() override {
    WindowTest::SetUp();
    open();
  }
  // Each shortcut the list shows, as "Menu/Command/Keys".
  QStringList listed() const {
    QStringList all;
    for (const auto& shortcut : WTHelpDialogs::shortcutsOf(window->menuBar()))
      all << shortcut.menu + "/" + shortcut.action + "/" + shortcut.keys;
    return all;
  }
};

TEST_F(WTHelpMenuTest, AboutNamesTheLicence) {
  action("about")->trigger();
  auto* dialog = window->findChild<QDialog*>("aboutDialog");
  ASSERT_TRUE(dialog && dialog->isVisible());
  const QString text = dialog->findChild<QLabel*>("aboutText")->text();
  EXPECT_TRUE(text.contains("GNU General Public License")) << text.toStdString();
  dialog->close();
}

TEST_F(WTHelpMenuTest, TheShortcutsListIsReadFromTheMenusActions) {
  const QString undoKeys = QKeySequence(QKeySequence::Undo).toString(QKeySequence::NativeText);
  ASSERT_FALSE(undoKeys.isEmpty());
  QStringList all = listed();
  for (const QString& shortcut : {"Edit/Undo/" + undoKeys, QString("File/Add/Ctrl+N"),
                                  QString("Record/Start/Stop Timer/Ctrl+T"), QString("View/Clients/Ctrl+2")})
    EXPECT_TRUE(all.contains(shortcut)) << shortcut.toStdString();
  for (const QString& shortcut : all) EXPECT_FALSE(shortcut.endsWith('/')) << shortcut.toStdString();
  // A key changed on an action is what the list shows next time.
  action("toggleTimer")->setShortcut(QKeySequence(Qt::CTRL | Qt::SHIFT | Qt::Key_Y));
  all = listed();
  EXPECT_FALSE(all.contains("Record/Start/Stop Timer/Ctrl+T"));
  EXPECT_TRUE(all.contains("Record/Start/Stop Timer/Ctrl+Shift+Y"));
  action("keyboardShortcuts")->trigger();
  auto* dialog = window->findChild<QDialog*>("shortcutsDialog");
  ASSERT_TRUE(dialog && dialog->isVisible());
  auto* table = dialog->findChild<QTableView*>("shortcutsTable");
  ASSERT_NE(table, nullptr);
  EXPECT_EQ(table->model()->rowCount(), all.size());
  dialog->close();
}

}  // namespace
