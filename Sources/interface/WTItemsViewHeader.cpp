#include "WTItemsViewController.h"

#include "DurationText.h"
#include "MoneyFormat.h"
#include "RZBackgroundView.h"
#include "WTClient.h"
#include "WTItemsModel.h"
#include "WTOutlineView.h"
#include "WTProject.h"
#include "WTRateField.h"
#include "WTTableCellView.h"

#include <QEvent>
#include <QLabel>
#include <QLayout>
#include <QLineEdit>

#include <algorithm>

// The header over the outline: the project's name and client, cut to fit with the whole text as a
// tip, its totals standing over the rows' duration and cost columns, and its rate field.

void WTItemsViewController::refreshHeader() {
  if (!titleLabel_) return;
  if (!project_) {
    setElidedText(titleLabel_, QString());
    setElidedText(clientLabel_, QString());
    setElidedText(totalsLabel_, QString());
    setElidedText(durationLabel_, QString());
    rateField_->clear();
    WTRateField::setRefused(rateField_, {});
    return;
  }
  setElidedText(titleLabel_, project_->name().isEmpty() ? tr("Untitled Project") : project_->name());
  QString client = project_->client() ? project_->client()->name() : tr("No Client");
  if (project_->archived()) client += QStringLiteral(" — ") + tr("Archived");
  const QString billed =
      WTItemsModel::billedText(std::pair(project_->duration(), project_->billedDuration()), project_->cost(),
                               project_->billedCost(), project_->billingCurrency());
  if (!billed.isEmpty()) client += QStringLiteral(" · ") + billed;
  setElidedText(clientLabel_, client);
  setElidedText(durationLabel_, DurationText::stringWithMinutes(project_->duration()));
  setElidedText(totalsLabel_, MoneyFormat::format(project_->cost(), project_->billingCurrency()));
  WTRateField::setPlaceholder(rateField_, WTRateField::placeholder(project_));
  // The field shows the rate as it is now (a sync or an undo may change it), unless the user has typed
  // into it: that text stays, a refused one too, so the mistake is in view.
  if (!rateField_->isModified()) showStoredRate();
}

namespace {

const char* const kFullTextProperty = "fullText";

void elide(QLabel* label) {
  const QString text = label->property(kFullTextProperty).toString();
  const QString shown = label->fontMetrics().elidedText(text, Qt::ElideRight, label->contentsRect().width());
  label->setText(shown);
  label->setToolTip(shown == text ? QString() : text);
}

}  // namespace

void WTItemsViewController::setElidedText(QLabel* label, const QString& text) {
  label->setProperty(kFullTextProperty, text);
  elide(label);
}

bool WTItemsViewController::eventFilter(QObject* watched, QEvent* event) {
  const auto type = event->type();
  if ((type == QEvent::Resize || type == QEvent::Show || type == QEvent::Move) &&
      (watched == header_ || (outlineView_ && watched == outlineView_->viewport()))) {
    alignTotals();
  }
  if ((type == QEvent::Resize || type == QEvent::FontChange) &&
      (watched == titleLabel_ || watched == clientLabel_ || watched == durationLabel_ ||
       watched == totalsLabel_)) {
    elide(static_cast<QLabel*>(watched));
  }
  return WTViewController::eventFilter(watched, event);
}

void WTItemsViewController::alignTotals() {
  if (!header_ || !outlineView_) return;
  QWidget* viewport = outlineView_->viewport();
  const WTTableCellView cell(QStringLiteral("WTTask"));
  const QRectF row(0, 0, viewport->width(), 30.0);  // the columns do not depend on the height
  const auto place = [&](QLabel* label, WTTableCellView::Part part) {
    const QRect column = cell.partRect(part, row).toRect();
    const QPoint left =
        header_->mapFrom(outlineView_->window(), viewport->mapTo(outlineView_->window(), column.topLeft()));
    label->setGeometry(left.x(), 0, column.width(), header_->height());
  };
  place(durationLabel_, WTTableCellView::Part::Duration);
  place(totalsLabel_, WTTableCellView::Part::Cost);
  // The rate field ends a little before the duration column, wherever a scroll bar beside the rows
  // has put that column.
  constexpr int kGap = 8;
  QLayout* bar = header_->layout();
  const QMargins margins = bar->contentsMargins();
  const int room = std::max(header_->width() - durationLabel_->x() + kGap, 12);
  if (margins.right() != room) bar->setContentsMargins(margins.left(), margins.top(), room, margins.bottom());
}

void WTItemsViewController::projectRateAction() {
  // Only what the user typed is stored: a field left as it was shown never writes back a rate that has
  // changed meanwhile.
  if (!project_ || !rateField_->isModified() || !WTRateField::apply(rateField_, project_)) return;
  // What was taken, shown as every rate is ("120.00"): the user's own Return or Tab ended the typing.
  showStoredRate();
  refreshHeader();
}

void WTItemsViewController::showStoredRate() {
  WTRateField::setRefused(rateField_, {});
  rateField_->setText(project_ && project_->storedRate() ? WTRateField::text(*project_->storedRate())
                                                         : QString());  // not modified: the user's no more
}
