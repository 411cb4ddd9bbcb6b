#include "WTItemCellDelegate.h"

#include "RZColor.h"
#include "RZTextMeasure.h"
#include "WTBudgetBar.h"
#include "WTImages.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTNotesTextView.h"
#include "WTOutlineView.h"
#include "WTTableRowView.h"

#include <QApplication>
#include <QPainter>
#include <QPainterPath>

namespace {

const QColor& darkText() {
  static const QColor colour = RZColor::calibratedWhite(0.1);
  return colour;
}

const QColor& greyText() {
  static const QColor colour = RZColor::calibratedWhite(0.45);
  return colour;
}

// On a selected row text takes the palette's colour for highlighted text, so it stays readable on the
// highlight whatever the theme; dimmed text stays a little dimmer than the rest.
bool isSelected(const QStyleOptionViewItem& option) {
  return option.state & QStyle::State_Selected;
}

QColor textColour(const QStyleOptionViewItem& option) {
  return isSelected(option) ? option.palette.color(QPalette::HighlightedText) : darkText();
}

QColor dimTextColour(const QStyleOptionViewItem& option) {
  if (!isSelected(option)) return greyText();
  QColor colour = option.palette.color(QPalette::HighlightedText);
  colour.setAlphaF(0.75f);
  return colour;
}

void drawDisclosure(QPainter& painter, const QRectF& rect, bool expanded, const QColor& colour) {
  if (rect.isEmpty()) return;
  QPainterPath triangle;
  const QPointF c = rect.center();
  if (expanded) {
    triangle.moveTo(c.x() - 4.5, c.y() - 2.5);
    triangle.lineTo(c.x() + 4.5, c.y() - 2.5);
    triangle.lineTo(c.x(), c.y() + 3.5);
  } else {
    triangle.moveTo(c.x() - 2.5, c.y() - 4.5);
    triangle.lineTo(c.x() + 3.5, c.y());
    triangle.lineTo(c.x() - 2.5, c.y() + 4.5);
  }
  triangle.closeSubpath();
  painter.fillPath(triangle, colour);
}

void drawImage(QPainter& painter, const QRectF& rect, const QString& name) {
  if (rect.isEmpty() || name.isEmpty()) return;
  const qreal ratio = painter.device() ? painter.device()->devicePixelRatioF() : 1.0;
  painter.drawPixmap(rect.topLeft(), WTImages::pixmap(name, rect.size().toSize(), ratio));
}

QString elided(const QPainter& painter, const QString& text, qreal width) {
  return painter.fontMetrics().elidedText(text, Qt::ElideRight, static_cast<int>(width));
}

// The billed figures where they differ from the raw ones, small and dimmed at the end of the name's room,
// right before the duration they stand beside; the name gives up that room.
void drawBilled(QPainter& painter, const QStyleOptionViewItem& option, const QModelIndex& index,
                QRectF& name) {
  const QString text = index.data(WTItemsModel::BilledTextRole).toString();
  if (text.isEmpty()) return;
  QFont small = option.font;
  small.setPointSizeF(std::max<qreal>(small.pointSizeF() - 1.0, 8.0));
  const qreal width = std::min(QFontMetricsF(small).horizontalAdvance(text) + 2.0, name.width() / 2.0);
  const QRectF billed(name.right() - width, name.y(), width, name.height());
  painter.save();
  painter.setFont(small);
  painter.setPen(dimTextColour(option));
  painter.drawText(billed, Qt::AlignRight | Qt::AlignVCenter,
                   painter.fontMetrics().elidedText(text, Qt::ElideLeft, static_cast<int>(width)));
  painter.restore();
  name.setRight(billed.left() - 8.0);
}

}  // namespace

WTItemCellDelegate::WTItemCellDelegate(WTItemsViewController* controller, WTOutlineView* view)
    : QStyledItemDelegate(view), controller_(controller), view_(view), viewport_(view->viewport()) {
  view->installEventFilter(this);
  viewport_->installEventFilter(this);
}

bool WTItemCellDelegate::isEditingNotes(const QModelIndex& index) const {
  return notesEditor_ && notesIndex_.isValid() && notesIndex_ == index;
}

