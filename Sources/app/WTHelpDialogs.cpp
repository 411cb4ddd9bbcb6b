#include "WTHelpDialogs.h"

#include <QAction>
#include <QDialogButtonBox>
#include <QHeaderView>
#include <QKeySequence>
#include <QLabel>
#include <QMenu>
#include <QMenuBar>
#include <QRegularExpression>
#include <QStandardItemModel>
#include <QTableView>
#include <QVBoxLayout>

namespace WTHelpDialogs {

namespace {

// Menu titles and action texts carry mnemonics ("&Edit") and sometimes a trailing ellipsis.
QString plainText(QString text) {
  text.remove(QRegularExpression(QStringLiteral("&(?!&)")));
  return text;
}

void collect(const QMenu* menu, const QString& path, QList<Shortcut>& into) {
  for (const QAction* action : menu->actions()) {
    if (action->isSeparator()) continue;
    if (const QMenu* sub = action->menu()) {
      collect(sub, path + QStringLiteral(" › ") + plainText(sub->title()), into);
      continue;
    }
    for (const QKeySequence& keys : action->shortcuts()) {
      if (keys.isEmpty()) continue;
      into.append({path, plainText(action->text()), keys.toString(QKeySequence::NativeText)});
    }
  }
}

// Keys that act on the current row of a list or of the outline: no menu item carries them.
QList<Shortcut> rowKeys() {
  const auto keys = [](std::initializer_list<QKeySequence> sequences) {
    QStringList texts;
    for (const QKeySequence& sequence : sequences) texts << sequence.toString(QKeySequence::NativeText);
    return texts.join(QStringLiteral(", "));
  };
  const QString rows = QObject::tr("Rows"), outline = QObject::tr("Outline");
  return {{rows, QObject::tr("Rename"), keys({Qt::Key_Return})},
          {rows, QObject::tr("Next Field"), keys({Qt::Key_Tab, Qt::SHIFT | Qt::Key_Tab})},
          {rows, QObject::tr("The Row’s Menu"), keys({Qt::SHIFT | Qt::Key_F10, Qt::Key_Menu})},
          {QObject::tr("Lists"), QObject::tr("Open"), keys({Qt::Key_Right})},
          {outline, QObject::tr("Open, Close"), keys({Qt::Key_Right, Qt::Key_Left})},
          {outline, QObject::tr("Complete or Reopen To-Do"), keys({Qt::Key_Space})},
          {outline, QObject::tr("From a Field to the Notes"), keys({Qt::SHIFT | Qt::Key_Return})}};
}

}  // namespace

QString aboutText() {
  return QObject::tr(
             "Tessal %1\nA time tracker for freelancers.\n\nFree software under the GNU General Public "
             "License, version 3 or later; it comes with no warranty.")
      .arg(QStringLiteral(TESSAL_VERSION));
}

QDialog* makeAboutDialog(QWidget* parent) {
  auto* dialog = new QDialog(parent);
  dialog->setObjectName(QStringLiteral("aboutDialog"));
  dialog->setWindowTitle(QObject::tr("About Tessal"));
  auto* layout = new QVBoxLayout(dialog);
  auto* text = new QLabel(aboutText(), dialog);
  text->setObjectName(QStringLiteral("aboutText"));
  text->setTextInteractionFlags(Qt::TextSelectableByMouse);
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Close, dialog);
  QObject::connect(buttons, &QDialogButtonBox::rejected, dialog, &QDialog::reject);
  layout->addWidget(text);
  layout->addWidget(buttons);
  return dialog;
}

QList<Shortcut> shortcutsOf(const QMenuBar* menuBar) {
  QList<Shortcut> shortcuts;
  for (const QAction* action : menuBar->actions()) {
    if (const QMenu* menu = action->menu()) collect(menu, plainText(menu->title()), shortcuts);
  }
  return shortcuts;
}

QDialog* makeShortcutsDialog(const QMenuBar* menuBar, QWidget* parent) {
  auto* dialog = new QDialog(parent);
  dialog->setObjectName(QStringLiteral("shortcutsDialog"));
  dialog->setWindowTitle(QObject::tr("Keyboard Shortcuts"));
  auto* model = new QStandardItemModel(0, 3, dialog);
  model->setHorizontalHeaderLabels({QObject::tr("Where"), QObject::tr("Command"), QObject::tr("Keys")});
  for (const Shortcut& shortcut : shortcutsOf(menuBar) + rowKeys()) {
    QList<QStandardItem*> row{new QStandardItem(shortcut.menu), new QStandardItem(shortcut.action),
                              new QStandardItem(shortcut.keys)};
    for (QStandardItem* cell : row) cell->setEditable(false);
    model->appendRow(row);
  }
  auto* layout = new QVBoxLayout(dialog);
  auto* table = new QTableView(dialog);
  table->setObjectName(QStringLiteral("shortcutsTable"));
  table->setModel(model);
  table->verticalHeader()->hide();
  table->horizontalHeader()->setStretchLastSection(true);
  table->setSelectionBehavior(QAbstractItemView::SelectRows);
  table->resizeColumnsToContents();
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Close, dialog);
  QObject::connect(buttons, &QDialogButtonBox::rejected, dialog, &QDialog::reject);
  layout->addWidget(table);
  layout->addWidget(buttons);
  dialog->resize(480, 420);
  return dialog;
}

}  // namespace WTHelpDialogs
