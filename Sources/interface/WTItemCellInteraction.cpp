#include "WTItemCellDelegate.h"

#include "WTBudgetBar.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTNotesTextView.h"
#include "WTOutlineView.h"
#include "WTRateField.h"

#include <QHelpEvent>
#include <QKeyEvent>
#include <QLineEdit>
#include <QMouseEvent>
#include <QTimer>
#include <QToolTip>

#include <algorithm>
#include <utility>

// What a row of the items outline answers to: its editors, the tips of its parts and the clicks on its
// buttons.

namespace {

// The model role an editor's text is stored, and checked, under: that of the field it was opened on.
int editRole(const QWidget* editor) {
  switch (static_cast<WTItemCellDelegate::Field>(editor->property("field").toInt())) {
    case WTItemCellDelegate::Field::Duration:
      return WTItemsModel::DurationEditRole;
    case WTItemCellDelegate::Field::SpentDuration:
      return WTItemsModel::SpentDurationEditRole;
    case WTItemCellDelegate::Field::Start:
      return WTItemsModel::StartTimeEditRole;
    case WTItemCellDelegate::Field::End:
      return WTItemsModel::EndTimeEditRole;
    case WTItemCellDelegate::Field::Amount:
      return WTItemsModel::AmountEditRole;
    default:
      return WTItemsModel::NameRole;
  }
}

}  // namespace

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
  lineEditorRow_ = index;
  editor->setFrame(false);
  editor->setProperty("field", static_cast<int>(field));
  editor->setProperty("row", QVariant::fromValue(QPersistentModelIndex(index)));
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
  if (!notes && lineEditorRow_ == index) lineEditorRow_ = QPersistentModelIndex();
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
  model->setData(index, static_cast<QLineEdit*>(editor)->text(), editRole(editor));
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
      else if (const QVariant budget = index.data(WTItemsModel::BudgetRole); budget.isValid())
        text = budget.value<WTBudgetState>().text;
      break;
    default:
      break;
  }
  // A figure cut short shows whole in the tip, above what the tip says of it.
  if (part == Part::Duration || part == Part::Cost) {
    const int role = part == Part::Cost ? WTItemsModel::CostTextRole : WTItemsModel::DurationTextRole;
    const QString whole = cell.clippedFigure(*part, row, option.font, index.data(role).toString());
    if (!whole.isEmpty()) text = text.isEmpty() ? whole : whole + u'\n' + text;
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
    } else if (part == Part::Cost) {
      // Only an expense's amount is typed; any other comes from a duration. The name editor that a
      // double click opens elsewhere would take the digits typed for an amount as the name.
      if (items->kindAt(index) != QLatin1String("WTExpense")) return true;
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
  const QModelIndex row = line->property("row").value<QPersistentModelIndex>();
  const auto* model = qobject_cast<const WTItemsModel*>(row.model());
  if (!model) return false;
  const QString refusal = model->refusalFor(row, editRole(line), line->text());
  if (refusal.isEmpty()) return false;
  WTRateField::setRefused(line, refusal);
  // Shown once the event that asked has been delivered: asked by the field's losing the focus to the tip
  // itself, a tip replaced at once would be deleted while it is being activated.
  QTimer::singleShot(0, line, [line, refusal] {
    if (line->isVisible()) QToolTip::showText(line->mapToGlobal(QPoint(0, line->height())), refusal, line);
  });
  return true;
}

// A click or a key in the outline would commit and close the open field; while the field refuses its
// text, the event only gives the focus back to it, so what was typed stays.
bool WTItemCellDelegate::keepsRefusedEdit(const QEvent* event) {
  const QEvent::Type type = event->type();
  if (type == QEvent::MouseButtonRelease) return std::exchange(pressKept_, false);
  if (type != QEvent::MouseButtonPress && type != QEvent::MouseButtonDblClick && type != QEvent::KeyPress)
    return false;
  auto* line = qobject_cast<QLineEdit*>(view_->indexWidget(view_->currentIndex()));
  const bool kept = line && refuses(line);
  if (kept) line->setFocus(Qt::OtherFocusReason);
  if (type != QEvent::KeyPress) pressKept_ = kept;
  return kept;
}

bool WTItemCellDelegate::eventFilter(QObject* object, QEvent* event) {
  if (object == view_ || object == viewport_) return keepsRefusedEdit(event);
  // Escape leaves the notes, keeping what was typed: lines of notes are not undone by a key that, in a
  // field of several lines, is the one way out from the keyboard.
  if (object == notesEditor_ && event->type() == QEvent::KeyPress &&
      static_cast<QKeyEvent*>(event)->key() == Qt::Key_Escape) {
    auto* notes = static_cast<QWidget*>(object);
    emit commitData(notes);
    emit closeEditor(notes, QAbstractItemDelegate::NoHint);
    return true;
  }
  auto* line = qobject_cast<QLineEdit*>(object);
  if (line && (event->type() == QEvent::KeyPress || event->type() == QEvent::FocusOut)) {
    // A duration, amount or time of day that is not one stays in its field, as typed, with the reason:
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
  if ((key->key() == Qt::Key_Return || key->key() == Qt::Key_Enter) &&
      (key->modifiers() & Qt::ShiftModifier)) {
    // A new line goes on in the row's notes. Ending the field instead made the next line typed a search,
    // and the Return after it a rename that typed over the first line.
    WTObject* record = controller_->treeController()->objectAt(view_->currentIndex());
    if (!record) return QStyledItemDelegate::eventFilter(object, event);
    emit commitData(line);
    emit closeEditor(line, QAbstractItemDelegate::NoHint);
    QTimer::singleShot(0, view_, [this, record] { controller_->showNotes(record); });
    return true;
  }
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
