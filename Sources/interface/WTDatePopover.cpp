#include "WTDatePopover.h"

#include <QCalendarWidget>
#include <QGuiApplication>
#include <QScreen>
#include <QVBoxLayout>

WTDatePopover::WTDatePopover(QWidget* parent) : QFrame(parent, Qt::Popup) {
  setObjectName(QStringLiteral("datePopover"));
  setFrameShape(QFrame::StyledPanel);
  auto* layout = new QVBoxLayout(this);
  layout->setContentsMargins(6, 6, 6, 6);
  datePicker_ = new QCalendarWidget(this);
  datePicker_->setObjectName(QStringLiteral("datePicker"));
  datePicker_->setGridVisible(false);
  datePicker_->setVerticalHeaderFormat(QCalendarWidget::NoVerticalHeader);
  datePicker_->setFirstDayOfWeek(Qt::Sunday);
  layout->addWidget(datePicker_);
  connect(datePicker_, &QCalendarWidget::activated, this, &QWidget::hide);
  connect(datePicker_, &QCalendarWidget::clicked, this, &QWidget::hide);
}

QDate WTDatePopover::date() const {
  return datePicker_->selectedDate();
}

void WTDatePopover::setDate(const QDate& date) {
  datePicker_->setSelectedDate(date);
}

void WTDatePopover::showRelativeToRect(const QRect& anchor) {
  adjustSize();
  QPoint position(anchor.center().x() - width() / 2, anchor.bottom() + 4);
  if (QScreen* screen = QGuiApplication::screenAt(anchor.center())) {
    const QRect available = screen->availableGeometry();
    if (position.y() + height() > available.bottom()) position.setY(anchor.top() - height() - 4);
    position.setX(
        std::clamp(position.x(), available.left(), std::max(available.left(), available.right() - width())));
  }
  move(position);
  show();
  datePicker_->setFocus();
}

void WTDatePopover::hideEvent(QHideEvent* event) {
  QFrame::hideEvent(event);
  emit popoverWillClose();
}
