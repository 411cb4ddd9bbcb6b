#pragma once

#include <QFont>
#include <QRectF>
#include <QString>

class QPainter;

// Measures (and optionally draws) wrapped text with one text layout shared by the whole program, so
// sizing thousands of rows never builds a text system per row. Main thread only.
namespace RZTextMeasure {

// Lays `text` out in `font` wrapped at `maxWidth`. The result has the used width and height, its x
// that of `bounds` and its y such that the text is centred vertically in `bounds`. With a painter,
// the text is drawn there too.
QRectF textBoundsForBounds(const QString& text, const QFont& font, const QRectF& bounds, qreal maxWidth,
                           QPainter* drawInto = nullptr);

}  // namespace RZTextMeasure
