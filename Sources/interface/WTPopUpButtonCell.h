#pragma once

#include <QColor>
#include <QFont>
#include <QRectF>
#include <QString>

class QPainter;

// The look of a pop-up button in a row: its title with two small triangles instead of the usual
// bezel. The control's tag chooses the look: an odd tag draws in near-black, an even one in white; a
// tag that is a multiple of 3 puts the arrow and title against the right edge, any other against the
// left.
class WTPopUpButtonCell {
 public:
  // The colour of the title and the arrow for `tag`.
  static QColor colorForTag(int tag);
  // Where the arrow starts, from the frame's left edge, for a title of `titleWidth`.
  static qreal arrowX(int tag, qreal frameWidth, qreal titleWidth);
  // The rectangle the title is drawn in.
  static QRectF titleRect(int tag, const QRectF& frame, qreal titleWidth, qreal titleHeight);
  // Paints the whole control into `frame`.
  static void drawWithFrame(QPainter& painter, const QRectF& frame, const QString& title, const QFont& font,
                            int tag);
};
