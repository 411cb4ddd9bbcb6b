#include "MemoryKeychain.h"
#include "UiFixture.h"
#include "UserLocale.h"
#include "WTClient.h"
#include "WTClientsViewController.h"
#include "WTItemCellDelegate.h"
#include "WTListView.h"
#include "WTObjectListModel.h"
#include "WTPasswordStore.h"
#include "WTPreferencesWindowController.h"
#include "WTRateField.h"

#include <QLabel>
#include <QSignalSpy>
#include <QTimer>

#include <functional>
#include <ostream>

// Failures show amounts as numbers.
static void PrintTo(const Decimal& value, std::ostream* out) {
  *out << value.toString().toStdString();
}

namespace {

// The project's client Acme bills 80 an hour.
class WTRateFieldsTest : public OutlineTest {
 protected:
  void SetUp() override {
    OutlineTest::SetUp();
    acme = makeClient("Acme");
    acme->setRate(Decimal(80));
    project->setClient(acme);
    endTurn();
  }

  // Runs `fill` on the rate sheet once it is open, from inside its own event loop.
  static void whenRateDialogOpens(std::function<void(WTRateDialog*)> fill) {
    QTimer::singleShot(0, [fill] {
      auto* dialog = qobject_cast<WTRateDialog*>(QApplication::activeModalWidget());
      ASSERT_NE(dialog, nullptr);
      fill(dialog);
      if (dialog->isVisible()) dialog->reject();
    });
  }
  // Whether the text was refused in place: still in its field, marked, with a reason.
  static bool refusedIn(QLineEdit* field, const QString& text) {
    return WTRateField::isRefused(field) && field->text() == text && !field->toolTip().isEmpty();
  }
  // Opens the outline's editor of one field of an item, types into it and presses Return; answers whether
  // the text was refused in place, then leaves the editor.
  bool typeIntoRow(WTItem* item, WTItemCellDelegate::Field field, const QString& text) {
    outline()->setCurrentIndex(rowOf(item));
    controller->cellDelegate()->setEditField(field);
    outline()->edit(rowOf(item));
    QLineEdit* editor = shown->openEditor();
    if (!editor) return false;
    type(editor, text, true);
    editor = shown->openEditor();
    const bool refused = editor && outline()->isEditing() && refusedIn(editor, text);
    if (editor) QTest::keyClick(editor, Qt::Key_Escape);
    shown->openEditor();
    return refused;
  }

  WTClient* acme = nullptr;
};

TEST_F(WTRateFieldsTest, TheProjectFieldNamesWhatItInheritsAndRefusesWhatIsNotARate) {
  QLineEdit* field = controller->rateField();
  EXPECT_EQ(field->placeholderText(), "Inherited: 80.00");
  acme->setRate(Decimal(1250));
  endTurn();
  EXPECT_EQ(field->placeholderText(), "Inherited: 1,250.00");
  // The whole placeholder is readable in the field.
  const int room =
      field->contentsRect().width() - field->textMargins().left() - field->textMargins().right() - 4;
  EXPECT_LE(field->fontMetrics().horizontalAdvance(field->placeholderText()), room);

  field->setText("120");
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(120));
  EXPECT_FALSE(WTRateField::isRefused(field));
  field->setText("-5");  // what is a rate is the money format's
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(120));
  EXPECT_TRUE(refusedIn(field, "-5"));
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
  field->clear();
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), std::nullopt);
}

// Money typed into each field that takes it is read in the user's locale (how is the money format's);
// what it refuses stays in its field, marked with the reason, and nothing is stored.
TEST_F(WTRateFieldsTest, MoneyTypedInEveryFieldIsReadInTheUsersLocale) {
  auto* expense = makeItem<WTExpense>(design, "Ticket", at(2024, 3, 11, 10));
  WTPasswordStore passwords(defaults.get(), std::make_unique<MemoryKeychain>());
  WTPreferencesWindowController preferences(defaults.get(), nullptr, &passwords);
  preferences.showWindow();
  // Empty, the box names the rates then in use.
  EXPECT_EQ(preferences.defaultRateField()->placeholderText(),
            "Built in: 100.00, or 50.00 for a project without a client");
  endTurn();
  controller->expandContainerOfItem(expense);
  const Decimal before(1);  // what every field holds before each typing
  struct Outcome {
    std::optional<Decimal> stored;
    bool refused;
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
  auto withReturn = [&](QLineEdit* field, const QString& text) {
    type(field, text, true);
    return refusedIn(field, text);
  };
  const std::pair<const char*, std::function<Outcome(const QString&)>> paths[] = {
      {"project",
       [&](const QString& text) {
         project->setRate(before);
         endTurn();
         const bool refused = withReturn(controller->rateField(), text);
         return Outcome{project->storedRate(), refused};
       }},
      {"client", inDialog(acme)},
      {"expense",
       [&](const QString& text) {
         expense->setExpense(before);
         endTurn();
         const bool refused = typeIntoRow(expense, WTItemCellDelegate::Field::Amount, text);
         return Outcome{expense->expense(), refused};
       }},
      {"preferences",
       [&](const QString& text) {
         defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(before));
         const bool refused = withReturn(preferences.defaultRateField(), text);
         return Outcome{defaults->decimalForKey(QStringLiteral("WTDefaultRate")), refused};
       }},
  };
  const struct {
    const char* locale;
    const char* typed;
    const char* stored;  // "x": refused
  } rows[] = {
      {"de_DE", "1.250,5", "1250.5"},
      {"en_US", "1.250,5", "x"},
  };
  for (const auto& row : rows) {
    const UserLocale user(row.locale);
    const std::string expected = row.stored;
    for (const auto& [path, typeInto] : paths) {
      const std::string where = std::string(path) + ' ' + row.locale + " \"" + row.typed + '"';
      const Outcome outcome = typeInto(QString::fromUtf8(row.typed));
      EXPECT_EQ(outcome.refused, expected == "x") << where;
      EXPECT_EQ(outcome.stored, expected == "x" ? before : *Decimal::fromString(QString::fromUtf8(expected)))
          << where;
    }
  }
  // A duration typed with a fraction is refused in its field too, never cut down to whole minutes.
  auto* flat = makeItem<WTFlat>(design, "Review", at(2024, 3, 11, 11));
  flat->setMinutes(10);
  endTurn();
  controller->expandContainerOfItem(flat);
  EXPECT_TRUE(typeIntoRow(flat, WTItemCellDelegate::Field::Duration, "1.5"));
  EXPECT_EQ(flat->minutes(), 10);
}

