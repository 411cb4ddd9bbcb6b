#include "UiFixture.h"

namespace {

// A model of its own over the outline's project.
class WTItemsModelTest : public OutlineTest {
 protected:
  void SetUp() override {
    OutlineTest::SetUp();
    model = std::make_unique<WTItemsModel>(context.get());
    ownTester = std::make_unique<QAbstractItemModelTester>(
        model.get(), QAbstractItemModelTester::FailureReportingMode::Fatal);
  }
  void TearDown() override {
    ownTester.reset();
    model.reset();
    OutlineTest::TearDown();
  }

  // The tree as text: "Task[Group[item,item],Group[...]]" per task, tasks joined by " ".
  QString shape(const QModelIndex& parent = {}) {
    QStringList rows;
    for (int r = 0; r < model->rowCount(parent); ++r) {
      const QModelIndex row = model->index(r, 0, parent);
      if (model->isItemIndex(row)) {
        rows << row.data(WTItemsModel::NameRole).toString();
        continue;
      }
      const auto group = model->isContainerIndex(row) ? model->containerAt(row) : nullptr;
      const QString title = !group          ? row.data(WTItemsModel::NameRole).toString()
                            : group->date() ? RZDate::stringWithPattern(*group->date(), "MM-dd")
                                            : QStringLiteral("Pending");
      rows << title + "[" + shape(row) + "]";
    }
    return rows.join(parent.isValid() ? QStringLiteral(",") : QStringLiteral(" "));
  }

  // Drag of the rows of these records, as the view would start it.
  std::unique_ptr<QMimeData> dragOf(std::initializer_list<const WTObject*> objects) {
    QModelIndexList indexes;
    for (const WTObject* object : objects) indexes << model->indexOfObject(object);
    return std::unique_ptr<QMimeData>(model->mimeData(indexes));
  }

