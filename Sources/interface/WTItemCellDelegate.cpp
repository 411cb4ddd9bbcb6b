#include "WTItemCellDelegate.h"

#include "RZColor.h"
#include "RZTextMeasure.h"
#include "WTImages.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTNotesTextView.h"
#include "WTOutlineView.h"
#include "WTRateField.h"
#include "WTTableRowView.h"

#include <QApplication>
#include <QHelpEvent>
#include <QKeyEvent>
#include <QLineEdit>
#include <QMouseEvent>
#include <QPainter>
#include <QPainterPath>
#include <QTimer>
#include <QToolTip>

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

}  // namespace

WTItemCellDelegate::WTItemCellDelegate(WTItemsViewController* controller, WTOutlineView* view)
    : QStyledItemDelegate(view), controller_(controller), view_(view) {}

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
  painter.setFont(bold);
  const QRectF name = cell.partRect(WTTableCellView::Part::Name, row);
  QString title = index.data(WTItemsModel::NameRole).toString();
  painter.setPen(title.isEmpty() ? dimTextColour(option) : textColour(option));
  if (title.isEmpty()) title = tr("Untitled Task");
  painter.drawText(name, Qt::AlignLeft | Qt::AlignVCenter, elided(painter, title, name.width()));

  painter.setFont(option.font);
  painter.setPen(textColour(option));
  painter.drawText(cell.partRect(WTTableCellView::Part::Duration, row), Qt::AlignRight | Qt::AlignVCenter,
                   index.data(WTItemsModel::DurationTextRole).toString());
  painter.drawText(cell.partRect(WTTableCellView::Part::Cost, row), Qt::AlignRight | Qt::AlignVCenter,
                   index.data(WTItemsModel::CostTextRole).toString());
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
  if (view_->dropTargetIndex() == index) {
    header.drawDraggingDestinationFeedbackInRect(painter, row.adjusted(2, 1, -2, -1),
                                                 option.palette.color(QPalette::Highlight));
  }
  drawDisclosure(painter, cell.partRect(WTTableCellView::Part::Disclosure, row), view_->isExpanded(index),
                 Qt::white);
  QFont bold = option.font;
  bold.setBold(true);
  bold.setPointSizeF(std::max<qreal>(bold.pointSizeF() - 1.0, 8.0));
  painter.setFont(bold);
  painter.setPen(Qt::white);
  const QRectF title = cell.partRect(WTTableCellView::Part::Name, row);
  painter.drawText(title, Qt::AlignLeft | Qt::AlignVCenter, index.data(WTItemsModel::NameRole).toString());
  painter.drawText(cell.partRect(WTTableCellView::Part::Duration, row), Qt::AlignRight | Qt::AlignVCenter,
                   index.data(WTItemsModel::DurationTextRole).toString());
  painter.drawText(cell.partRect(WTTableCellView::Part::Cost, row), Qt::AlignRight | Qt::AlignVCenter,
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

  QFont nameFont = option.font;
  nameFont.setStrikeOut(completed);
  painter.setFont(nameFont);
  const QRectF name = cell.partRect(WTTableCellView::Part::Name, row);
  QString text = index.data(WTItemsModel::NameRole).toString();
  painter.setPen(text.isEmpty() || completed ? dimTextColour(option) : textColour(option));
  if (text.isEmpty()) text = kind == QLatin1String("WTNote") ? tr("Empty note") : tr("No description");
  painter.drawText(name, Qt::AlignLeft | Qt::AlignVCenter, elided(painter, text, name.width()));

  QFont totals = option.font;
  totals.setBold(running);
  painter.setFont(totals);
  painter.setPen(running && !isSelected(option) ? QColor(0x2f, 0x9e, 0x44) : textColour(option));
  painter.drawText(cell.partRect(WTTableCellView::Part::Duration, row), Qt::AlignRight | Qt::AlignVCenter,
                   index.data(WTItemsModel::DurationTextRole).toString());
  painter.setFont(option.font);
  painter.setPen(textColour(option));
  painter.drawText(cell.partRect(WTTableCellView::Part::Cost, row), Qt::AlignRight | Qt::AlignVCenter,
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
  Q_UNUSED(index);
  for (const auto& [part, image] : kButtons) {
    const QRectF button = cell.partRect(part, row);
    if (button.isEmpty()) continue;
    drawImage(painter, QRectF(button.center() - QPointF(8, 8), QSizeF(16, 16)), QString::fromLatin1(image));
  }
}

QWidget* WTItemCellDelegate::createEditor(QWidget* parent, const QStyleOptionViewItem&,
                                          const QModelIndex& index) const {
  const auto* model = static_cast<const WTItemsModel*>(index.model());
  Field field = field_;
  const_cast<WTItemCellDelegate*>(this)->field_ = Field::Name;
  const QString kind = model->kindAt(index);
  if (field == Field::Duration && kind != QLatin1String("WTTime") && kind != QLatin1String("WTFlat")) {
    field = Field::Name;
  }
  if (field == Field::Amount && kind != QLatin1String("WTExpense")) field = Field::Name;
  if ((field == Field::Start || field == Field::End || field == Field::SpentDuration) &&
      kind != QLatin1String("WTTime")) {
    field = Field::Name;
  }
  // A running entry's end and length are the clock's.
  if ((field == Field::Duration || field == Field::End || field == Field::SpentDuration) &&
      index.data(WTItemsModel::RunningRole).toBool()) {
    return nullptr;
  }
  openField_ = field;
  if (field == Field::Notes) {
    auto* editor = new WTNotesTextView(parent);
    notesEditor_ = editor;
    notesIndex_ = index;
    QPersistentModelIndex row = index;
    connect(editor, &WTNotesTextView::heightChangeRequested, this, [this, row] {
      if (row.isValid()) emit const_cast<WTItemCellDelegate*>(this)->rowHeightChanged(row);
    });
    return editor;
  }
  auto* editor = new QLineEdit(parent);
  editor->setFrame(false);
  editor->setProperty("field", static_cast<int>(field));
  if (field == Field::Name) {
    editor->setObjectName(QStringLiteral("nameEditor"));
    QFont font = editor->font();
    font.setBold(model->isTaskIndex(index));
    editor->setFont(font);
  } else {
    switch (field) {
      case Field::Duration:
      case Field::SpentDuration:
        editor->setObjectName(QStringLiteral("durationEditor"));
        break;
      case Field::Start:
        editor->setObjectName(QStringLiteral("startEditor"));
        break;
      case Field::End:
        editor->setObjectName(QStringLiteral("endEditor"));
        break;
      default:
        editor->setObjectName(QStringLiteral("amountEditor"));
        break;
    }
    editor->setAlignment(Qt::AlignRight | Qt::AlignVCenter);
    connect(editor, &QLineEdit::textEdited, editor, [editor] { WTRateField::setRefused(editor, {}); });
  }
  return editor;
}

void WTItemCellDelegate::destroyEditor(QWidget* editor, const QModelIndex& index) const {
  const bool notes = editor == notesEditor_;
  QStyledItemDelegate::destroyEditor(editor, index);
  if (notes) {
    notesEditor_ = nullptr;
    const QPersistentModelIndex row = std::exchange(notesIndex_, QPersistentModelIndex());
    // Without text the field hides and the row shrinks back.
    if (row.isValid()) emit const_cast<WTItemCellDelegate*>(this)->rowHeightChanged(row);
  }
}

void WTItemCellDelegate::setEditorData(QWidget* editor, const QModelIndex& index) const {
  // A row's repaint must not undo what is being typed.
  if (editor->property("loaded").toBool()) return;
  editor->setProperty("loaded", true);
  if (auto* notes = qobject_cast<WTNotesTextView*>(editor)) {
    notes->setPlainText(index.data(WTItemsModel::NotesRole).toString());
    notes->moveCursor(QTextCursor::End);
    return;
  }
  auto* line = static_cast<QLineEdit*>(editor);
  switch (static_cast<Field>(editor->property("field").toInt())) {
    case Field::Duration:
    case Field::SpentDuration:
      line->setText(index.data(WTItemsModel::DurationEditRole).toString());
      break;
    case Field::End:
      line->setText(index.data(WTItemsModel::EndTimeEditRole).toString());
      break;
    case Field::Amount:
      line->setText(index.data(WTItemsModel::AmountEditRole).toString());
      break;
    case Field::Start:
      line->setText(index.data(WTItemsModel::StartTimeEditRole).toString());
      break;
    default:
      line->setText(index.data(WTItemsModel::NameRole).toString());
      break;
  }
  line->selectAll();
}

void WTItemCellDelegate::setModelData(QWidget* editor, QAbstractItemModel* model,
                                      const QModelIndex& index) const {
  if (auto* notes = qobject_cast<WTNotesTextView*>(editor)) {
    model->setData(index, notes->toPlainText(), WTItemsModel::NotesRole);
    return;
  }
  auto* line = static_cast<QLineEdit*>(editor);
  switch (static_cast<Field>(editor->property("field").toInt())) {
    case Field::Duration:
      model->setData(index, line->text(), WTItemsModel::DurationEditRole);
      break;
    case Field::SpentDuration:
      model->setData(index, line->text(), WTItemsModel::SpentDurationEditRole);
      break;
    case Field::End:
      model->setData(index, line->text(), WTItemsModel::EndTimeEditRole);
      break;
    case Field::Amount:
      model->setData(index, line->text(), WTItemsModel::AmountEditRole);
      break;
    case Field::Start:
      model->setData(index, line->text(), WTItemsModel::StartTimeEditRole);
      break;
    default:
      model->setData(index, line->text(), WTItemsModel::NameRole);
      break;
  }
}

void WTItemCellDelegate::updateEditorGeometry(QWidget* editor, const QStyleOptionViewItem& option,
                                              const QModelIndex& index) const {
  const WTTableCellView& cell = controller_->cellViewPrototypeForIndex(index);
  const QRectF row(0, option.rect.y(), view_->viewport()->width(), option.rect.height());
  if (editor == notesEditor_) {
    editor->setGeometry(cell.partRect(WTTableCellView::Part::Notes, row).toRect());
    return;
  }
  WTTableCellView::Part part = WTTableCellView::Part::Name;
  switch (static_cast<Field>(editor->property("field").toInt())) {
    case Field::Duration:
    case Field::SpentDuration:
      part = WTTableCellView::Part::Duration;
      break;
    case Field::End:
      part = WTTableCellView::Part::End;
      break;
    case Field::Amount:
      part = WTTableCellView::Part::Cost;
      break;
    case Field::Start:
      part = WTTableCellView::Part::Label;
      break;
    default:
      break;
  }
  QRectF rect = cell.partRect(part, row);
  rect.setHeight(std::min<qreal>(rect.height(), 24.0));
  rect.moveTop(row.y() + (cell.initialFrame().height() - rect.height()) / 2.0);
  editor->setGeometry(rect.toRect().adjusted(-3, 0, 3, 0));
}

bool WTItemCellDelegate::helpEvent(QHelpEvent* event, QAbstractItemView* view,
                                   const QStyleOptionViewItem& option, const QModelIndex& index) {
  if (event->type() != QEvent::ToolTip || !index.isValid())
    return QStyledItemDelegate::helpEvent(event, view, option, index);
  const QRectF row(0, option.rect.y(), view_->viewport()->width(), option.rect.height());
  const WTTableCellView& cell = controller_->cellViewPrototypeForIndex(index);
  const auto part = cell.partAt(event->pos(), row, view_->hoverIndex() == index);
  QString text;
  using Part = WTTableCellView::Part;
  switch (part.value_or(Part::Name)) {
    case Part::TimerButton:
      text = index.data(Qt::ToolTipRole).toString();
      if (text.isEmpty()) text = tr("Stop");
      break;
    case Part::AddTime:
      text = tr("New Time Entry");
      break;
    case Part::AddFlat:
      text = tr("New Flat Fee");
      break;
    case Part::AddNote:
      text = tr("New Note");
      break;
    case Part::AddExpense:
      text = tr("New Expense");
      break;
    case Part::AddToDo:
      text = tr("New To-Do");
      break;
    case Part::DateButton:
      text = index.data(WTItemsModel::KindRole).toString() == QLatin1String("WTTime")
                 ? tr("Move to Another Day — the times of day and the duration stay")
                 : tr("Move to Another Day");
      break;
    case Part::NotesButton:
      text = tr("Notes");
      break;
    case Part::Duration: {
      // Nothing on the row says these can be changed; the tip does.
      const QString kind = index.data(WTItemsModel::KindRole).toString();
      const bool stopped = !index.data(WTItemsModel::RunningRole).toBool();
      if (stopped && kind == QLatin1String("WTTime"))
        text = tr("Duration — double-click to change it (hours:minutes); the start stays, the end moves");
      else if (kind == QLatin1String("WTFlat"))
        text = tr("Duration — double-click to change it (hours:minutes)");
      break;
    }
    case Part::Label:
      if (index.data(WTItemsModel::KindRole).toString() == QLatin1String("WTTime"))
        text = tr("Start — double-click to change it (hours:minutes); the end stays, the duration follows");
      break;
    case Part::End:
      if (!index.data(WTItemsModel::EndTimeEditRole).toString().isEmpty())
        text = tr("End — double-click to change it (hours:minutes); the start stays, the duration follows");
      break;
    case Part::Cost:
      if (index.data(WTItemsModel::KindRole).toString() == QLatin1String("WTExpense"))
        text = tr("Amount — double-click to change it");
      break;
    default:
      break;
  }
  if (text.isEmpty()) {
    QToolTip::hideText();
    event->ignore();
  } else {
    QToolTip::showText(event->globalPos(), text, view, cell.partRect(*part, row).toRect());
  }
  return true;
}

bool WTItemCellDelegate::editorEvent(QEvent* event, QAbstractItemModel* model,
                                     const QStyleOptionViewItem& option, const QModelIndex& index) {
  const auto type = event->type();
  if (type != QEvent::MouseButtonPress && type != QEvent::MouseButtonRelease &&
      type != QEvent::MouseButtonDblClick) {
    return QStyledItemDelegate::editorEvent(event, model, option, index);
  }
  auto* mouse = static_cast<QMouseEvent*>(event);
  if (mouse->button() != Qt::LeftButton) return false;
  const QRectF row(0, option.rect.y(), view_->viewport()->width(), option.rect.height());
  const WTTableCellView& cell = controller_->cellViewPrototypeForIndex(index);
  const bool hover = view_->hoverIndex() == index;
  const auto part = cell.partAt(mouse->position(), row, hover);
  using Part = WTTableCellView::Part;
  const bool button = part && *part != Part::Name && *part != Part::Duration && *part != Part::Cost &&
                      *part != Part::Icon && *part != Part::Label && *part != Part::End &&
                      *part != Part::Notes;
  if (button) {
    // Buttons act on press, like the toolbar's; the release and double click are theirs too.
    if (type == QEvent::MouseButtonPress)
      emit partActivated(index, *part, cell.partRect(*part, row).toRect());
    return true;
  }
  if (type == QEvent::MouseButtonDblClick) {
    const auto* items = static_cast<const WTItemsModel*>(model);
    if (part == Part::Duration) {
      setEditField(Field::Duration);
    } else if (part == Part::Cost && items->kindAt(index) == QLatin1String("WTExpense")) {
      setEditField(Field::Amount);
    } else if (part == Part::Label && items->kindAt(index) == QLatin1String("WTTime")) {
      setEditField(Field::Start);
    } else if (part == Part::End && items->kindAt(index) == QLatin1String("WTTime")) {
      setEditField(Field::End);
    } else if (part == Part::Notes) {
      setEditField(Field::Notes);
    } else if (part == Part::Name && items->objectAt(index)) {
      setEditField(Field::Name);
    } else if (items->isTaskIndex(index) || items->isContainerIndex(index)) {
      view_->setExpanded(index, !view_->isExpanded(index));
      return true;
    }
  }
  return false;
}

bool WTItemCellDelegate::refuses(QLineEdit* line) const {
  const auto field = static_cast<Field>(line->property("field").toInt());
  if (field != Field::Duration && field != Field::Amount) return false;
  const QString refusal = WTItemsModel::refusalFor(
      field == Field::Duration ? WTItemsModel::DurationEditRole : WTItemsModel::AmountEditRole, line->text());
  if (refusal.isEmpty()) return false;
  WTRateField::setRefused(line, refusal);
  if (line->isVisible())
    QToolTip::showText(line->mapToGlobal(QPoint(0, line->height())), refusal, line);
  return true;
}

bool WTItemCellDelegate::eventFilter(QObject* object, QEvent* event) {
  auto* line = qobject_cast<QLineEdit*>(object);
  if (line && (event->type() == QEvent::KeyPress || event->type() == QEvent::FocusOut)) {
    // A duration or amount that is not one stays in its field, as typed, with the reason in view:
    // neither Return, Tab nor leaving the field stores it or throws it away.
    const bool ends = event->type() == QEvent::FocusOut || [&] {
      const int key = static_cast<QKeyEvent*>(event)->key();
      return key == Qt::Key_Return || key == Qt::Key_Enter || key == Qt::Key_Tab || key == Qt::Key_Backtab;
    }();
    // The field itself still hears of losing the focus; only the commit and close are held back.
    if (ends && refuses(line)) return event->type() == QEvent::KeyPress;
  }
  if (!line || event->type() != QEvent::KeyPress) return QStyledItemDelegate::eventFilter(object, event);
  const auto* key = static_cast<QKeyEvent*>(event);
  const bool forward = key->key() == Qt::Key_Tab && !(key->modifiers() & Qt::ShiftModifier);
  const bool backward = key->key() == Qt::Key_Backtab || (key->key() == Qt::Key_Tab && !forward);
  if (!forward && !backward) return QStyledItemDelegate::eventFilter(object, event);
  const QPersistentModelIndex index = view_->currentIndex();
  const auto* model = qobject_cast<const WTItemsModel*>(index.model());
  if (!model || !model->isItemIndex(index)) return QStyledItemDelegate::eventFilter(object, event);
  // The fields of the row in the order they are typed: a time entry's times before its name.
  const QString kind = model->kindAt(index);
  const bool running = index.data(WTItemsModel::RunningRole).toBool();
  QList<Field> fields;
  if (kind == QLatin1String("WTTime")) {
    fields = running ? QList<Field>{Field::Start, Field::Name}
                     : QList<Field>{Field::Start, Field::End, Field::Duration, Field::Name};
  } else {
    fields = {Field::Name};
    if (kind == QLatin1String("WTFlat")) fields.append(Field::Duration);
    if (kind == QLatin1String("WTExpense")) fields.append(Field::Amount);
  }
  Field current = static_cast<Field>(line->property("field").toInt());
  if (current == Field::SpentDuration) current = Field::Duration;
  const int at = fields.indexOf(current);
  const int next = at + (forward ? 1 : -1);
  if (at < 0 || next < 0 || next >= fields.size()) return QStyledItemDelegate::eventFilter(object, event);
  WTObject* item = model->objectAt(index);
  emit commitData(line);
  emit closeEditor(line, QAbstractItemDelegate::NoHint);
  const Field field = fields[next];
  QTimer::singleShot(0, view_, [this, item, field] {
    // What was typed may have moved the entry to another day's group: its row is looked up again.
    WTItemsModel* items = controller_->treeController();
    items->processChanges();
    const QModelIndex row = items->indexOfObject(item);
    if (!row.isValid()) return;
    controller_->expandContainerOfItem(static_cast<WTItem*>(item));
    view_->setCurrentIndex(row);
    setEditField(field);
    view_->edit(row);
  });
  return true;
}