// Every row showing a cost repaints at once when a rate above it changes in the records or in the
// preferences (which rates reach which records is the model's).
TEST_F(WTRateFieldsTest, ARateChangeShowsNewCostsInEveryRowAtOnce) {
  WTTime* monday = makeItem<WTTime>(design, "Monday", at(2024, 3, 11, 9));
  WTTime* tuesday = makeItem<WTTime>(design, "Tuesday", at(2024, 3, 12, 9));
  endTurn();
  outline()->expandAll();
  const QList<QPersistentModelIndex> rows = {rowOf(design), rowOf(monday), rowOf(monday).parent(),
                                             rowOf(tuesday), rowOf(tuesday).parent()};
  ASSERT_NE(rowOf(monday).parent(), rowOf(tuesday).parent());
  auto costShown = [&](const WTObject* object) {
    return rowOf(object).data(WTItemsModel::CostTextRole).toString();
  };
  EXPECT_EQ(costShown(monday), "40.00");  // half an hour at the client's 80
  QSignalSpy spy(model(), &QAbstractItemModel::dataChanged);
  auto repainted = [&] {
    QSet<QPersistentModelIndex> seen;
    for (const QList<QVariant>& args : spy) {
      const auto from = args[0].value<QModelIndex>();
      for (int row = from.row(); row <= args[1].value<QModelIndex>().row(); ++row)
        seen.insert(from.sibling(row, 0));
    }
    spy.clear();
    for (const QPersistentModelIndex& row : rows)
      if (!seen.contains(row)) return false;
    return true;
  };
  QLabel* totals = controller->view()->findChild<QLabel*>("projectCost");
  project->setRate(Decimal(100));
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(costShown(tuesday), "50.00");
  EXPECT_EQ(totals->text().right(6), "100.00");

  acme->setRate(std::nullopt);
  project->setRate(std::nullopt);
  defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(Decimal(120)));
  endTurn();
  spy.clear();
  EXPECT_EQ(costShown(monday), "60.00");
  defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(Decimal(60)));
  endTurn();
  EXPECT_TRUE(repainted());
  EXPECT_EQ(costShown(monday), "30.00");
  EXPECT_EQ(totals->text().right(5), "60.00");
}

TEST_F(WTRateFieldsTest, ATaskRowsMenuSetsItsRateAndKeepsTheSheetOpenOnAMistake) {
  std::unique_ptr<QMenu> menu(controller->taskMenu(design));
  QAction* setRate = actionTitled(menu.get(), "Set Rate…");
  ASSERT_NE(setRate, nullptr);
  bool checked = false;
  whenRateDialogOpens([&](WTRateDialog* dialog) {
    EXPECT_EQ(dialog->field()->placeholderText(), "Inherited: 80.00");
    dialog->field()->setText("ninety");
    dialog->accept();
    EXPECT_TRUE(dialog->isVisible());
    EXPECT_TRUE(refusedIn(dialog->field(), "ninety"));
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

TEST_F(WTRateFieldsTest, AClientRowsMenuSetsAndClearsItsRate) {
  WTClientsViewController clients(context.get());
  clients.view()->resize(600, 400);
  clients.view()->show();
  endTurn();
  clients.tableView()->setClickedRow(clients.arrayController()->rowOfObject(acme));
  QAction* setRate = actionTitled(clients.rowMenu(), "Set Rate…");
  ASSERT_NE(setRate, nullptr);
  whenRateDialogOpens([](WTRateDialog* dialog) {
    EXPECT_EQ(dialog->field()->placeholderText(), "Inherited: 100.00");
    EXPECT_EQ(dialog->field()->text(), "80.00");
    dialog->field()->clear();
    dialog->accept();
  });
  setRate->trigger();
  EXPECT_FALSE(acme->storedRate().has_value());
  clients.tableView()->setClickedRow(-1);
}

}  // namespace
