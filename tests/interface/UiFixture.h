#pragma once

#include "ModelFixture.h"
#include "UserLocale.h"
#include "WTClientsViewController.h"
#include "WTItemCellDelegate.h"
#include "WTItemContainer.h"
#include "WTItemsModel.h"
#include "WTItemsViewController.h"
#include "WTListView.h"
#include "WTNavigationController.h"
#include "WTObjectListModel.h"
#include "WTOutlineView.h"
#include "WTProjectsViewController.h"
#include "WTRateField.h"
#include "WTViewController.h"

#include <QtTest>
#include <QtWidgets>

#include <functional>
#include <map>
#include <memory>

// The first of a menu's entries whose title starts with `title`, or nothing.
inline QAction* actionTitled(const QMenu* menu, const QString& title) {
  for (QAction* action : menu->actions())
    if (action->text().startsWith(title)) return action;
  return nullptr;
}
// Types into a field as a user does, over what it held, then presses Return if asked.
inline void type(QLineEdit* field, const QString& text, bool andReturn = false) {
  field->setFocus();
  field->selectAll();
  QTest::keyClicks(field, text);
  if (andReturn) QTest::keyClick(field, Qt::Key_Return);
}

// The tip shown over a point of a view's viewport, or nothing.
inline QString tipAt(QAbstractItemView* view, QPoint point) {
  QToolTip::hideText();  // fades out: wait until it is gone
  EXPECT_TRUE(QTest::qWaitFor([] { return !QToolTip::isVisible(); }, 2000));
  QHelpEvent help(QEvent::ToolTip, point, view->viewport()->mapToGlobal(point));
  QApplication::sendEvent(view->viewport(), &help);
  return QToolTip::isVisible() ? QToolTip::text() : QString();
}

// Receives what the desktop would open, in the desktop's place.
class UrlCatcher : public QObject {
  Q_OBJECT
 public:
  QList<QUrl> opened;
 public slots:
  void open(const QUrl& url) { opened.append(url); }
};

// A window hosting one navigation stack; it records deletion questions and answers `deletes`.
class TestHostWindow : public QMainWindow, public WTNavigationHost {
 public:
  WTNavigationController* stack = nullptr;
  int clientsShown = 0;
  QStringList questions;
  bool deletes = true;
  WTNavigationController* currentNavigationController() const override { return stack; }
  void showProjects() override {}
  void showClients() override { ++clientsShown; }
  bool confirmDeletion(const QString& question, const QString& detail) override {
    questions << (detail.isEmpty() ? question : question + u' ' + detail);
    return deletes;
  }
};

// A controller on a navigation stack in a host window, as the main window shows it; the window gives the
// stack's view back before either goes.
template <class Controller>
struct Shown {
  Shown(WTObjectContext* context, QSize size, const std::function<void(Controller&)>& prepare = {})
      : controller(context) {
    if (prepare) prepare(controller);
    window.stack = &stack;
    window.setCentralWidget(stack.view());
    window.resize(size);
    stack.pushViewController(&controller);
    window.show();
    EXPECT_TRUE(QTest::qWaitForWindowExposed(&window));
  }
  ~Shown() { window.takeCentralWidget(); }
  WTNavigationController stack;
  Controller controller;
  TestHostWindow window;
};
using ShownProjects = Shown<WTProjectsViewController>;

// A project's outline, shown.
struct ShownOutline : Shown<WTItemsViewController> {
  ShownOutline(WTObjectContext* context, WTProject* project, QSize size = QSize(900, 600))
      : Shown(context, size, [project](WTItemsViewController& outline) { outline.setProject(project); }) {}
  WTOutlineView* outline() { return controller.outlineView(); }
  QModelIndex rowOf(const WTObject* object) { return controller.treeController()->indexOfObject(object); }
  // The middle of one part of a record's row, in the outline's viewport.
  QPoint centreOf(const WTObject* object, WTTableCellView::Part part) {
    const QRect visual = outline()->visualRect(rowOf(object));
    const QRectF row(0, visual.y(), outline()->viewport()->width(), visual.height());
    return controller.cellViewPrototypeForIndex(rowOf(object)).partRect(part, row).center().toPoint();
  }
  // The one line editor open in the outline once closed ones are gone, else nothing.
  QLineEdit* openEditor() {
    for (int i = 0; i < 2; ++i) {
      QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
      QApplication::processEvents();
    }
    const QList<QLineEdit*> editors = outline()->viewport()->findChildren<QLineEdit*>();
    return editors.size() == 1 ? editors.first() : nullptr;
  }
};

// The model's world with the clock at 14 March 2024 10:00 until a test moves `clockNow`.
class UiTest : public ModelTest {
 protected:
  void SetUp() override {
    ModelTest::SetUp();
    setNow(at(2024, 3, 14, 10, 0));
  }
  static Date at(int year, int month, int day, int hour = 12, int minute = 0) {
    return berlin(year, month, day, hour, minute);
  }
  using ModelTest::makeItem;
  // A named item; a time entry lasts half an hour.
  template <class T>
  T* makeItem(WTTask* task, const QString& name, Date date) {
    T* item = makeItem<T>(task, date);
    item->setName(name);
    if constexpr (std::is_same_v<T, WTTime>) item->setEndDate(date.addingSeconds(30 * 60));
    return item;
  }
  // An entry's start and end on its day, "HH:mm-HH:mm".
  static QString span(const WTTime* item) {
    auto time = [](std::optional<Date> date) {
      return date ? RZDate::stringWithPattern(*date, "HH:mm") : "none";
    };
    return time(item->startDate()) + '-' + time(item->endDate());
  }
  // Ends the event-loop turn, as the application does after every event.
  void endTurn() {
    context->processPendingChanges();
    QCoreApplication::processEvents();
  }
};

// A project Website with the tasks Design and Build in its outline, its model under Qt's checker.
class OutlineTest : public UiTest {
 protected:
  void SetUp() override {
    UiTest::SetUp();
    project = makeProject("Website");
    design = makeTask(project, "Design");
    build = makeTask(project, "Build");
    shown = std::make_unique<ShownOutline>(context.get(), project);
    controller = &shown->controller;
    tester = std::make_unique<QAbstractItemModelTester>(
        model(), QAbstractItemModelTester::FailureReportingMode::Fatal);
  }
  void TearDown() override {
    tester.reset();
    shown.reset();
    UiTest::TearDown();
  }
  WTOutlineView* outline() { return controller->outlineView(); }
  WTItemsModel* model() { return controller->treeController(); }
  QModelIndex rowOf(const WTObject* object) { return model()->indexOfObject(object); }

  WTProject* project = nullptr;
  WTTask *design = nullptr, *build = nullptr;
  std::unique_ptr<ShownOutline> shown;
  WTItemsViewController* controller = nullptr;
  std::unique_ptr<QAbstractItemModelTester> tester;
};
