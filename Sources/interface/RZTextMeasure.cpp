#include "RZTextMeasure.h"

#include <QAbstractTextDocumentLayout>
#include <QPainter>
#include <QTextDocument>

namespace RZTextMeasure {

QRectF textBoundsForBounds(const QString& text, const QFont& font, const QRectF& bounds, qreal maxWidth,
                           QPainter* drawInto) {
  static QTextDocument* document = [] {
    auto* made = new QTextDocument;
    made->setDocumentMargin(0);
    made->setUndoRedoEnabled(false);
    return made;
  }();
  document->setDefaultFont(font);
  document->setPlainText(text);
  document->setTextWidth(maxWidth);
  // The widest line, not the wrap width: idealWidth is what the lines use.
  const QSizeF used(document->idealWidth(), document->size().height());
  const QRectF result(bounds.x(), bounds.y() + (bounds.height() - used.height()) / 2.0, used.width(),
                      used.height());
  if (drawInto) {
    drawInto->save();
    drawInto->translate(result.topLeft());
    QAbstractTextDocumentLayout::PaintContext context;
    context.palette.setColor(QPalette::Text, drawInto->pen().color());
    document->documentLayout()->draw(drawInto, context);
    drawInto->restore();
  }
  return result;
}

}  // namespace RZTextMeasure
