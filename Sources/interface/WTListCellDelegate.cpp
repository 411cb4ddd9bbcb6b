#include "WTListCellDelegate.h"

#include "RZColor.h"
#include "WTBudgetBar.h"
#include "WTImages.h"
#include "WTListView.h"
#include "WTObjectListModel.h"
#include "WTPopUpButtonCell.h"
#include "WTTableRowView.h"

#include <QAbstractItemView>
#include <QApplication>
#include <QLineEdit>
#include <QMouseEvent>
#include <QPainter>
#include <QToolTip>

WTListCellDelegate::WTListCellDelegate(const QString& identifier, QObject* parent)
    : QStyledItemDelegate(parent), cell_(identifier) {}

void WTListCellDelegate::paint(QPainter* painter, const QStyleOptionViewItem& option,
                               const QModelIndex& index) const {
  const QRectF row = option.rect;
  const bool selected = option.state & QStyle::State_Selected;
  const bool archived = index.data(WTObjectListModel::ArchivedRole).toBool();
  painter->save();
  // The palette's highlight with its own text colour: readable whatever the theme.
  WTTableRowView rowView;
  rowView.setSelectionColor(option.palette.color(QPalette::Highlight));
  rowView.draw(*painter, row, selected);
  const QColor selectedText = option.palette.color(QPalette::HighlightedText);
  QColor dimSelectedText = selectedText;
  dimSelectedText.setAlphaF(0.75f);

  const qreal ratio = painter->device() ? painter->device()->devicePixelRatioF() : 1.0;
  const QRectF icon = cell_.partRect(WTTableCellView::Part::Icon, row);
  const QString image = index.data(WTObjectListModel::ImageRole).toString();
  if (!image.isEmpty())
    painter->drawPixmap(icon.topLeft(), WTImages::pixmap(image, icon.size().toSize(), ratio));
  // A stopwatch on the icon's corner: a timer runs in this project (which is why an archived one is
  // listed).
  if (index.data(WTObjectListModel::RunningRole).toBool()) {
    const QSizeF badge = icon.size() / 2;
    painter->drawPixmap((icon.bottomRight() - QPointF(badge.width(), badge.height())).toPoint(),
                        WTImages::pixmap(QStringLiteral("StopWatch"), badge.toSize(), ratio));
  }

  const QColor text = selected   ? (archived ? dimSelectedText : selectedText)
                      : archived ? RZColor::calibratedWhite(0.55)
                                 : RZColor::calibratedWhite(0.1);
  QFont nameFont = option.font;
  nameFont.setBold(true);
  painter->setFont(nameFont);
  painter->setPen(text);
  const QRectF name = cell_.partRect(WTTableCellView::Part::Name, row);
  QString title = index.data(WTObjectListModel::NameRole).toString();
  if (title.isEmpty()) {
    painter->setPen(selected ? dimSelectedText : RZColor::calibratedWhite(0.55));
    title = tr("Untitled");
  }
  painter->drawText(name, Qt::AlignLeft | Qt::AlignVCenter,
                    painter->fontMetrics().elidedText(title, Qt::ElideRight, static_cast<int>(name.width())));

  QFont small = option.font;
  small.setPointSizeF(std::max<qreal>(small.pointSizeF() - 1.0, 8.0));
  QRectF subtitle = cell_.partRect(WTTableCellView::Part::Subtitle, row);
  // What the rounding rules bill, dimmed at the end of the line, right before the totals it stands beside
  // (as in the outline); the subtitle gives up that room.
  if (const QString billed = index.data(WTObjectListModel::BilledTextRole).toString(); !billed.isEmpty()) {
    const qreal width =
        std::min(QFontMetricsF(small).horizontalAdvance(billed) + 2.0, subtitle.width() / 2.0);
    const QRectF room(subtitle.right() - width, subtitle.y(), width, subtitle.height());
    painter->setFont(small);
    painter->setPen(selected ? dimSelectedText : RZColor::calibratedWhite(0.4));
    painter->drawText(room, Qt::AlignRight | Qt::AlignVCenter,
                      painter->fontMetrics().elidedText(billed, Qt::ElideLeft, static_cast<int>(width)));
    subtitle.setRight(room.left() - 8.0);
  }
  const QString subtitleText = index.data(WTObjectListModel::SubtitleRole).toString();
  if (cell_.identifier() == QLatin1String("Project")) {
    // The client chooser: a pop-up drawn flat, dark on the light row, arrow first.
    WTPopUpButtonCell::drawWithFrame(*painter, subtitle, subtitleText, small, 1);
  } else {
    painter->setFont(small);
    painter->setPen(selected ? dimSelectedText : RZColor::calibratedWhite(0.4));
    painter->drawText(subtitle.adjusted(4, 0, 0, 0), Qt::AlignLeft | Qt::AlignVCenter, subtitleText);
  }

  painter->setFont(option.font);
  painter->setPen(text);
  cell_.drawFigure(*painter, WTTableCellView::Part::Duration, row,
                   index.data(WTObjectListModel::DurationTextRole).toString());
  cell_.drawFigure(*painter, WTTableCellView::Part::Cost, row,
                   index.data(WTObjectListModel::CostTextRole).toString());
  if (const QVariant budget = index.data(WTObjectListModel::BudgetRole); budget.isValid()) {
    WTBudgetBar::paint(*painter, cell_.partRect(WTTableCellView::Part::BudgetBar, row),
                       budget.value<WTBudgetState>(), option.palette, selected);
  }

  // The right-clicked row is ringed while its menu is open.
  const auto* list = qobject_cast<const WTListView*>(parent());
  if (list && list->clickedRow() == index.row()) {
    painter->setRenderHint(QPainter::Antialiasing);
    painter->setPen(QPen(option.palette.color(QPalette::Highlight), 2.0));
    painter->setBrush(Qt::NoBrush);
    painter->drawRoundedRect(row.adjusted(2, 2, -2, -3), 5, 5);
  }

  const QRectF open = cell_.partRect(WTTableCellView::Part::OpenButton, row);
  if (!open.isEmpty())
    painter->drawPixmap(open.topLeft(), WTImages::pixmap("chevron", open.size().toSize(), ratio));
  painter->restore();
}

