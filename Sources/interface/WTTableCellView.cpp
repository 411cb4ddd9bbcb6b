#include "WTTableCellView.h"

#include "RZTextMeasure.h"
#include "WTObject.h"

#include <QApplication>
#include <QFontDatabase>
#include <QFontMetricsF>
#include <QPainter>

#include <algorithm>

namespace {

constexpr qreal kButton = 22.0;
constexpr qreal kSmallButton = 20.0;
constexpr qreal kTimer = 26.0;
constexpr qreal kCostWidth = 96.0;
constexpr qreal kDurationWidth = 64.0;
constexpr qreal kRightMargin = 44.0;  // room for the timer, stop or open button
constexpr qreal kLabelX = 40.0;
constexpr qreal kClockWidth = 42.0;  // "23:59"
constexpr qreal kDashWidth = 12.0;   // between a time entry's start and end

QRectF centredSquare(qreal x, const QRectF& line, qreal side) {
  return QRectF(x, line.y() + (line.height() - side) / 2.0, side, side);
}

}  // namespace

WTTableCellView::WTTableCellView(const QString& identifier) : identifier_(identifier) {
  frame_ = QRectF(0, 0, 600, mainHeight());
  adjustTextViewHeight();
}

bool WTTableCellView::isItem() const {
  return identifier_ == QLatin1String("WTTime") || identifier_ == QLatin1String("WTFlat") ||
         identifier_ == QLatin1String("WTNote") || identifier_ == QLatin1String("WTExpense") ||
         identifier_ == QLatin1String("WTToDo");
}

qreal WTTableCellView::mainHeight() const {
  if (identifier_ == QLatin1String("Project") || identifier_ == QLatin1String("Client")) return 48.0;
  if (identifier_ == QLatin1String("WTTask")) return 36.0;
  if (identifier_ == QLatin1String("WTItemContainer")) return 22.0;
  return 30.0;
}

qreal WTTableCellView::textX() const {
  if (identifier_ == QLatin1String("WTTask")) return 50.0;
  if (identifier_ == QLatin1String("WTItemContainer")) return 40.0;
  if (identifier_ == QLatin1String("Project") || identifier_ == QLatin1String("Client")) return 54.0;
  if (identifier_ == QLatin1String("WTTime")) return kLabelX + 2 * kClockWidth + kDashWidth + 10.0;
  return 96.0;  // other items: after their kind
}

void WTTableCellView::setFrame(const QRectF& frame) {
  const bool widthChanged = frame.width() != frame_.width();
  frame_ = frame;
  if (widthChanged) adjustTextViewHeight();
}

QRectF WTTableCellView::initialFrame() const {
  return QRectF(frame_.x(), frame_.y(), frame_.width(), mainHeight());
}

void WTTableCellView::setNotes(const QString& notes) {
  if (notes == notes_ && !notesFrame_.isNull()) return;
  notes_ = notes;
  adjustTextViewHeight();
}

QFont WTTableCellView::notesFont() {
  QFont font = QApplication::font();
  font.setPointSizeF(std::max<qreal>(font.pointSizeF() - 1.0, 8.0));
  return font;
}

void WTTableCellView::adjustTextViewHeight() {
  if (!hasNotesField()) {
    notesFrame_ = QRectF();
    return;
  }
  const qreal x = textX();
  const qreal width = std::max<qreal>(frame_.width() - x - kRightMargin, 40.0);
  // The field's own padding (a few points around the text) is part of what the text needs.
  constexpr qreal kPadding = 12.0;
  const QRectF measured =
      RZTextMeasure::textBoundsForBounds(notes_, notesFont(), QRectF(x, 0, width, 0), width - kPadding);
  const qreal height = std::clamp(measured.height() + kPadding, kMinimumNotesHeight, kMaximumNotesHeight);
  notesFrame_ = QRectF(x, mainHeight(), width, height);
}

qreal WTTableCellView::requestedHeight(bool editing) const {
  const qreal height = mainHeight();
  if (!hasNotesField() || (notes_.isEmpty() && !editing)) return height;
  return height + notesFrame_.height() + kNotesBottomMargin;
}

