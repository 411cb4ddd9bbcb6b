#include "WTStatusBarPopup.h"

#include "DurationText.h"
#include "WTImages.h"
#include "WTProject.h"
#include "WTRecentTasks.h"
#include "WTTask.h"
#include "WTTime.h"

#include <QGuiApplication>
#include <QHBoxLayout>
#include <QLabel>
#include <QPushButton>
#include <QScreen>
#include <QToolButton>
#include <QVBoxLayout>

#include <algorithm>

namespace {

constexpr int kImageSize = 24;
constexpr int kTitleWidth = 300;  // pixels of a task's or project's name, beyond which it is cut

// The minutes of a task's running timers, as the stopwatch counted them at its last tick; empty for a
// task that does not run.
QString elapsedText(const WTTask* task) {
  const QList<WTTime*> running = task->runningTimes();
  if (running.isEmpty()) return {};
  qint64 minutes = 0;
  for (const WTTime* time : running) minutes += time->duration();
  return DurationText::stringWithMinutes(std::int32_t(std::clamp<qint64>(minutes, INT32_MIN, INT32_MAX)));
}

}  // namespace

WTStatusBarPopup::WTStatusBarPopup(WTRecentTasks* tasks, QWidget* parent)
    : QFrame(parent, Qt::Popup | Qt::FramelessWindowHint), tasks_(tasks) {
  setObjectName(QStringLiteral("statusBarPopup"));
  setWindowTitle(tr("Tessal — Recent Tasks"));
  setFrameShape(QFrame::StyledPanel);
  setAttribute(Qt::WA_DeleteOnClose, false);
  auto* layout = new QVBoxLayout(this);
  layout->setContentsMargins(8, 8, 8, 8);
  layout->setSpacing(6);
  rowLayout_ = new QVBoxLayout;
  rowLayout_->setSpacing(2);
  layout->addLayout(rowLayout_);
  emptyHint_ = new QLabel(tr("No tasks yet"), this);
  emptyHint_->setEnabled(false);
  layout->addWidget(emptyHint_);
  auto* show = new QPushButton(tr("Show Tessal"), this);
  show->setObjectName(QStringLiteral("showMainWindow"));
  connect(show, &QPushButton::clicked, this, [this] {
    close();
    emit showMainWindowRequested();
  });
  layout->addWidget(show, 0, Qt::AlignRight);
  connect(tasks_, &WTRecentTasks::tasksDidChange, this, &WTStatusBarPopup::tasksDidChange);
}

void WTStatusBarPopup::tasksDidChange() {
  // An empty list has nothing to offer: the popup goes, as a menu with no items would.
  if (tasks_->tasks().isEmpty() && isVisible()) {
    close();
    return;
  }
  // The same tasks in another order (one was started) stay where the user sees them while it is open.
  QList<WTTask*> shown, listed = tasks_->tasks();
  for (const Row& row : std::as_const(rows_)) shown.append(row.task);
  std::sort(shown.begin(), shown.end());
  std::sort(listed.begin(), listed.end());
  if (isVisible() && shown == listed) {
    fillRows();
    return;
  }
  rebuildRows();
}

void WTStatusBarPopup::popUp(const QRect& anchor) {
  tasks_->setActive(true);
  rebuildRows();
  adjustSize();
  const QScreen* screen = QGuiApplication::screenAt(anchor.center());
  if (!screen) screen = QGuiApplication::primaryScreen();
  const QRect available = screen ? screen->availableGeometry() : QRect(anchor.topLeft(), size());
  QPoint position(anchor.left(), anchor.bottom() + 1);
  if (position.y() + height() > available.bottom()) position.setY(anchor.top() - height());
  position.setX(
      std::clamp(position.x(), available.left(), std::max(available.left(), available.right() - width())));
  position.setY(
      std::clamp(position.y(), available.top(), std::max(available.top(), available.bottom() - height())));
  move(position);
  show();
  raise();
  activateWindow();
  // The keyboard works the list at once: Tab moves between the buttons, Space presses one.
  if (!rows_.isEmpty()) rows_.front().button->setFocus(Qt::PopupFocusReason);
}

