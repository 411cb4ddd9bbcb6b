#include "MemoryKeychain.h"
#include "UiFixture.h"
#include "UserLocale.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTItemCellDelegate.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTObjectListModel.h"
#include "WTOutlineView.h"
#include "WTPasswordStore.h"
#include "WTPreferencesWindowController.h"
#include "WTRateField.h"

#include <QApplication>
#include <QLabel>
#include <QLineEdit>
#include <QMenu>
#include <QSignalSpy>
#include <QTimer>

#include <array>
#include <functional>
#include <ostream>

// Failures show amounts as numbers.
static void PrintTo(const Decimal& value, std::ostream* out) {
  *out << value.toString().toStdString();
}

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

// Money typed into each field that takes it, in each locale people use here: the locale's decimal sign is
// the decimal sign; anything else stays in its field, marked with the reason, and nothing is stored.
TEST_F(WTRatesTest, MoneyTypedInEveryFieldIsReadInTheUsersLocale) {
  auto* expense = makeItem<WTExpense>(design, "Ticket", at(2024, 3, 11, 10));
  WTPasswordStore passwords(defaults.get(), std::make_unique<MemoryKeychain>());
  WTPreferencesWindowController preferences(defaults.get(), nullptr, &passwords);
  preferences.showWindow();
  // Empty, the box names the rates then in use.
  EXPECT_EQ(preferences.defaultRateField()->placeholderText(),
            "Built in: 100.00, or 50.00 for a project without a client");
  endTurn();
  controller->expandContainerOfItem(expense);
  WTOutlineView* outline = controller->outlineView();
  auto editors = [&] {
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    QApplication::processEvents();
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    return outline->viewport()->findChildren<QLineEdit*>();
  };
  const Decimal before(1);  // what every field holds before each typing

  // Each path types `text` as a person does and ends the edit; it answers what is stored then, and
  // whether the text was refused in place (still in its open field, marked, with a reason).
  struct Outcome {
    std::optional<Decimal> stored;
    bool refused;
  };
  auto refusedIn = [](QLineEdit* field, const QString& text) {
    return WTRateField::isRefused(field) && field->text() == text && !field->toolTip().isEmpty();
  };
  auto type = [](QLineEdit* field, const QString& text) {
    field->setFocus();
    field->selectAll();
    QTest::keyClicks(field, text);
  };
  auto inDialog = [&](WTObject* object) {
    return [&, object](const QString& text) {
      object->setRate(before);
      WTRateDialog dialog(object);
      dialog.show();
      type(dialog.field(), text);
      dialog.accept();
      return Outcome{object->storedRate(), dialog.isVisible() && refusedIn(dialog.field(), text)};
    };
  };
  const std::pair<const char*, std::function<Outcome(const QString&)>> paths[] = {
      {"project",
       [&](const QString& text) {
         project->setRate(before);
         endTurn();
         type(controller->rateField(), text);
         QTest::keyClick(controller->rateField(), Qt::Key_Return);
         return Outcome{project->storedRate(), refusedIn(controller->rateField(), text)};
       }},
      {"client", inDialog(acme)},
      {"task", inDialog(design)},
      {"expense",
       [&](const QString& text) {
         expense->setExpense(before);
         endTurn();
         const QModelIndex row = model()->indexOfObject(expense);
         outline->setCurrentIndex(row);
         controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::Amount);
         outline->edit(row);
         QList<QLineEdit*> open = editors();
         if (open.size() != 1 || open.first()->objectName() != "amountEditor") return Outcome{};
         type(open.first(), text);
         QTest::keyClick(open.first(), Qt::Key_Return);
         open = editors();
         const bool refused = open.size() == 1 && outline->isEditing() && refusedIn(open.first(), text);
         if (!open.isEmpty()) QTest::keyClick(open.first(), Qt::Key_Escape);
         editors();
         return Outcome{expense->expense(), refused};
       }},
      {"preferences",
       [&](const QString& text) {
         defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(before));
         type(preferences.defaultRateField(), text);
         QTest::keyClick(preferences.defaultRateField(), Qt::Key_Return);
         return Outcome{defaults->decimalForKey(QStringLiteral("WTDefaultRate")),
                        refusedIn(preferences.defaultRateField(), text)};
       }},
  };
  struct Row {
    const char* typed;
    std::array<const char*, std::size(UserLocale::kNames)> stored;  // C, en_US, de_DE, fr_FR, de_CH
  };
  const Row rows[] = {
      {"75,5", {"x", "x", "75.5", "75.5", "x"}},     {"75.5", {"75.5", "75.5", "x", "x", "75.5"}},
      {"1,250.00", {"1250", "1250", "x", "x", "x"}}, {"1 250,00", {"x", "x", "x", "1250", "x"}},
      {"1'250.50", {"x", "x", "x", "x", "1250.5"}},
  };
  for (std::size_t at = 0; at < std::size(UserLocale::kNames); ++at) {
    const UserLocale user(UserLocale::kNames[at]);
    for (const Row& row : rows) {
      const QString text = QString::fromUtf8(row.typed);
      const std::string expected = row.stored[at];
      for (const auto& [path, typeInto] : paths) {
        const std::string where = std::string(path) + ' ' + UserLocale::kNames[at] + " \"" + row.typed + '"';
        const Outcome outcome = typeInto(text);
        EXPECT_EQ(outcome.refused, expected == "x") << where;
        EXPECT_EQ(outcome.stored,
                  expected == "x" ? before : *Decimal::fromString(QString::fromUtf8(expected)))
            << where;
      }
    }
  }

  // Durations too are whole numbers in the user's locale, never a fraction cut down to whole minutes.
  auto* flat = makeItem<WTFlat>(design, "Review", at(2024, 3, 11, 11));
  flat->setMinutes(10);
  endTurn();
  controller->expandContainerOfItem(flat);
  auto typeDuration = [&](const QString& text) {
    const QModelIndex row = model()->indexOfObject(flat);
    outline->setCurrentIndex(row);
    controller->cellDelegate()->setEditField(WTItemCellDelegate::Field::Duration);
    outline->edit(row);
    QList<QLineEdit*> open = editors();
    if (open.size() != 1) return false;
    type(open.first(), text);
    QTest::keyClick(open.first(), Qt::Key_Return);
    open = editors();
    const bool refused = open.size() == 1 && refusedIn(open.first(), text);
    if (!open.isEmpty()) QTest::keyClick(open.first(), Qt::Key_Escape);
    editors();
    return refused;
  };
  for (const char* name : {"en_US", "de_DE"}) {
    const UserLocale user(name);
    for (const char* fraction : {"1.5", "1,5", "0:1,5"}) {
      EXPECT_TRUE(typeDuration(fraction)) << name << ' ' << fraction;
      EXPECT_EQ(flat->minutes(), 10) << name << ' ' << fraction;
    }
    EXPECT_FALSE(typeDuration("1:30")) << name;
    EXPECT_EQ(flat->minutes(), 90) << name;
    flat->setMinutes(10);
  }
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