  std::unique_ptr<WTItemsModel> model;
  std::unique_ptr<QAbstractItemModelTester> ownTester;
};

// Day headings name the weekday and date in the user's locale (late evening is still the 24th here).
TEST_F(WTItemsModelTest, TasksInStoredOrderThenPendingThenDaysNewestFirst) {
  makeItem<WTToDo>(design, "todo", at(2024, 3, 12));
  makeItem<WTTime>(design, "morning", at(2024, 3, 11, 8));
  makeItem<WTNote>(design, "note", at(2024, 3, 11, 15));
  makeItem<WTExpense>(design, "ticket", at(2024, 3, 13));
  makeItem<WTNote>(build, "late", at(2026, 11, 24, 23, 30));
  model->setProject(project);
  EXPECT_EQ(shape(),
            "Design[Pending[todo],03-13[ticket],03-11[note,morning]] "
            "Build[11-24[late]]");
  // Groups are headers: never selected, but a drop target; tasks and items are both.
  const QModelIndex task = model->index(0, 0), pending = model->index(0, 0, task);
  const Qt::ItemFlags both(Qt::ItemIsSelectable | Qt::ItemIsDropEnabled);
  EXPECT_EQ(model->flags(pending) & both, Qt::ItemIsDropEnabled);
  EXPECT_EQ(model->flags(task) & both, both);
  EXPECT_EQ(model->flags(model->index(0, 0, pending)) & Qt::ItemIsSelectable, Qt::ItemIsSelectable);
  EXPECT_EQ(pending.data(WTItemsModel::NameRole).toString(), "Pending");
  const QModelIndex day = model->index(0, 0, model->index(1, 0));
  for (const auto& [name, heading] :
       {std::pair{"en_US", "Tue, Nov 24, 2026"}, std::pair{"de_DE", "Di., 24. Nov. 2026"}}) {
    const UserLocale user(name);
    EXPECT_EQ(day.data(WTItemsModel::NameRole).toString().toStdString(), heading) << name;
  }
}

// Changes arrive row by row, never as a reset, down to the shown project's deletion.
TEST_F(WTItemsModelTest, ChangesArriveAsRowMovesNotResets) {
  auto* a = makeItem<WTTime>(design, "a", at(2024, 3, 11, 8));
  auto* b = makeItem<WTTime>(design, "b", at(2024, 3, 11, 9));
  model->setProject(project);
  QSignalSpy resets(model.get(), &QAbstractItemModel::modelReset);
  QSignalSpy layouts(model.get(), &QAbstractItemModel::layoutChanged);
  QSignalSpy inserted(model.get(), &QAbstractItemModel::rowsInserted);
  QSignalSpy removed(model.get(), &QAbstractItemModel::rowsRemoved);
  QSignalSpy moved(model.get(), &QAbstractItemModel::rowsMoved);
  QSignalSpy deleted(model.get(), &WTItemsModel::projectDeleted);
  auto after = [&](auto change) {
    change();
    endTurn();
    return shape();
  };
  EXPECT_EQ(after([&] { makeItem<WTFlat>(design, "fee", at(2024, 3, 12)); }),
            "Design[03-12[fee],03-11[b,a]] Build[]");
  EXPECT_EQ(inserted.count(), 1);
  EXPECT_EQ(after([&] {
              a->setDate(at(2024, 3, 12));
              b->setDate(at(2024, 3, 12));
            }),
            "Design[03-12[fee,b,a]] Build[]");
  EXPECT_EQ(after([&] { project->moveTask(build, 0); }), "Build[] Design[03-12[fee,b,a]]");
  EXPECT_EQ(moved.count(), 1);
  EXPECT_EQ(after([&] { a->setTask(build); }), "Build[03-12[a]] Design[03-12[fee,b]]");
  EXPECT_EQ(after([&] { context->deleteObject(design); }), "Build[03-12[a]]");
  EXPECT_GE(removed.count(), 2);
  EXPECT_EQ(resets.count() + layouts.count(), 0);
  EXPECT_EQ(after([&] { context->deleteObject(project); }), "");
  EXPECT_EQ(deleted.count(), 1);
  EXPECT_EQ(model->project(), nullptr);
}

// Beside the raw figures, a row shows what it bills where that differs; a rule changed later shows at once.
TEST_F(WTItemsModelTest, RowsShowTheBilledFiguresWhereTheyDifferFromTheRawOnes) {
  auto* client = makeClient("Acme");
  client->setRate(Decimal(100));
  client->setRoundingMinutes(15);
  client->setRoundingMode("up");
  project->setClient(client);
  auto* seven = makeItem<WTTime>(design, "seven", at(2024, 3, 14, 8));
  seven->setDuration(7);
  auto* long46 = makeItem<WTTime>(design, "long", at(2024, 3, 14, 9));
  long46->setDuration(46);
  makeItem<WTFlat>(design, "flat", at(2024, 3, 14, 10))->setMinutes(30);
  makeItem<WTExpense>(design, "expense", at(2024, 3, 14, 11))->setExpense(dec("12.345"));
  model->setProject(project);
  endTurn();
  auto rows = [&] {
    const QModelIndex task = model->indexOfObject(design), day = model->indexOfContainerOfItem(seven);
    QStringList shown{"Design: " + task.data(WTItemsModel::DurationTextRole).toString() + ' ' +
                          task.data(WTItemsModel::BilledTextRole).toString(),
                      "day: " + day.data(WTItemsModel::CostTextRole).toString() + ' ' +
                          day.data(WTItemsModel::BilledTextRole).toString()};
    for (const WTItem* item : design->valuableItems()) {
      const QModelIndex row = model->indexOfObject(item);
      shown << item->name() + ": " + row.data(WTItemsModel::DurationTextRole).toString() + ' ' +
                   row.data(WTItemsModel::CostTextRole).toString() + ' ' +
                   row.data(WTItemsModel::BilledTextRole).toString();
    }
    shown << controller->view()->findChild<QLabel*>("projectClient")->property("fullText").toString();
    return shown;
  };
  EXPECT_EQ(rows(),
            QStringList({"Design: 01:23 billed 01:45 · 187.35", "day: 150.68 billed 01:45 · 187.35",
                         "expense:  12.35 ", "flat: 00:30 50.00 ", "long: 00:46 76.67 billed 01:00 · 100.00",
                         "seven: 00:07 11.67 billed 00:15 · 25.00", "Acme · billed 01:45 · 187.35"}));
  QSignalSpy changed(model.get(), &QAbstractItemModel::dataChanged);
  project->setRoundingMode("nearest");
  endTurn();
  ASSERT_TRUE(std::any_of(changed.begin(), changed.end(), [&](const QList<QVariant>& signal) {
    return signal[0].value<QModelIndex>() == model->indexOfObject(seven);
  }));
  EXPECT_EQ(rows(),
            QStringList({"Design: 01:23 billed 01:15 · 137.35", "day: 150.68 billed 01:15 · 137.35",
                         "expense:  12.35 ", "flat: 00:30 50.00 ", "long: 00:46 76.67 billed 00:45 · 75.00",
                         "seven: 00:07 11.67 billed 00:00 · 0.00", "Acme · billed 01:15 · 137.35"}));
}

// A drag carries uuids in outline order and whether tasks go with it; where it may land follows.
TEST_F(WTItemsModelTest, DragsCarryUuidsInOutlineOrderAndLandOnlyWhereTheyFit) {
  auto* todo = makeItem<WTToDo>(design, "todo", at(2024, 3, 10));
  auto* time = makeItem<WTTime>(design, "time", at(2024, 3, 11));
  model->setProject(project);
  auto items = dragOf({time, todo}), tasks = dragOf({time, build});
  ASSERT_TRUE(items && tasks);
  EXPECT_EQ(WTItemsModel::objectUUIDs(items.get()), (QStringList{todo->uuid(), time->uuid()}));
  EXPECT_EQ(WTItemsModel::objectUUIDs(tasks.get()), (QStringList{time->uuid(), build->uuid()}));
  EXPECT_FALSE(WTItemsModel::containsTasks(items.get()));
  EXPECT_TRUE(WTItemsModel::containsTasks(tasks.get()));
  EXPECT_EQ(model->mimeData({model->index(0, 0, model->index(0, 0))}), nullptr);  // only a group row
  const QModelIndex task = model->indexOfObject(design), item = model->indexOfObject(time);
  const QModelIndex pending = model->indexOfContainer(design, std::nullopt);
  const QModelIndex day = model->indexOfContainer(design, at(2024, 3, 11, 0));
  ASSERT_TRUE(pending.isValid() && day.isValid());
  QMimeData foreign, onlyFlag;  // the flag, but no uuids
  foreign.setText("not ours");
  QByteArray no;
  QDataStream(&no, QIODevice::WriteOnly) << false;
  onlyFlag.setData("WTContainsTasks", no);
  const std::tuple<const QMimeData*, int, QModelIndex> drops[] = {
      {tasks.get(), 1, {}},    {tasks.get(), -1, {}},   {tasks.get(), -1, task},    {tasks.get(), 0, pending},
      {items.get(), -1, task}, {items.get(), -1, day},  {items.get(), -1, pending}, {items.get(), 0, day},
      {items.get(), 1, {}},    {items.get(), -1, item}, {&onlyFlag, -1, task},      {&foreign, -1, task},
  };
  QString accepted;
  for (const auto& [data, row, parent] : drops)
    accepted += model->canDropMimeData(data, Qt::MoveAction, row, 0, parent) ? u'1' : u'0';
  // Tasks between top rows, at the end, onto a task, into a group; items onto a task, a day, Pending,
  // between a group's rows, between tasks, onto an item; a drag without uuids; something else.
  EXPECT_EQ(accepted, "110011100000");
}

// What each drop does to the records is the model's; here, that each row hands the drop on.
TEST_F(WTItemsModelTest, ADropMovesTheDraggedRecordsToTheRowItLandsOn) {
  auto* todo = makeItem<WTToDo>(design, "todo", at(2024, 3, 10));
  todo->setCompleted(true);
  makeItem<WTToDo>(design, "open", at(2024, 3, 9));
  auto* note = makeItem<WTNote>(build, "note", at(2024, 3, 12, 9));
  model->setProject(project);
  QSignalSpy dropped(model.get(), &WTItemsModel::recordsDropped);
  auto drop = [&](std::initializer_list<const WTObject*> dragged, int row, const QModelIndex& parent) {
    return model->dropMimeData(dragOf(dragged).get(), Qt::MoveAction, row, 0, parent);
  };
  ASSERT_TRUE(drop({note}, -1, model->indexOfContainer(design, at(2024, 3, 10, 0))));
  EXPECT_EQ(context->undoManager().undoActionName(), "Move");
  ASSERT_TRUE(drop({todo, note}, -1, model->indexOfContainer(design, std::nullopt)));
  ASSERT_TRUE(drop({note}, -1, model->indexOfObject(build)));
  ASSERT_TRUE(drop({build, todo}, 0, {}));  // tasks between the top rows; the items dragged with them stay
  endTurn();
  EXPECT_EQ(shape(), "Build[03-10[note]] Design[Pending[todo,open]]");
  EXPECT_EQ(dropped.count(), 4);
}

// Each edit lands in its record's key, or is refused and changes nothing.
TEST_F(WTItemsModelTest, EditsGoToTheRightKeys) {
  auto* time = makeItem<WTTime>(design, "time", at(2024, 3, 11, 9));
  auto* flat = makeItem<WTFlat>(design, "flat", at(2024, 3, 11, 10));
  auto* expense = makeItem<WTExpense>(design, "expense", at(2024, 3, 11, 11));
  model->setProject(project);
  EXPECT_TRUE(model->setData(model->indexOfObject(time), "1:30", WTItemsModel::DurationEditRole));
  EXPECT_EQ(time->duration(), 90);
  time->setRunning(true);  // a running entry's length belongs to the clock
  const int duration = WTItemsModel::DurationEditRole, amount = WTItemsModel::AmountEditRole,
            name = WTItemsModel::NameRole, notes = WTItemsModel::NotesRole;
  const std::tuple<const WTObject*, const char*, int> edits[] = {
      {flat, "45", duration},      {expense, "12.50", amount},    {expense, "1:00", duration},
      {time, "2:00", duration},    {design, "Design & UX", name}, {flat, "line one\nline two", notes},
      {expense, "twelve", amount},
  };
  QString taken;
  for (const auto& [object, typed, role] : edits)
    taken += model->setData(model->indexOfObject(object), typed, role) ? u'1' : u'0';
  EXPECT_EQ(taken, "1100110");
  EXPECT_EQ(
      std::tuple(flat->duration(), expense->expense(), design->name(), flat->notes()),
      std::tuple(45, Decimal::fromString(u"12.5"), QString("Design & UX"), QString("line one\nline two")));
}

}  // namespace
