#include "UiFixture.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTObjectListModel.h"
#include "WTOutlineView.h"
#include "WTRateField.h"

#include <QApplication>
#include <QLabel>
#include <QLineEdit>
#include <QMenu>
#include <QSignalSpy>
#include <QTimer>

#include <functional>

namespace {

class WTRatesTest : public UiTest {
 protected:
  void SetUp() override {
    UiTest::SetUp();
    acme = WTClient::insertNewObject(context.get());
    acme->setName("Acme");
    acme->setRate(Decimal(80));
    project = makeProject("Website");
    project->setClient(acme);
    design = makeTask(project, "Design");
    monday = makeItem<WTTime>(design, "Monday", at(2024, 3, 11, 9));
    tuesday = makeItem<WTTime>(design, "Tuesday", at(2024, 3, 12, 9));
    shown = std::make_unique<ShownOutline>(context.get(), project);
    controller = &shown->controller;
    endTurn();
  }
  void TearDown() override {
    shown.reset();
    UiTest::TearDown();
  }

  WTItemsModel* model() { return controller->treeController(); }
  QString costShown(const QModelIndex& index) { return index.data(WTItemsModel::CostTextRole).toString(); }
  QLabel* totals() { return controller->view()->findChild<QLabel*>("projectCost"); }

  // Runs `fill` on the rate sheet once it is open, from inside its own event loop.
  static void whenRateDialogOpens(std::function<void(WTRateDialog*)> fill) {
    QTimer::singleShot(0, [fill] {
      auto* dialog = qobject_cast<WTRateDialog*>(QApplication::activeModalWidget());
      ASSERT_NE(dialog, nullptr);
      fill(dialog);
      if (dialog->isVisible()) dialog->reject();
    });
  }

  WTClient* acme = nullptr;
  WTProject* project = nullptr;
  WTTask* design = nullptr;
  WTTime* monday = nullptr;
  WTTime* tuesday = nullptr;
  std::unique_ptr<ShownOutline> shown;
  WTItemsViewController* controller = nullptr;
};

TEST_F(WTRatesTest, TheProjectFieldNamesWhatItInheritsAndRefusesWhatIsNotARate) {
  QLineEdit* field = controller->rateField();
  EXPECT_EQ(field->placeholderText(), "Inherited: 80.00");
  acme->setRate(Decimal(95));
  endTurn();
  EXPECT_EQ(field->placeholderText(), "Inherited: 95.00");
  acme->setRate(Decimal(1250));
  endTurn();
  // The whole placeholder is readable in the field.
  const int room =
      field->contentsRect().width() - field->textMargins().left() - field->textMargins().right() - 4;
  EXPECT_LE(field->fontMetrics().horizontalAdvance(field->placeholderText()), room);
  acme->setRate(Decimal(95));
  endTurn();

  field->setText("120");
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(120));
  EXPECT_FALSE(WTRateField::isRefused(field));

  for (const char* bad : {"abc", "12abc", "-5"}) {
    field->setText(bad);
    controller->projectRateAction();
    EXPECT_EQ(project->storedRate(), Decimal(120)) << bad;
    EXPECT_TRUE(WTRateField::isRefused(field)) << bad;
    EXPECT_FALSE(field->toolTip().isEmpty()) << bad;
  }
  // Another change redraws the header; the refused text stays in view until it is edited.
  project->setName("Website 2");
  endTurn();
  EXPECT_EQ(field->text(), "-5");
  field->selectAll();
  QTest::keyClicks(field, "7");
  EXPECT_FALSE(WTRateField::isRefused(field));
  EXPECT_TRUE(field->toolTip().isEmpty());
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(7));
}

