#include "WTMainWindowController.h"

#include "DurationText.h"
#include "MoneyFormat.h"
#include "WTAppDelegate.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTTask.h"

#include <QApplication>
#include <QCloseEvent>
#include <QHeaderView>
#include <QMenuBar>
#include <QTreeWidget>

#include <algorithm>

WTMainWindowController::WTMainWindowController(WTAppDelegate& delegate, QWidget* parent)
    : QMainWindow(parent), delegate_(delegate), list_(new QTreeWidget(this)) {
  setWindowTitle(QStringLiteral("Tessal"));
  list_->setColumnCount(3);
  list_->setHeaderLabels({tr("Name"), tr("Duration"), tr("Cost")});
  list_->header()->setSectionResizeMode(0, QHeaderView::Stretch);
  list_->header()->setStretchLastSection(false);
  list_->headerItem()->setTextAlignment(1, Qt::AlignRight | Qt::AlignVCenter);
  list_->headerItem()->setTextAlignment(2, Qt::AlignRight | Qt::AlignVCenter);
  list_->setUniformRowHeights(true);
  list_->setAlternatingRowColors(true);
  list_->setRootIsDecorated(true);
  setCentralWidget(list_);
  resize(720, 480);

  QMenu* file = menuBar()->addMenu(tr("&File"));
  file->addAction(tr("&Save"), QKeySequence::Save, [this] { delegate_.saveAction(); });
  file->addSeparator();
  file->addAction(tr("&Quit"), QKeySequence::Quit, this, &QWidget::close);

  QMenu* edit = menuBar()->addMenu(tr("&Edit"));
  edit->addAction(tr("&Undo"), QKeySequence::Undo, [this] {
    delegate_.managedObjectContext()->undoManager().undo();
  });
  edit->addAction(tr("&Redo"), QKeySequence::Redo, [this] {
    delegate_.managedObjectContext()->undoManager().redo();
  });

  // Many changes in one turn refill the list once.
  reload_.setSingleShot(true);
  reload_.setInterval(0);
  connect(&reload_, &QTimer::timeout, this, &WTMainWindowController::reloadData);

  WTObjectContext* context = delegate_.managedObjectContext();
  populate();
  connect(context, &WTObjectContext::objectValueDidChange, &reload_, qOverload<>(&QTimer::start));
  connect(context, &WTObjectContext::objectsDidChange, &reload_, qOverload<>(&QTimer::start));
  reloadData();
}

QList<WTProject*> WTMainWindowController::fetchProjects() const {
  return WTProject::fetchByPredicate({}, delegate_.managedObjectContext());
}

void WTMainWindowController::populate() {
  WTObjectContext* context = delegate_.managedObjectContext();
  // Without a store there is nothing to fill: what was made could never be kept.
  if (!context->hasStore() || !fetchProjects().isEmpty()) return;
  auto* project = WTProject::insertNewObject(context);
  project->setName(QStringLiteral("Default Project"));
  auto* task = WTTask::insertNewObject(context);
  task->setName(QStringLiteral("Default Task"));
  task->setProject(project);
}

void WTMainWindowController::reloadData() {
  list_->clear();
  QList<WTProject*> projects = fetchProjects();
  std::sort(projects.begin(), projects.end(),
            [](const WTProject* a, const WTProject* b) { return a->name().localeAwareCompare(b->name()) < 0; });
  auto addRow = [](QTreeWidgetItem* row) {
    for (int column : {1, 2}) row->setTextAlignment(column, Qt::AlignRight | Qt::AlignVCenter);
    return row;
  };
  for (WTProject* project : projects) {
    QTreeWidgetItem* projectRow = addRow(new QTreeWidgetItem(
        list_, {project->name(), DurationText::stringWithMinutes(project->duration()), MoneyFormat::format(project->cost())}));
    QFont bold = projectRow->font(0);
    bold.setBold(true);
    projectRow->setFont(0, bold);
    for (WTTask* task : project->tasks()) {
      addRow(new QTreeWidgetItem(projectRow, {task->name(), DurationText::stringWithMinutes(task->duration()),
                                              MoneyFormat::format(task->cost())}));
    }
  }
  list_->expandAll();
  for (int column : {1, 2}) {
    list_->resizeColumnToContents(column);
    list_->setColumnWidth(column, std::max(110, list_->columnWidth(column) + 24));
  }
}

void WTMainWindowController::closeEvent(QCloseEvent* event) {
  if (delegate_.applicationShouldTerminate() == WTAppDelegate::TerminateReply::TerminateCancel) {
    event->ignore();
    return;
  }
  event->accept();
  QApplication::quit();
}