QSize WTListCellDelegate::sizeHint(const QStyleOptionViewItem&, const QModelIndex&) const {
  // Rows span the list's width; the list lays them out again when it is resized.
  const auto* view = qobject_cast<const QAbstractItemView*>(parent());
  const int width = view ? view->viewport()->width() : 400;
  return QSize(width, static_cast<int>(cell_.requestedHeight(false)));
}

QWidget* WTListCellDelegate::createEditor(QWidget* parent, const QStyleOptionViewItem&,
                                          const QModelIndex&) const {
  auto* editor = new QLineEdit(parent);
  editor->setObjectName(QStringLiteral("nameEditor"));
  QFont font = editor->font();
  font.setBold(true);
  editor->setFont(font);
  return editor;
}

void WTListCellDelegate::setEditorData(QWidget* editor, const QModelIndex& index) const {
  // Only when the editor opens: a change announced for the row later (a save committing this very
  // edit, a merge) must not replace or select what is being typed.
  if (editor->property("loaded").toBool()) return;
  editor->setProperty("loaded", true);
  auto* line = static_cast<QLineEdit*>(editor);
  line->setText(index.data(WTObjectListModel::NameRole).toString());
  line->selectAll();
}

void WTListCellDelegate::setModelData(QWidget* editor, QAbstractItemModel* model,
                                      const QModelIndex& index) const {
  model->setData(index, static_cast<QLineEdit*>(editor)->text(), WTObjectListModel::NameRole);
}

void WTListCellDelegate::updateEditorGeometry(QWidget* editor, const QStyleOptionViewItem& option,
                                              const QModelIndex&) const {
  editor->setGeometry(
      cell_.partRect(WTTableCellView::Part::Name, option.rect).toRect().adjusted(-3, -1, 3, 1));
}

bool WTListCellDelegate::helpEvent(QHelpEvent* event, QAbstractItemView* view,
                                   const QStyleOptionViewItem& option, const QModelIndex& index) {
  // Over a figure cut short the tip shows it whole; over the cost of a row with a budget, it says where
  // the budget stands.
  using Part = WTTableCellView::Part;
  const std::optional<Part> part = cell_.partAt(event->pos(), option.rect, false);
  if (event->type() != QEvent::ToolTip || (part != Part::Cost && part != Part::Duration))
    return QStyledItemDelegate::helpEvent(event, view, option, index);
  const int role = part == Part::Cost ? WTObjectListModel::CostTextRole : WTObjectListModel::DurationTextRole;
  QStringList tip{cell_.clippedFigure(*part, option.rect, option.font, index.data(role).toString())};
  if (const QVariant budget = index.data(WTObjectListModel::BudgetRole);
      budget.isValid() && part == Part::Cost)
    tip << budget.value<WTBudgetState>().text;
  tip.removeAll(QString());
  if (tip.isEmpty()) return QStyledItemDelegate::helpEvent(event, view, option, index);
  QToolTip::showText(event->globalPos(), tip.join(u'\n'), view, cell_.partRect(*part, option.rect).toRect());
  return true;
}

bool WTListCellDelegate::editorEvent(QEvent* event, QAbstractItemModel* model,
                                     const QStyleOptionViewItem& option, const QModelIndex& index) {
  const auto type = event->type();
  if (type != QEvent::MouseButtonRelease && type != QEvent::MouseButtonDblClick &&
      type != QEvent::MouseButtonPress) {
    return QStyledItemDelegate::editorEvent(event, model, option, index);
  }
  auto* mouse = static_cast<QMouseEvent*>(event);
  if (mouse->button() != Qt::LeftButton) return false;
  const auto part = cell_.partAt(mouse->position(), option.rect, false);
  const bool button = part == WTTableCellView::Part::OpenButton || part == WTTableCellView::Part::Subtitle;
  if (type == QEvent::MouseButtonRelease && button) {
    emit partActivated(index, *part, cell_.partRect(*part, option.rect).toRect());
    return true;
  }
  if (type == QEvent::MouseButtonDblClick && part != WTTableCellView::Part::Name) {
    // A double click anywhere but on the name opens the row.
    if (!button) emit partActivated(index, WTTableCellView::Part::OpenButton, option.rect);
    return true;
  }
  return false;
}
