#include "MemoryKeychain.h"
#include "UiFixture.h"
#include "WTBillingDialog.h"
#include "WTPasswordStore.h"
#include "WTPreferencesWindowController.h"
#include "WTProjectsViewController.h"

namespace {

using Field = WTItemCellDelegate::Field;

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
  // Types into an item's field editor, clicks the task's row, then presses Return in the editor if it
  // is still open; answers whether it was refused in place.
  bool typeIntoRow(WTItem* item, Field field, const QString& text) {
    outline()->setCurrentIndex(rowOf(item));
    controller->cellDelegate()->setEditField(field);
    outline()->edit(rowOf(item));
    QLineEdit* editor = shown->openEditor();
    if (!editor) return false;
    type(editor, text);
    QTest::mouseClick(outline()->viewport(), Qt::LeftButton, {},
                      shown->centreOf(design, WTTableCellView::Part::Name));
    if ((editor = shown->openEditor())) QTest::keyClick(editor, Qt::Key_Return);
    editor = shown->openEditor();
    const bool refused = editor && outline()->isEditing() && refusedIn(editor, text);
    if (editor) QTest::keyClick(editor, Qt::Key_Escape);
    shown->openEditor();
    return refused;
  }

  WTClient* acme = nullptr;
};

// The project's field names the inherited rate; a refused rate stays in view until edited.
TEST_F(WTRateFieldsTest, TheProjectFieldNamesWhatItInheritsAndRefusesWhatIsNotARate) {
  QLineEdit* field = controller->rateField();
  EXPECT_EQ(field->placeholderText(), "Inherited: 80.00");
  acme->setRate(Decimal(1250));
  endTurn();
  EXPECT_EQ(field->placeholderText(), "Inherited: 1,250.00");
  acme->setCurrency("JPY");  // in the places of the client's currency
  endTurn();
  EXPECT_EQ(field->placeholderText(), "Inherited: 1,250");
  acme->setCurrency(QString());
  endTurn();
  QTest::keyClicks(field, "-5");
  controller->projectRateAction();
  EXPECT_TRUE(refusedIn(field, "-5"));
  project->setName("Website 2");
  endTurn();
  EXPECT_EQ(field->text(), "-5");
  field->setFocus();  // where it stays after Return
  ASSERT_TRUE(QTest::qWaitFor([&] { return field->hasFocus(); }));
  field->selectAll();
  QTest::keyClicks(field, "7");
  EXPECT_FALSE(WTRateField::isRefused(field) || !field->toolTip().isEmpty());
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(7));
  EXPECT_EQ(field->text(), "7.00");
  EXPECT_EQ(context->undoManager().undoActionName(), "Change Rate");
  // A rate changed elsewhere (a sync, an undo) shows in the field that has the focus, and leaving the
  // field untouched never writes the old one back.
  project->setRate(Decimal(90));
  endTurn();
  EXPECT_EQ(field->text(), "90.00");
  controller->projectRateAction();
  project->setRate(Decimal(95));  // not shown yet when the field is left
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), Decimal(95));
  // Escape takes back what was typed.
  endTurn();
  QTest::keyClicks(field, "5");
  QTest::keyClick(field, Qt::Key_Escape);
  controller->projectRateAction();
  EXPECT_EQ(std::pair(field->text(), project->storedRate()),
            std::pair(QString("95.00"), std::optional(Decimal(95))));
  field->selectAll();
  QTest::keyClick(field, Qt::Key_Delete);
  controller->projectRateAction();
  EXPECT_EQ(project->storedRate(), std::nullopt);
}