void WTStatusBarPopup::showEvent(QShowEvent* event) {
  tasks_->setActive(true);
  QFrame::showEvent(event);
}

void WTStatusBarPopup::hideEvent(QHideEvent* event) {
  tasks_->setActive(false);
  QFrame::hideEvent(event);
}

void WTStatusBarPopup::updateElapsedTimes() {
  for (const Row& row : std::as_const(rows_)) row.elapsed->setText(elapsedText(row.task));
}

void WTStatusBarPopup::rebuildRows() {
  // Rows are a handful of widgets: made afresh when other tasks are listed rather than kept in step one
  // by one. The old ones go later, since the button that was clicked may still be on the stack.
  while (QLayoutItem* item = rowLayout_->takeAt(0)) {
    if (QWidget* row = item->widget()) {
      row->hide();
      row->deleteLater();
    }
    delete item;
  }
  rows_.clear();
  const QList<WTTask*>& tasks = tasks_->tasks();
  emptyHint_->setVisible(tasks.isEmpty());
  for (WTTask* task : tasks) {
    auto* row = new QWidget(this);
    row->setObjectName(QStringLiteral("taskRow"));
    auto* layout = new QHBoxLayout(row);
    layout->setContentsMargins(2, 2, 2, 2);
    auto* image = new QLabel(row);
    layout->addWidget(image);
    auto* title = new QLabel(row);
    title->setObjectName(QStringLiteral("taskTitle"));
    title->setTextFormat(Qt::PlainText);
    title->setMinimumWidth(160);
    layout->addWidget(title, 1);
    auto* elapsed = new QLabel(row);
    elapsed->setObjectName(QStringLiteral("taskElapsed"));
    elapsed->setTextFormat(Qt::PlainText);
    layout->addWidget(elapsed);
    auto* button = new QToolButton(row);
    button->setObjectName(QStringLiteral("timerButton"));
    button->setToolButtonStyle(Qt::ToolButtonTextBesideIcon);
    button->setAutoRaise(true);
    // Records live as long as their context (deleted ones too, for undo), so the task behind a button
    // is always there.
    connect(button, &QToolButton::clicked, this, [task] { task->toggleTimer(); });
    layout->addWidget(button);
    rowLayout_->addWidget(row);
    rows_.append({task, image, title, elapsed, button});
  }
  fillRows();
}

void WTStatusBarPopup::fillRows() {
  for (const Row& row : std::as_const(rows_)) {
    WTTask* task = row.task;
    row.image->setPixmap(
        WTImages::pixmap(task->tableImage(), QSize(kImageSize, kImageSize), devicePixelRatioF()));
    // A long name is cut where it shows that it is, and is whole in the tip.
    QStringList lines = {task->name()};
    const QString project = task->project() ? task->project()->name() : QString();
    if (!project.isEmpty()) lines << project;
    const QStringList whole = lines;
    for (QString& line : lines) line = row.title->fontMetrics().elidedText(line, Qt::ElideRight, kTitleWidth);
    row.title->setText(lines.join(u'\n'));
    row.title->setToolTip(lines != whole ? whole.join(u'\n') : QString());
    row.elapsed->setText(elapsedText(row.task));
    row.button->setIcon(WTImages::icon(task->timerButtonImage()));
    row.button->setText(task->buttonTitle());
  }
  if (!isVisible()) return;
  // A row grown wider (a timer's minutes and "Stop") widens the popup now, from the rows' new sizes (their
  // layouts ask for them later), and never past the screen's edge.
  QCoreApplication::sendPostedEvents(nullptr, QEvent::LayoutRequest);
  adjustSize();
  if (const QScreen* screen = QGuiApplication::screenAt(geometry().center())) {
    const QRect available = screen->availableGeometry();
    move(std::clamp(x(), available.left(), std::max(available.left(), available.right() - width())), y());
  }
}
