#pragma once

#include "WTBudget.h"

#include <QMetaType>
#include <QString>

#include <optional>

class QPainter;
class QPalette;
class QRectF;
class WTObject;

// Where a task's or project's billed cost stands against its budget, as its row shows it: a thin bar
// under the cost, and a tip with the share and what is left.
struct WTBudgetState {
  double fraction = 0;  // 1.0 is the whole budget
  WTBudget::Level level = WTBudget::Level::Within;
  QString text;  // "72 % of the budget of 1,000.00 · 280.00 left"
};
Q_DECLARE_METATYPE(WTBudgetState)

namespace WTBudgetBar {

// None without a budget above zero.
std::optional<WTBudgetState> stateOf(const WTObject* object);
// The same as a model's value: invalid without a budget.
QVariant variantOf(const WTObject* object);

// The bar in `rect`: the palette's highlight (its text colour on a selected row) within the budget,
// amber from 80 %, red past the whole, over a faint track.
void paint(QPainter& painter, const QRectF& rect, const WTBudgetState& state, const QPalette& palette,
           bool selected);

}  // namespace WTBudgetBar