// Each field reads money in the user's locale; what it refuses stays in it, marked, storing nothing.
TEST_F(WTRateFieldsTest, EachFieldStoresWhatItTakesAndKeepsWhatItRefusesInView) {
  auto* expense = makeItem<WTExpense>(design, "Ticket", at(2024, 3, 11, 10));
  auto* flat = makeItem<WTFlat>(design, "Review", at(2024, 3, 11, 11));
  auto* entry = makeItem<WTTime>(design, "Call", at(2024, 3, 11, 0, 30));
  WTPasswordStore passwords(defaults.get(), std::make_unique<MemoryKeychain>());
  WTPreferencesWindowController preferences(defaults.get(), nullptr, &passwords);
  preferences.showWindow();
  EXPECT_EQ(preferences.defaultRateField()->placeholderText(),
            "Built in: 100.00, or 50.00 for a project without a client");
  endTurn();
  outline()->expandAll();
  using Outcome = std::pair<std::optional<Decimal>, bool>;  // stored, refused
  auto typedWithReturn = [](QLineEdit* field, const QString& text) {
    type(field, text, true);
    return refusedIn(field, text);
  };
  const std::map<std::string, std::function<Outcome(const QString&)>> fields = {
      {"project",
       [&](auto text) {
         const bool refused = typedWithReturn(controller->rateField(), text);
         return Outcome{project->storedRate(), refused};
       }},
      {"client",
       [&](auto text) {
         WTRateDialog dialog(acme);
         dialog.show();
         type(dialog.field(), text);
         dialog.accept();
         return Outcome{acme->storedRate(), dialog.isVisible() && refusedIn(dialog.field(), text)};
       }},
      {"budget",
       [&](auto text) {
         WTBillingDialog dialog(design);
         dialog.show();
         type(dialog.budgetField(), text);
         dialog.accept();
         return Outcome{design->budget(), dialog.isVisible() && refusedIn(dialog.budgetField(), text)};
       }},
      {"expense",
       [&](auto text) {
         const bool refused = typeIntoRow(expense, Field::Amount, text);
         return Outcome{expense->expense(), refused};
       }},
      {"duration",
       [&](auto text) {
         const bool refused = typeIntoRow(flat, Field::Duration, text);
         return Outcome{Decimal(std::int64_t(flat->minutes().value_or(-1))), refused};
       }},
      {"end",  // minutes into the day
       [&](auto text) {
         const bool refused = typeIntoRow(entry, Field::End, text);
         const QTime end = QTime::fromString(span(entry).section(u'-', 1), u"HH:mm");
         return Outcome{Decimal(std::int64_t(end.msecsSinceStartOfDay() / 60000)), refused};
       }},
      {"preferences",
       [&](auto text) {
         const bool refused = typedWithReturn(preferences.defaultRateField(), text);
         return Outcome{defaults->decimalForKey("WTDefaultRate"), refused};
       }},
  };
  // German takes money typed "1.250,5", American refuses it; a duration or a time of day is taken as
  // "1:15", never as "1.5".
  for (const char* field : {"project", "client", "budget", "expense", "preferences", "duration", "end"}) {
    const bool money = std::string(field) != "duration" && std::string(field) != "end";
    for (const bool refused : {false, true}) {
      SCOPED_TRACE(std::string(field) + (refused ? " refused" : " taken"));
      const UserLocale user(money && !refused ? "de_DE" : "en_US");
      endTurn();
      EXPECT_EQ(fields.at(field)(money     ? "1.250,5"
                                 : refused ? "1.5"
                                           : "1:15"),
                Outcome(money ? dec("1250.5") : Decimal(75), refused));
    }
  }
  // Billed in francs, an amount in euros is refused, never taken as francs; the preference bills in the
  // locale's euros.
  acme->setCurrency("CHF");
  const UserLocale german("de_DE");
  endTurn();
  for (const std::string field : {"project", "client", "budget", "expense", "preferences"}) {
    const bool refused = field != "preferences";
    EXPECT_EQ(fields.at(field)("EUR 2.000"), Outcome(refused ? dec("1250.5") : Decimal(2000), refused))
        << field;
  }
  // Berlin's clocks skip from 2:00 to 3:00 that night: an end at 2:30 would be stored as 3:30.
  auto* spring = makeItem<WTTime>(design, "Spring", at(2024, 3, 31, 1, 10));
  endTurn();
  outline()->expandAll();
  EXPECT_TRUE(typeIntoRow(spring, Field::End, "2:30"));
}