QString WTItemCellDelegate::notesEditingText() const {
  return notesEditor_ ? notesEditor_->toPlainText() : QString();
}

WTNotesTextView* WTItemCellDelegate::notesEditor() const {
  return notesEditor_;
}

QSize WTItemCellDelegate::sizeHint(const QStyleOptionViewItem&, const QModelIndex& index) const {
  return QSize(view_->viewport()->width(), static_cast<int>(std::ceil(controller_->heightOfRow(index))));
}

void WTItemCellDelegate::paint(QPainter* painter, const QStyleOptionViewItem& option,
                               const QModelIndex& index) const {
  const auto* model = static_cast<const WTItemsModel*>(index.model());
  const WTTableCellView& cell = controller_->cellViewPrototypeForIndex(index);
  painter->save();
  if (model->isTaskIndex(index)) {
    paintTask(*painter, option, index, cell);
  } else if (model->isContainerIndex(index)) {
    paintContainer(*painter, option, index, cell);
  } else {
    paintItem(*painter, option, index, cell);
  }
  painter->restore();
}

void WTItemCellDelegate::paintTask(QPainter& painter, const QStyleOptionViewItem& option,
                                   const QModelIndex& index, const WTTableCellView& cell) const {
  const QRectF row = option.rect;
  const bool selected = option.state & QStyle::State_Selected;
  // A plain row: the window's background, the regular selection.
  painter.fillRect(row, option.palette.color(QPalette::Base));
  if (selected) painter.fillRect(row, option.palette.color(QPalette::Highlight));
  if (view_->dropTargetIndex() == index) {
    QColor highlight = option.palette.color(QPalette::Highlight);
    highlight.setAlphaF(0.45f);
    WTTableRowView().drawDraggingDestinationFeedbackInRect(painter, row.adjusted(2, 1, -2, -1), highlight);
  }
  painter.fillRect(QRectF(row.x(), row.bottom(), row.width(), 1), RZColor::calibratedWhite(0.82));

  if (index.model()->hasChildren(index)) {
    drawDisclosure(painter, cell.partRect(WTTableCellView::Part::Disclosure, row), view_->isExpanded(index),
                   RZColor::calibratedWhite(0.35));
  }
  drawImage(painter, cell.partRect(WTTableCellView::Part::Icon, row),
            index.data(WTItemsModel::ImageRole).toString());

  QFont bold = option.font;
  bold.setBold(true);
  QRectF name = cell.partRect(WTTableCellView::Part::Name, row);
  drawBilled(painter, option, index, name);
  painter.setFont(bold);
  QString title = index.data(WTItemsModel::NameRole).toString();
  painter.setPen(title.isEmpty() ? dimTextColour(option) : textColour(option));
  if (title.isEmpty()) title = tr("Untitled Task");
  painter.drawText(name, Qt::AlignLeft | Qt::AlignVCenter, elided(painter, title, name.width()));

  painter.setFont(option.font);
  painter.setPen(textColour(option));
  cell.drawFigure(painter, WTTableCellView::Part::Duration, row,
                  index.data(WTItemsModel::DurationTextRole).toString());
  cell.drawFigure(painter, WTTableCellView::Part::Cost, row,
                  index.data(WTItemsModel::CostTextRole).toString());
  if (const QVariant budget = index.data(WTItemsModel::BudgetRole); budget.isValid()) {
    WTBudgetBar::paint(painter, cell.partRect(WTTableCellView::Part::BudgetBar, row),
                       budget.value<WTBudgetState>(), option.palette, selected);
  }
  drawImage(painter, cell.partRect(WTTableCellView::Part::TimerButton, row),
            index.data(WTItemsModel::TimerImageRole).toString());
  if (option.state & QStyle::State_MouseOver) paintHoverBar(painter, row, cell, index);
  paintNotes(painter, row, index, cell);
}