QRectF WTTableCellView::partRect(Part part, const QRectF& row) const {
  const QRectF line(row.x(), row.y(), row.width(), mainHeight());
  const qreal right = row.x() + row.width();
  const qreal costX = right - kRightMargin - kCostWidth;
  const qreal durationX = costX - 8.0 - kDurationWidth;
  const QString& id = identifier_;
  const bool list = id == QLatin1String("Project") || id == QLatin1String("Client");
  const bool task = id == QLatin1String("WTTask");
  const bool group = id == QLatin1String("WTItemContainer");
  const bool item = isItem();
  const bool hasTotals = !(id == QLatin1String("WTNote") || id == QLatin1String("WTToDo"));

  switch (part) {
    case Part::Disclosure:
      if (task) return centredSquare(row.x() + 8.0, line, 12.0);
      if (group) return centredSquare(row.x() + 24.0, line, 12.0);
      return {};
    case Part::Icon:
      if (list) return centredSquare(row.x() + 12.0, line, 32.0);
      if (task) return centredSquare(row.x() + 22.0, line, 24.0);
      return {};
    case Part::Label:
      if (!item || id == QLatin1String("WTToDo")) return {};
      if (id == QLatin1String("WTTime"))
        return QRectF(row.x() + kLabelX, line.y(), kClockWidth, line.height());
      return QRectF(row.x() + kLabelX, line.y(), 52.0, line.height());
    case Part::End:
      if (id != QLatin1String("WTTime")) return {};
      return QRectF(row.x() + kLabelX + kClockWidth + kDashWidth, line.y(), kClockWidth, line.height());
    case Part::Checkbox:
      if (id != QLatin1String("WTToDo")) return {};
      return centredSquare(row.x() + 58.0, line, 16.0);
    case Part::Name: {
      const qreal x = row.x() + textX();
      if (list) return QRectF(x, line.y() + 4.0, std::max<qreal>(durationX - x - 8.0, 40.0), 22.0);
      const qreal end = hasTotals ? durationX - 8.0 : right - kRightMargin;
      return QRectF(x, line.y() + 3.0, std::max<qreal>(end - x, 40.0), line.height() - 6.0);
    }
    case Part::Subtitle:
      if (!list) return {};
      return QRectF(row.x() + textX() - 4.0, line.y() + 26.0,
                    std::max<qreal>(durationX - textX() - 4.0, 40.0), 18.0);
    case Part::Duration:
      if (!hasTotals || id == QLatin1String("WTExpense")) return {};
      return QRectF(durationX, line.y(), kDurationWidth, line.height());
    case Part::Cost:
      if (!hasTotals) return {};
      return QRectF(costX, line.y(), kCostWidth, line.height());
    case Part::TimerButton:
      if (task || id == QLatin1String("WTTime")) return centredSquare(right - 8.0 - kTimer, line, kTimer);
      return {};
    case Part::OpenButton:
      if (id != QLatin1String("Project")) return {};
      return centredSquare(right - 30.0, line, 18.0);
    case Part::HoverBar: {
      if (task) {
        const qreal width = 5 * kButton + 4 * 2.0 + 8.0;
        return QRectF(durationX - 8.0 - width, line.y() + (line.height() - kButton - 6.0) / 2.0, width,
                      kButton + 6.0);
      }
      if (item) {
        const qreal width = 2 * kSmallButton + 2.0 + 8.0;
        const qreal end = hasTotals ? durationX - 8.0 : right - kRightMargin;
        return QRectF(end - width, line.y() + (line.height() - kSmallButton - 6.0) / 2.0, width,
                      kSmallButton + 6.0);
      }
      return {};
    }
    case Part::AddTime:
    case Part::AddFlat:
    case Part::AddNote:
    case Part::AddExpense:
    case Part::AddToDo: {
      if (!task) return {};
      const QRectF bar = partRect(Part::HoverBar, row);
      const int index = static_cast<int>(part) - static_cast<int>(Part::AddTime);
      return QRectF(bar.x() + 4.0 + index * (kButton + 2.0), bar.y() + 3.0, kButton, kButton);
    }
    case Part::DateButton:
    case Part::NotesButton: {
      if (!item) return {};
      const QRectF bar = partRect(Part::HoverBar, row);
      const int index = part == Part::DateButton ? 0 : 1;
      return QRectF(bar.x() + 4.0 + index * (kSmallButton + 2.0), bar.y() + 3.0, kSmallButton, kSmallButton);
    }
    case Part::Notes:
      if (!hasNotesField()) return {};
      return notesFrame_.translated(row.x(), row.y());
    case Part::BudgetBar: {
      if (!task && id != QLatin1String("Project")) return {};
      // Under the cost's figures, as wide as a four-figure amount and ending with them.
      constexpr qreal kBarWidth = 64.0;
      return QRectF(costX + kCostWidth - kBarWidth, line.y() + line.height() / 2.0 + 10.0, kBarWidth, 3.0);
    }
  }
  return {};
}

std::optional<WTTableCellView::Part> WTTableCellView::partAt(const QPointF& point, const QRectF& row,
                                                             bool hoverShown) const {
  static constexpr Part kHoverParts[] = {Part::AddTime, Part::AddFlat,    Part::AddNote,    Part::AddExpense,
                                         Part::AddToDo, Part::DateButton, Part::NotesButton};
  if (hoverShown) {
    for (Part part : kHoverParts) {
      if (partRect(part, row).contains(point)) return part;
    }
  }
  static constexpr Part kParts[] = {Part::Disclosure, Part::Checkbox, Part::TimerButton, Part::OpenButton,
                                    Part::Subtitle,   Part::Duration, Part::Cost,        Part::Name,
                                    Part::Icon,       Part::Label,    Part::End,         Part::Notes};
  for (Part part : kParts) {
    if (partRect(part, row).contains(point)) return part;
  }
  return std::nullopt;
}

void WTTableCellView::drawFigure(QPainter& painter, Part part, const QRectF& row, const QString& text) const {
  const QRectF rect = partRect(part, row);
  painter.drawText(rect, Qt::AlignRight | Qt::AlignVCenter,
                   QFontMetricsF(painter.font()).elidedText(text, Qt::ElideRight, rect.width()));
}

QString WTTableCellView::clippedFigure(Part part, const QRectF& row, QFont font, const QString& text) const {
  font.setBold(true);
  return QFontMetricsF(font).horizontalAdvance(text) > partRect(part, row).width() ? text : QString();
}
