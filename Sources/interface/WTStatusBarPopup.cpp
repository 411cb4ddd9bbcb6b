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
  rows_ = new QVBoxLayout;
  rows_->setSpacing(2);
  layout->addLayout(rows_);
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
  connect(tasks_, &WTRecentTasks::tasksDidChange, this, [this] {
    // An empty list has nothing to offer: the popup goes, as a menu with no items would.
    if (tasks_->tasks().isEmpty() && isVisible()) {
      close();
      return;
    }
    rebuildRows();
  });
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
  if (QLayoutItem* first = rows_->itemAt(0)) {
    if (auto* button = first->widget()->findChild<QToolButton*>(QStringLiteral("timerButton")))
      button->setFocus(Qt::PopupFocusReason);
  }
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
  for (const auto& [task, label] : std::as_const(elapsed_)) label->setText(elapsedText(task));
}

void WTStatusBarPopup::rebuildRows() {
  // Rows are a handful of widgets: made afresh after each change rather than kept in step one by one.
  // The old ones go later, since the button that was clicked may still be on the stack.
  while (QLayoutItem* item = rows_->takeAt(0)) {
    if (QWidget* row = item->widget()) {
      row->hide();
      row->deleteLater();
    }
    delete item;
  }
  elapsed_.clear();
  const QList<WTTask*>& tasks = tasks_->tasks();
  emptyHint_->setVisible(tasks.isEmpty());
  for (WTTask* task : tasks) {
    auto* row = new QWidget(this);
    row->setObjectName(QStringLiteral("taskRow"));
    auto* layout = new QHBoxLayout(row);
    layout->setContentsMargins(2, 2, 2, 2);
    auto* image = new QLabel(row);
    image->setPixmap(
        WTImages::pixmap(task->tableImage(), QSize(kImageSize, kImageSize), devicePixelRatioF()));
    layout->addWidget(image);
    const QString project = task->project() ? task->project()->name() : QString();
    auto* title = new QLabel(row);
    title->setObjectName(QStringLiteral("taskTitle"));
    title->setTextFormat(Qt::PlainText);
    // A long name is cut where it shows that it is, and is whole in the tip.
    QStringList lines = {task->name()};
    if (!project.isEmpty()) lines << project;
    const QStringList whole = lines;
    for (QString& line : lines) line = title->fontMetrics().elidedText(line, Qt::ElideRight, kTitleWidth);
    title->setText(lines.join(u'\n'));
    if (lines != whole) title->setToolTip(whole.join(u'\n'));
    title->setMinimumWidth(160);
    layout->addWidget(title, 1);
    auto* elapsed = new QLabel(elapsedText(task), row);
    elapsed->setObjectName(QStringLiteral("taskElapsed"));
    elapsed->setTextFormat(Qt::PlainText);
    layout->addWidget(elapsed);
    elapsed_.append({task, elapsed});
    auto* button = new QToolButton(row);
    button->setObjectName(QStringLiteral("timerButton"));
    button->setToolButtonStyle(Qt::ToolButtonTextBesideIcon);
    button->setIcon(WTImages::icon(task->timerButtonImage()));
    button->setText(task->buttonTitle());
    button->setAutoRaise(true);
    // Records live as long as their context (deleted ones too, for undo), and the rows are made afresh
    // after every change, so the task behind a button is always there.
    connect(button, &QToolButton::clicked, this, [task] { task->toggleTimer(); });
    layout->addWidget(button);
    rows_->addWidget(row);
  }
  if (isVisible()) adjustSize();
}
