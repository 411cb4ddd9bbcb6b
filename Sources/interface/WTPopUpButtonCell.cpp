#include "WTPopUpButtonCell.h"

#include "RZColor.h"

#include <QFontMetricsF>
#include <QPainter>
#include <QPainterPath>

QColor WTPopUpButtonCell::colorForTag(int tag) {
  return tag % 2 != 0 ? RZColor::calibratedWhite(0.1) : QColor(Qt::white);
}

qreal WTPopUpButtonCell::arrowX(int tag, qreal frameWidth, qreal titleWidth) {
  if (tag % 3 == 0) return frameWidth - titleWidth - 4.0 - 6.0 - 5.0;
  return 4.0;
}

QRectF WTPopUpButtonCell::titleRect(int tag, const QRectF& frame, qreal titleWidth, qreal titleHeight) {
  const qreal x = frame.x() + arrowX(tag, frame.width(), titleWidth) + 6.0 + 6.0;
  const qreal y = frame.y() + (frame.height() - titleHeight) / 2.0;
  return QRectF(x, y, frame.width(), frame.height());
}

void WTPopUpButtonCell::drawWithFrame(QPainter& painter, const QRectF& frame, const QString& title,
                                      const QFont& font, int tag) {
  const QColor color = colorForTag(tag);
  const QFontMetricsF metrics(font);
  const qreal titleWidth = metrics.horizontalAdvance(title);
  painter.save();
  painter.setRenderHint(QPainter::Antialiasing);
  painter.setFont(font);
  painter.setPen(color);
  const QRectF text = titleRect(tag, frame, titleWidth, metrics.height());
  painter.drawText(QRectF(text.x(), text.y(), titleWidth + 1, metrics.height()), Qt::AlignLeft | Qt::AlignTop,
                   title);

  // Two small triangles, pointing up and down, their bases two points apart.
  const qreal x = frame.x() + arrowX(tag, frame.width(), titleWidth);
  const qreal c1 = frame.y() + (frame.height() - 2.0) / 2.0;
  const qreal c2 = frame.y() + (frame.height() + 2.0) / 2.0;
  QPainterPath arrows;
  arrows.moveTo(x, c1);
  arrows.lineTo(x + 3.0, c1 - 5.0);
  arrows.lineTo(x + 6.0, c1);
  arrows.closeSubpath();
  arrows.moveTo(x, c2);
  arrows.lineTo(x + 6.0, c2);
  arrows.lineTo(x + 3.0, c2 + 5.0);
  arrows.closeSubpath();
  painter.fillPath(arrows, color);
  painter.restore();
}
