#include "WTEmptyHint.h"

#include <QAbstractItemView>
#include <QKeySequence>
#include <QPainter>

namespace WTEmptyHint {

QString forAdding(const QString& noneYet) {
  const QString shortcut = QKeySequence(QKeySequence::New).toString(QKeySequence::NativeText);
  if (shortcut.isEmpty()) return noneYet;
  return QAbstractItemView::tr("%1 — press %2").arg(noneYet, shortcut);
}

void paint(QAbstractItemView* view, const QString& hint) {
  if (hint.isEmpty() || !view->model() || view->model()->rowCount(view->rootIndex()) > 0) return;
  QPainter painter(view->viewport());
  QColor colour = view->palette().color(QPalette::Text);
  colour.setAlphaF(0.6f);
  painter.setPen(colour);
  QFont font = view->font();
  font.setPointSizeF(font.pointSizeF() + 1.0);
  painter.setFont(font);
  painter.drawText(view->viewport()->rect().adjusted(12, 12, -12, -12), Qt::AlignCenter | Qt::TextWordWrap,
                   hint);
}

}  // namespace WTEmptyHint
