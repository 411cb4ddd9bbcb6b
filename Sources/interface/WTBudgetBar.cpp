#include "WTBudgetBar.h"

#include "WTObject.h"

#include <QPainter>
#include <QPainterPath>
#include <QPalette>
#include <QVariant>

#include <algorithm>

namespace WTBudgetBar {

std::optional<WTBudgetState> stateOf(const WTObject* object) {
  const std::optional<Decimal> budget = WTBudget::budget(object);
  const Decimal billed = WTBudget::billed(object);
  const std::optional<WTBudget::Level> level = WTBudget::level(billed, budget);
  if (!level) return std::nullopt;
  WTBudgetState state;
  state.fraction = *WTBudget::fraction(billed, budget);
  state.level = *level;
  state.text = WTBudget::standing(object);
  return state;
}

QVariant variantOf(const WTObject* object) {
  const std::optional<WTBudgetState> state = stateOf(object);
  return state ? QVariant::fromValue(*state) : QVariant();
}

void paint(QPainter& painter, const QRectF& rect, const WTBudgetState& state, const QPalette& palette,
           bool selected) {
  if (rect.isEmpty()) return;
  QColor fill;
  switch (state.level) {
    case WTBudget::Level::Within:
      fill = palette.color(selected ? QPalette::HighlightedText : QPalette::Highlight);
      break;
    case WTBudget::Level::Warning:
      fill = QColor(0xe8, 0x9a, 0x00);
      break;
    case WTBudget::Level::Over:
      fill = QColor(0xd0, 0x30, 0x30);
      break;
  }
  QColor track = palette.color(selected ? QPalette::HighlightedText : QPalette::Text);
  track.setAlphaF(0.15f);
  painter.save();
  painter.setRenderHint(QPainter::Antialiasing);
  painter.setPen(Qt::NoPen);
  const qreal radius = rect.height() / 2.0;
  painter.setBrush(track);
  painter.drawRoundedRect(rect, radius, radius);
  const qreal share = std::clamp(state.fraction, 0.0, 1.0);
  if (share > 0) {
    painter.setBrush(fill);
    painter.drawRoundedRect(
        QRectF(rect.x(), rect.y(), std::max(rect.width() * share, rect.height()), rect.height()), radius,
        radius);
  }
  painter.restore();
}

}  // namespace WTBudgetBar
