#include "RZViewAdditions.h"

#include <gtest/gtest.h>

#include <QDialog>
#include <QIntValidator>
#include <QLineEdit>
#include <QStandardItemModel>
#include <QTableView>
#include <QTest>
#include <QVBoxLayout>

namespace {

// A table of names and rates whose columns carry the identifiers "name" and "rate".
struct NamedColumns {
  QStandardItemModel model{0, 2};
  QTableView view;
  NamedColumns() {
    model.setHeaderData(0, Qt::Horizontal, "name", RZViewAdditions::kColumnIdentifierRole);
    model.setHeaderData(1, Qt::Horizontal, "rate", RZViewAdditions::kColumnIdentifierRole);
    model.appendRow({new QStandardItem("one"), new QStandardItem("10")});
    view.setModel(&model);
    view.resize(300, 200);
    view.show();
  }
};

TEST(RZViewAdditionsTest, ColumnsAreFoundAndEditedByIdentifier) {
  NamedColumns table;
  EXPECT_EQ(RZViewAdditions::indexOfColumnWithIdentifier(&table.view, "rate"), 1);
  EXPECT_EQ(RZViewAdditions::indexOfColumnWithIdentifier(&table.view, "missing"), -1);
  EXPECT_FALSE(RZViewAdditions::editColumnWithIdentifier(&table.view, "missing", 0));
  EXPECT_FALSE(RZViewAdditions::editColumnWithIdentifier(&table.view, "rate", 5));
  ASSERT_TRUE(RZViewAdditions::editColumnWithIdentifier(&table.view, "rate", 0));
  auto* editor = qobject_cast<QLineEdit*>(table.view.indexWidget(table.model.index(0, 1)));
  ASSERT_NE(editor, nullptr);
  EXPECT_EQ(editor->selectedText(), "10");
}

TEST(RZViewAdditionsTest, ASheetStaysOpenWhileAFieldHoldsWhatItCannotTake) {
  QWidget window;
  window.show();
  auto* sheet = new QDialog;
  auto* field = new QLineEdit(sheet);
  field->setValidator(new QIntValidator(0, 100, field));
  (new QVBoxLayout(sheet))->addWidget(field);
  RZViewAdditions::beginSheetModalForWindow(sheet, &window);
  EXPECT_EQ(sheet->parentWidget(), &window);
  EXPECT_TRUE(sheet->isVisible());
  field->setFocus();
  field->setText("-");  // intermediate: not acceptable
  QCoreApplication::processEvents();
  ASSERT_EQ(sheet->focusWidget(), field);
  EXPECT_FALSE(RZViewAdditions::endSheetWithOKButton(sheet));
  EXPECT_TRUE(sheet->isVisible());
  field->setText("42");
  EXPECT_TRUE(RZViewAdditions::endSheetWithOKButton(sheet));
  EXPECT_FALSE(sheet->isVisible());
  EXPECT_EQ(sheet->result(), 1);
  RZViewAdditions::beginSheetModalForWindow(sheet, &window);
  EXPECT_TRUE(RZViewAdditions::endSheetWithCancelButton(sheet));
  EXPECT_EQ(sheet->result(), 0);
}

}  // namespace
