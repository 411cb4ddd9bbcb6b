#pragma once

#include <QDialog>
#include <QList>
#include <QString>

class QMenuBar;

// The Help menu's two windows: what this build is, and which keys do what.
namespace WTHelpDialogs {

// "Tessal 1.2.3" and the licence it is given under.
QString aboutText();
QDialog* makeAboutDialog(QWidget* parent);

struct Shortcut {
  QString menu;    // "Edit"
  QString action;  // "Undo"
  QString keys;    // "Ctrl+Z", as the platform writes it
};
// Every action of the menu bar (submenus included) that has a shortcut, in menu order, read from the
// actions themselves so the list never drifts from what the keys do.
QList<Shortcut> shortcutsOf(const QMenuBar* menuBar);
QDialog* makeShortcutsDialog(const QMenuBar* menuBar, QWidget* parent);

}  // namespace WTHelpDialogs