void WTItemCellDelegate::paintContainer(QPainter& painter, const QStyleOptionViewItem& option,
                                        const QModelIndex& index, const WTTableCellView& cell) const {
  const QRectF row = option.rect;
  WTTableRowView header = WTTableRowView::initWithHeaderColors();
  header.setDrawsSeparator(false);
  header.draw(painter, row, false);
  // A group is never selected, but the keyboard passes through it (Down from its task, Left and Right to
  // close and open it): there it takes the selection's colour, or nothing would show where the keyboard is.
  if (option.state & QStyle::State_HasFocus) painter.fillRect(row, option.palette.color(QPalette::Highlight));
  if (view_->dropTargetIndex() == index) {
    header.drawDraggingDestinationFeedbackInRect(painter, row.adjusted(2, 1, -2, -1),
                                                 option.palette.color(QPalette::Highlight));
  }
  drawDisclosure(painter, cell.partRect(WTTableCellView::Part::Disclosure, row), view_->isExpanded(index),
                 Qt::white);
  QFont bold = option.font;
  bold.setBold(true);
  bold.setPointSizeF(std::max<qreal>(bold.pointSizeF() - 1.0, 8.0));
  QRectF title = cell.partRect(WTTableCellView::Part::Name, row);
  QStyleOptionViewItem onHeader = option;  // the billed figures dimmed white, as on a selected row
  onHeader.state |= QStyle::State_Selected;
  onHeader.palette.setColor(QPalette::HighlightedText, Qt::white);
  drawBilled(painter, onHeader, index, title);
  painter.setFont(bold);
  painter.setPen(Qt::white);
  painter.drawText(title, Qt::AlignLeft | Qt::AlignVCenter, index.data(WTItemsModel::NameRole).toString());
  cell.drawFigure(painter, WTTableCellView::Part::Duration, row,
                  index.data(WTItemsModel::DurationTextRole).toString());
  cell.drawFigure(painter, WTTableCellView::Part::Cost, row,
                  index.data(WTItemsModel::CostTextRole).toString());
}

void WTItemCellDelegate::paintItem(QPainter& painter, const QStyleOptionViewItem& option,
                                   const QModelIndex& index, const WTTableCellView& cell) const {
  const QRectF row = option.rect;
  const auto* model = static_cast<const WTItemsModel*>(index.model());
  WTTableRowView rowView;
  // The groove separates items from items; above a group or a task the row ends flat.
  const QModelIndex below = view_->rowBelow(index);
  if (below.isValid()) rowView.setDrawsSeparator(model->isItemIndex(below));
  // The palette's highlight, not a grey a shade off the row's own.
  rowView.setSelectionColor(option.palette.color(QPalette::Highlight));
  rowView.draw(painter, row, isSelected(option));

  const QString kind = index.data(WTItemsModel::KindRole).toString();
  const bool running = index.data(WTItemsModel::RunningRole).toBool();
  const bool completed = index.data(WTItemsModel::CompletedRole).toBool();

  QFont small = option.font;
  small.setPointSizeF(std::max<qreal>(small.pointSizeF() - 1.0, 8.0));
  const QRectF label = cell.partRect(WTTableCellView::Part::Label, row);
  if (!label.isEmpty()) {
    const bool time = kind == QLatin1String("WTTime");
    painter.setFont(time ? option.font : small);
    painter.setPen(time ? textColour(option) : dimTextColour(option));
    // A start stands against the dash before its end.
    painter.drawText(label, (time ? Qt::AlignRight : Qt::AlignLeft) | Qt::AlignVCenter,
                     index.data(WTItemsModel::LabelRole).toString());
  }
  // A stopped entry shows where it ends; a running one ends with the clock.
  const QRectF end = cell.partRect(WTTableCellView::Part::End, row);
  const QString endText = index.data(WTItemsModel::EndTimeEditRole).toString();
  if (!end.isEmpty() && !endText.isEmpty()) {
    painter.drawText(QRectF(label.right(), row.y(), end.left() - label.right(), end.height()),
                     Qt::AlignCenter, QStringLiteral("–"));
    painter.drawText(end, Qt::AlignLeft | Qt::AlignVCenter, endText);
  }
  const QRectF box = cell.partRect(WTTableCellView::Part::Checkbox, row);
  if (!box.isEmpty()) {
    QStyleOptionButton check;
    check.rect = box.toRect();
    check.state = QStyle::State_Enabled | (completed ? QStyle::State_On : QStyle::State_Off);
    check.palette = option.palette;
    QApplication::style()->drawPrimitive(QStyle::PE_IndicatorCheckBox, &check, &painter, view_);
  }

  QRectF name = cell.partRect(WTTableCellView::Part::Name, row);
  drawBilled(painter, option, index, name);
  QFont nameFont = option.font;
  nameFont.setStrikeOut(completed);
  painter.setFont(nameFont);
  QString text = index.data(WTItemsModel::NameRole).toString();
  painter.setPen(text.isEmpty() || completed ? dimTextColour(option) : textColour(option));
  if (text.isEmpty()) text = kind == QLatin1String("WTNote") ? tr("Empty note") : tr("No description");
  painter.drawText(name, Qt::AlignLeft | Qt::AlignVCenter, elided(painter, text, name.width()));

  QFont totals = option.font;
  totals.setBold(running);
  painter.setFont(totals);
  painter.setPen(running && !isSelected(option) ? QColor(0x2f, 0x9e, 0x44) : textColour(option));
  cell.drawFigure(painter, WTTableCellView::Part::Duration, row,
                  index.data(WTItemsModel::DurationTextRole).toString());
  painter.setFont(option.font);
  painter.setPen(textColour(option));
  cell.drawFigure(painter, WTTableCellView::Part::Cost, row,
                  index.data(WTItemsModel::CostTextRole).toString());
  if (running) {
    const QRectF stop = cell.partRect(WTTableCellView::Part::TimerButton, row);
    drawImage(painter, stop.adjusted(3, 3, -3, -3), QStringLiteral("stop_32"));
  }
  if (option.state & QStyle::State_MouseOver) paintHoverBar(painter, row, cell, index);
  paintNotes(painter, row, index, cell);
}

