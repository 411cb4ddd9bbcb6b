#pragma once

#include <QColor>
#include <QRectF>

class QPainter;

// How one row of a list or of the items outline is painted: a flat grey background, a grey selection,
// a two-line groove at the bottom and a rounded highlight while something is dragged over it. Rows are
// painted by the views' delegates, so this is a small value object rather than a widget.
class WTTableRowView {
 public:
  // Background and groove on, default colours (white 0.9, selected 0.84).
  WTTableRowView() = default;
  // Header rows: white 0.65 whether selected or not.
  static WTTableRowView initWithHeaderColors();
  // As the default, with both colours given (an invalid colour means "the default").
  static WTTableRowView initWithBgColor(const QColor& backColor, const QColor& selectionColor);

  void setDrawsSeparator(bool draws) { drawsSeparator_ = draws; }
  void setSelectionColor(const QColor& color) { selectionColor_ = color; }

  // The colours in force: the set ones or the defaults.
  QColor effectiveBackColor() const;
  QColor effectiveSelectionColor() const;

  // Each fills or strokes within `bounds` (the whole row).
  void drawBackgroundInRect(QPainter& painter, const QRectF& bounds) const;
  void drawSelectionInRect(QPainter& painter, const QRectF& bounds) const;
  void drawSeparatorInRect(QPainter& painter, const QRectF& bounds) const;
  // A rounded rectangle (radius 7) in the highlight colour of `highlight`.
  void drawDraggingDestinationFeedbackInRect(QPainter& painter, const QRectF& bounds,
                                             const QColor& highlight) const;
  // Background, then selection when `selected`, then the groove.
  void draw(QPainter& painter, const QRectF& bounds, bool selected) const;

 private:
  bool drawsSeparator_ = true;
  QColor selectionColor_;
  QColor backColor_;
};