TEST_F(WTRateFieldsTest, ARateChangeShowsNewCostsInEveryRowAtOnce) {
  WTTime* monday = makeItem<WTTime>(design, "Monday", at(2024, 3, 11, 9));
  WTTime* tuesday = makeItem<WTTime>(design, "Tuesday", at(2024, 3, 12, 9));
  endTurn();
  outline()->expandAll();
  const QList<QPersistentModelIndex> rows = {rowOf(design), rowOf(monday), rowOf(monday).parent(),
                                             rowOf(tuesday), rowOf(tuesday).parent()};
  ASSERT_NE(rowOf(monday).parent(), rowOf(tuesday).parent());
  QSignalSpy spy(model(), &QAbstractItemModel::dataChanged);
  auto repaintedShowing = [&] {
    QSet<QPersistentModelIndex> seen;
    for (const QList<QVariant>& args : spy) {
      const auto from = args[0].value<QModelIndex>();
      for (int row = from.row(); row <= args[1].value<QModelIndex>().row(); ++row)
        seen.insert(from.sibling(row, 0));
    }
    spy.clear();
    const bool all =
        std::all_of(rows.begin(), rows.end(), [&](const auto& row) { return seen.contains(row); });
    return std::pair(all,
                     rowOf(monday).data(WTItemsModel::CostTextRole).toString() + ' ' +
                         controller->view()->findChild<QLabel*>("projectCost")->text().section(u' ', -1));
  };
  EXPECT_EQ(repaintedShowing().second, "40.00 80.00");  // half an hour at the client's 80
  project->setRate(Decimal(100));
  endTurn();
  EXPECT_EQ(repaintedShowing(), std::pair(true, QString("50.00 100.00")));
  ASSERT_TRUE(model()->setData(rowOf(monday), "8:45", WTItemsModel::StartTimeEditRole));
  EXPECT_EQ(controller->view()->findChild<QLabel*>("projectDuration")->text(), "01:15");
  acme->setRate(std::nullopt);
  project->setRate(std::nullopt);
  endTurn();
  repaintedShowing();  // a new default rate alone changes no record, yet every row shows it
  defaults->setValue(QStringLiteral("WTDefaultRate"), QVariant::fromValue(Decimal(60)));
  endTurn();
  EXPECT_EQ(repaintedShowing(), std::pair(true, QString("45.00 75.00")));
}

TEST_F(WTRateFieldsTest, TheRowMenusOpenTheRateSheetToSetAndClearRates) {
  std::unique_ptr<QMenu> menu(controller->taskMenu(design));
  ASSERT_NE(actionTitled(menu.get(), "Set Rate…"), nullptr);
  int filled = 0;
  whenRateDialogOpens([&](WTRateDialog* dialog) {
    EXPECT_EQ(dialog->field()->placeholderText(), "Inherited: 80.00");
    dialog->field()->setText("90");
    dialog->accept();
    ++filled;
  });
  actionTitled(menu.get(), "Set Rate…")->trigger();
  EXPECT_EQ(design->storedRate(), Decimal(90));

  WTClientsViewController clients(context.get());
  endTurn();
  clients.tableView()->setClickedRow(clients.arrayController()->rowOfObject(acme));
  ASSERT_NE(actionTitled(clients.rowMenu(), "Set Rate…"), nullptr);
  whenRateDialogOpens([&](WTRateDialog* dialog) {
    EXPECT_EQ(dialog->field()->placeholderText() + ' ' + dialog->field()->text(), "Inherited: 100.00 80.00");
    dialog->field()->clear();
    dialog->accept();
    ++filled;
  });
  actionTitled(clients.rowMenu(), "Set Rate…")->trigger();
  EXPECT_FALSE(acme->storedRate().has_value());
  EXPECT_EQ(filled, 2);
  clients.tableView()->setClickedRow(-1);
}

