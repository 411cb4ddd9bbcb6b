#pragma once

#include <QFont>
#include <QRectF>
#include <QString>

#include <optional>

class QPainter;
class WTObject;

// The layout of one row of a list or of the items outline: where its icon, texts, totals and buttons
// sit, and the optional notes field under its main line that grows with its text. Rows are painted by
// delegates; one cell view per kind of row, set to a row's width and object, answers what the row
// needs (its height above all).
//
// The identifier names the kind: "Project" and "Client" in the lists; "WTTask", "WTItemContainer",
// "WTTime", "WTFlat", "WTNote", "WTExpense" and "WTToDo" in the outline.
class WTTableCellView {
 public:
  enum class Part {
    Disclosure,
    Icon,
    Label,     // a time entry's start, another item's kind
    End,       // a time entry's end
    Name,      // the main, editable text
    Subtitle,  // a project's client chooser, a client's project count
    Duration,
    Cost,
    Checkbox,     // to-dos
    TimerButton,  // tasks, and running time entries (stop)
    OpenButton,   // projects: open the items outline
    HoverBar,     // the whole bar of buttons shown while the mouse is over the row
    AddTime,
    AddFlat,
    AddNote,
    AddExpense,
    AddToDo,
    DateButton,
    NotesButton,
    Notes,
    BudgetBar,  // tasks and projects: under the cost
  };

  explicit WTTableCellView(const QString& identifier);

  QString identifier() const { return identifier_; }
  bool isItem() const;
  bool hasNotesField() const { return isItem() || identifier_ == QLatin1String("WTTask"); }

  // The cell's frame; only its width changes the layout. Setting it re-measures the notes.
  QRectF frame() const { return frame_; }
  void setFrame(const QRectF& frame);
  // The frame of the row without notes: its height is the main line's.
  QRectF initialFrame() const;

  QString notes() const { return notes_; }
  void setNotes(const QString& notes);

  // The notes field sits under the main line, between 20 and 300 points high; re-measured from the text.
  QRectF notesFrame() const { return notesFrame_; }
  void adjustTextViewHeight();
  // The row's height: the main line's, plus the notes field and its margin when there is text or the
  // notes are being edited.
  qreal requestedHeight(bool editing) const;

  // Where `part` lies for a row occupying `row` (the full row, all columns); an empty rectangle when
  // the kind has no such part. `depth` indents outline rows.
  QRectF partRect(Part part, const QRectF& row) const;
  // The button or field under `point` in a row at `row`; `hoverShown` tells whether the hover bar is
  // visible (its buttons answer only then).
  std::optional<Part> partAt(const QPointF& point, const QRectF& row, bool hoverShown) const;

  // Draws a duration or an amount right-aligned in its part of `row`. One too wide keeps its leading
  // digits and ends in "…", rather than losing them at the left edge, where 100,000,000,080.82 read as
  // 80.82.
  void drawFigure(QPainter& painter, Part part, const QRectF& row, const QString& text) const;
  // The figure drawn so, when it does not fit in `font` (bold, as totals are, to be sure) and a tip is to
  // show it whole; empty when it fits.
  QString clippedFigure(Part part, const QRectF& row, QFont font, const QString& text) const;

  static QFont notesFont();
  static constexpr qreal kMinimumNotesHeight = 20.0;
  static constexpr qreal kMaximumNotesHeight = 300.0;
  static constexpr qreal kNotesBottomMargin = 4.0;

 private:
  qreal mainHeight() const;
  qreal textX() const;

  QString identifier_;
  QRectF frame_;
  QString notes_;
  QRectF notesFrame_;
};