TEST_F(WTRatesTest, ARateChangeShowsNewCostsInEveryRowAtOnce) {
  controller->outlineView()->expandAll();
  const QModelIndex task = model()->indexOfObject(design);
  const QModelIndex mondayRow = model()->indexOfObject(monday);
  const QModelIndex tuesdayRow = model()->indexOfObject(tuesday);
  const QList<QPersistentModelIndex> rows = {task, mondayRow, mondayRow.parent(), tuesdayRow,
                                             tuesdayRow.parent()};
  ASSERT_NE(mondayRow.parent(), tuesdayRow.parent());
  EXPECT_EQ(costShown(mondayRow.parent()), "40.00");  // half an hour at the client's 80

  QSignalSpy spy(model(), &QAbstractItemModel::dataChanged);
  auto repainted = [&] {
    QSet<QPersistentModelIndex> seen;
    for (const QList<QVariant>& args : spy) {
      const auto from = args[0].value<QModelIndex>();
      const auto to = args[1].value<QModelIndex>();
      for (int row = from.row(); row <= to.row(); ++row) seen.insert(from.sibling(row, 0));
    }
    spy.clear();
    for (const QPersistentModelIndex& row : rows) {
      if (!seen.contains(row)) return false;
    }
    return true;
  };

  project->setRate(Decimal(100));
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(costShown(tuesdayRow.parent()), "50.00");
  EXPECT_EQ(totals()->text().right(6), "100.00");

  acme->setRate(Decimal(60));  // hidden by the project's own rate: shown costs stay
  project->setRate(std::nullopt);
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(costShown(mondayRow.parent()), "30.00");
  EXPECT_EQ(totals()->text().right(5), "60.00");

  acme->setRate(Decimal(40));
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(totals()->text().right(5), "40.00");

  design->setRate(Decimal(20));
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(costShown(tuesdayRow), "10.00");

  // Without a rate of their own anywhere above, the rows show the user's default rate, and a new one in
  // the preferences shows at once.
  acme->setRate(std::nullopt);
  design->setRate(std::nullopt);
  defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(Decimal(120)));
  endTurn();
  spy.clear();
  EXPECT_EQ(costShown(mondayRow.parent()), "60.00");
  defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(Decimal(60)));
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(costShown(mondayRow.parent()), "30.00");
  EXPECT_EQ(totals()->text().right(5), "60.00");
}

TEST_F(WTRatesTest, ATaskRowsMenuSetsItsRateAndKeepsTheSheetOpenOnAMistake) {
  std::unique_ptr<QMenu> menu(controller->taskMenu(design));
  QAction* setRate = nullptr;
  for (QAction* action : menu->actions()) {
    if (action->text() == QStringLiteral("Set Rate…")) setRate = action;
  }
  ASSERT_NE(setRate, nullptr);
  bool checked = false;
  whenRateDialogOpens([&](WTRateDialog* dialog) {
    EXPECT_EQ(dialog->field()->placeholderText(), "Inherited: 80.00");
    dialog->field()->setText("ninety");
    dialog->accept();
    EXPECT_TRUE(dialog->isVisible());
    EXPECT_TRUE(WTRateField::isRefused(dialog->field()));
    EXPECT_EQ(dialog->field()->text(), "ninety");
    EXPECT_FALSE(design->storedRate().has_value());
    dialog->field()->setText("90");
    dialog->accept();
    EXPECT_FALSE(dialog->isVisible());
    checked = true;
  });
  setRate->trigger();
  EXPECT_TRUE(checked);
  EXPECT_EQ(design->storedRate(), Decimal(90));
}

TEST_F(WTRatesTest, AClientRowsMenuSetsAndClearsItsRate) {
  WTClientsViewController clients(context.get());
  clients.view()->resize(600, 400);
  clients.view()->show();
  endTurn();
  clients.tableView()->setClickedRow(clients.arrayController()->rowOfObject(acme));
  QAction* setRate = nullptr;
  for (QAction* action : clients.rowMenu()->actions()) {
    if (action->text() == QStringLiteral("Set Rate…")) setRate = action;
  }
  ASSERT_NE(setRate, nullptr);
  whenRateDialogOpens([](WTRateDialog* dialog) {
    EXPECT_EQ(dialog->field()->placeholderText(), "Inherited: 100.00");
    EXPECT_EQ(dialog->field()->text(), "80.00");
    dialog->field()->clear();
    dialog->accept();
  });
  setRate->trigger();
  EXPECT_FALSE(acme->storedRate().has_value());
  EXPECT_EQ(project->inheritedRate(), Decimal(100));
  clients.tableView()->setClickedRow(-1);
}

}  // namespace