// Each row menu opens the billing sheet: a client's address and currency among the ISO codes, every row's
// rounding (empty or 0 inherits, and says what); what it cannot take stays in view and nothing is stored.
TEST_F(WTRateFieldsTest, TheBillingSheetSetsCurrencyAndRoundingAndKeepsWhatItRefusesInView) {
  acme->setRoundingMinutes(15);
  std::unique_ptr<QMenu> taskMenu(controller->taskMenu(design));
  EXPECT_NE(actionTitled(taskMenu.get(), "Budget and Rounding…"), nullptr);
  ShownProjects projects(context.get(), QSize(600, 400));
  EXPECT_NE(actionTitled(projects.controller.rowMenu(), "Budget and Rounding…"), nullptr);
  WTClientsViewController clients(context.get());
  EXPECT_NE(actionTitled(clients.rowMenu(), "Address, Currency and Rounding…"), nullptr);
  // The stored currency, minutes and mode by key: "JPY 15 up", "none" where it inherits.
  auto stored = [this](const WTObject* object) {
    QStringList values;
    for (const char* key : {"currency", "roundingMinutes", "roundingMode", "address"})
      if (key != std::string("address") || object == acme) values << object->valueForKey(key).toString();
    return values.replaceInStrings(QRegularExpression("^$"), "none").join(' ');
  };
  const std::tuple<WTObject*, const char*, const char*, int, bool, const char*> rows[] = {
      // record, currency typed (and for a client the address typed after a '|'), minutes typed, mode
      // chosen (0 inherits), refused, stored
      {acme, "jpy|Bahnhofstr. 1\n8001 Zürich\n\n", "15", 1, false, "JPY 15 up Bahnhofstr. 1\n8001 Zürich"},
      {acme, "XYZ|Elsewhere", "6", 3, true, "JPY 15 up Bahnhofstr. 1\n8001 Zürich"},
      {acme, "|", "", 0, false, "none none none none"},
      {project, nullptr, "6", 3, false, "none 6 down"},
      {design, nullptr, "7.5", 2, true, "none none none"},
      {design, nullptr, "0", 2, false, "none none nearest"},
  };
  for (const auto& [object, currency, minutes, mode, refused, after] : rows) {
    SCOPED_TRACE(object->name().toStdString() + ' ' + minutes);
    WTBillingDialog dialog(object);
    dialog.show();
    if (currency) {
      const QStringList typed = QString::fromUtf8(currency).split('|');
      dialog.currencyField()->setCurrentText(typed[0]);
      dialog.addressField()->setPlainText(typed[1]);
    }
    dialog.roundingMinutesField()->setText(minutes);
    dialog.roundingModeField()->setCurrentIndex(mode);
    dialog.accept();
    EXPECT_EQ(dialog.isVisible(), refused);
    QLineEdit* field = currency && std::string(currency).starts_with("XYZ")
                           ? dialog.currencyField()->lineEdit()
                           : dialog.roundingMinutesField();
    EXPECT_EQ(refused, refusedIn(field, field->text()));
    EXPECT_EQ(stored(object), after);
  }
  const WTBillingDialog unrounded(acme);  // nothing above rounds: said as Preferences says it
  EXPECT_EQ(
      unrounded.roundingMinutesField()->placeholderText() + ", " + unrounded.roundingModeField()->itemText(0),
      "Inherited: none, Inherited");
  EXPECT_EQ(WTBillingDialog(project).roundingMinutesField()->text(), "6");
  EXPECT_EQ(WTBillingDialog(design).roundingMinutesField()->placeholderText(), "Inherited: 6");
  project->setRoundingMinutes(1440);  // however long, what is inherited shows whole
  WTBillingDialog longest(design);
  longest.show();
  const QLineEdit* inherits = longest.roundingMinutesField();
  EXPECT_GE(inherits->width(), inherits->fontMetrics().horizontalAdvance(inherits->placeholderText()) + 6);
  defaults->setValue("WTCurrency", "CHF");
  EXPECT_EQ(WTBillingDialog(acme).currencyField()->lineEdit()->placeholderText(), "Inherited: CHF");
}

}  // namespace
