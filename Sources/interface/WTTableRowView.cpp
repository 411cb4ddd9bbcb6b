#include "WTTableRowView.h"

#include "RZColor.h"

#include <QPainter>
#include <QPainterPath>

WTTableRowView WTTableRowView::initWithHeaderColors() {
  const QColor header = RZColor::calibratedWhite(0.65);
  return initWithBgColor(header, header);
}

WTTableRowView WTTableRowView::initWithBgColor(const QColor& backColor, const QColor& selectionColor) {
  WTTableRowView row;
  row.selectionColor_ = selectionColor;
  row.backColor_ = backColor;
  return row;
}

QColor WTTableRowView::effectiveBackColor() const {
  return backColor_.isValid() ? backColor_ : RZColor::calibratedWhite(0.9);
}

QColor WTTableRowView::effectiveSelectionColor() const {
  return selectionColor_.isValid() ? selectionColor_ : RZColor::calibratedWhite(0.84);
}

void WTTableRowView::drawBackgroundInRect(QPainter& painter, const QRectF& bounds) const {
  painter.fillRect(bounds, effectiveBackColor());
}

void WTTableRowView::drawSelectionInRect(QPainter& painter, const QRectF& bounds) const {
  painter.fillRect(bounds, effectiveSelectionColor());
}

void WTTableRowView::drawSeparatorInRect(QPainter& painter, const QRectF& bounds) const {
  if (!drawsSeparator_) return;
  painter.save();
  painter.setRenderHint(QPainter::Antialiasing, false);
  // A groove: a dark line above a light one, each one point high, along the bottom edge.
  const qreal bottom = bounds.y() + bounds.height();
  painter.fillRect(QRectF(bounds.x(), bottom - 2.0, bounds.width(), 1.0), RZColor::calibratedWhite(0.8));
  painter.fillRect(QRectF(bounds.x(), bottom - 1.0, bounds.width(), 1.0), RZColor::calibratedWhite(0.95));
  painter.restore();
}

void WTTableRowView::drawDraggingDestinationFeedbackInRect(QPainter& painter, const QRectF& bounds,
                                                           const QColor& highlight) const {
  painter.save();
  painter.setRenderHint(QPainter::Antialiasing);
  QPainterPath path;
  path.addRoundedRect(bounds, 7.0, 7.0);
  painter.fillPath(path, highlight);
  painter.restore();
}

void WTTableRowView::draw(QPainter& painter, const QRectF& bounds, bool selected) const {
  drawBackgroundInRect(painter, bounds);
  if (selected) drawSelectionInRect(painter, bounds);
  drawSeparatorInRect(painter, bounds);
}
