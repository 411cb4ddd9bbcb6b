#include "AppFixture.h"
#include "WTHelpDialogs.h"

#include <QDialog>
#include <QLabel>
#include <QMenuBar>
#include <QTableView>

namespace {

// The shortcuts list is read from the menus' actions, so a changed key shows next time.
TEST_F(WindowTest, HelpMenuNamesTheLicenceAndListsTheMenusShortcuts) {
  open();
  action("about")->trigger();
  auto* about = window->findChild<QDialog*>("aboutDialog");
  ASSERT_TRUE(about && about->isVisible());
  EXPECT_TRUE(about->findChild<QLabel*>("aboutText")->text().contains("GNU General Public License"));
  about->close();
  auto listed = [&] {
    QStringList all;  // "Menu/Command/Keys"
    for (const auto& shortcut : WTHelpDialogs::shortcutsOf(window->menuBar()))
      all << shortcut.menu + "/" + shortcut.action + "/" + shortcut.keys;
    return all;
  };
  for (const QString& shortcut : {QString("Edit/Undo/Ctrl+Z"), QString("File/Add/Ctrl+N"),
                                  QString("Record/Start/Stop Timer/Ctrl+T"), QString("View/Clients/Ctrl+2")})
    EXPECT_TRUE(listed().contains(shortcut)) << shortcut.toStdString();
  for (const QString& shortcut : listed()) EXPECT_FALSE(shortcut.endsWith('/')) << shortcut.toStdString();
  action("toggleTimer")->setShortcut(QKeySequence(Qt::CTRL | Qt::SHIFT | Qt::Key_Y));
  EXPECT_FALSE(listed().contains("Record/Start/Stop Timer/Ctrl+T"));
  EXPECT_TRUE(listed().contains("Record/Start/Stop Timer/Ctrl+Shift+Y"));
  action("keyboardShortcuts")->trigger();
  auto* dialog = window->findChild<QDialog*>("shortcutsDialog");
  ASSERT_TRUE(dialog && dialog->isVisible());
  auto* table = dialog->findChild<QTableView*>("shortcutsTable");
  ASSERT_NE(table, nullptr);
  EXPECT_EQ(table->model()->rowCount(), listed().size());
  dialog->close();
}

}  // namespace