void WTItemCellDelegate::paintNotes(QPainter& painter, const QRectF& row, const QModelIndex& index,
                                    const WTTableCellView& cell) const {
  if (isEditingNotes(index)) return;  // the editor shows them
  const QString notes = index.data(WTItemsModel::NotesRole).toString();
  if (notes.isEmpty()) return;
  const QRectF field = cell.partRect(WTTableCellView::Part::Notes, row);
  painter.save();
  painter.setClipRect(field);
  painter.setPen(RZColor::calibratedWhite(0.33));
  RZTextMeasure::textBoundsForBounds(notes, WTTableCellView::notesFont(), field.adjusted(3, 0, -3, 0),
                                     field.width() - 6, &painter);
  painter.restore();
}

void WTItemCellDelegate::paintHoverBar(QPainter& painter, const QRectF& row, const WTTableCellView& cell,
                                       const QModelIndex& index) const {
  // A field open in the row covers the buttons, and the bar's edge would show round it as a white box.
  if (lineEditorRow_.isValid() && lineEditorRow_ == index) return;
  const QRectF bar = cell.partRect(WTTableCellView::Part::HoverBar, row);
  if (bar.isEmpty()) return;
  painter.save();
  painter.setRenderHint(QPainter::Antialiasing);
  QPainterPath shape;
  shape.addRoundedRect(bar, 5, 5);
  painter.fillPath(shape, RZColor::calibratedWhite(0.98));
  painter.setPen(QPen(RZColor::calibratedWhite(0.72), 1));
  painter.drawPath(shape);
  painter.restore();
  using Part = WTTableCellView::Part;
  static const std::pair<Part, const char*> kButtons[] = {
      {Part::AddTime, "item_time"},       {Part::AddFlat, "item_flat"}, {Part::AddNote, "item_note"},
      {Part::AddExpense, "item_expense"}, {Part::AddToDo, "item_todo"}, {Part::DateButton, "calendar"},
      {Part::NotesButton, "notes"}};
  for (const auto& [part, image] : kButtons) {
    const QRectF button = cell.partRect(part, row);
    if (button.isEmpty()) continue;
    drawImage(painter, QRectF(button.center() - QPointF(8, 8), QSizeF(16, 16)), QString::fromLatin1(image));
  }
}
