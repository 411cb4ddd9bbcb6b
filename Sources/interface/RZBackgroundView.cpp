#include "RZBackgroundView.h"

#include "RZColor.h"

#include <QLinearGradient>
#include <QPaintEvent>
#include <QPainter>

void RZBackgroundView::setIBGradientBeginHexColor(const QString& hex) {
  beginColor_ = RZColor::colorFromHexRGB(hex);
  update();
}

void RZBackgroundView::setIBGradientEndHexColor(const QString& hex) {
  endColor_ = RZColor::colorFromHexRGB(hex);
  update();
}

void RZBackgroundView::paintEvent(QPaintEvent* event) {
  QPainter painter(this);
  drawBackground(painter, event->rect());
}

void RZBackgroundView::drawBackground(QPainter& painter, const QRect& rect) {
  // The gradient spans the whole view whatever part is repainted.
  QLinearGradient gradient(QPointF(0, 0), QPointF(0, height()));
  gradient.setColorAt(0, beginColor_);
  gradient.setColorAt(1, endColor_);
  painter.fillRect(rect, gradient);
}
