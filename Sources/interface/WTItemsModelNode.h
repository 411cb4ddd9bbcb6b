#pragma once

#include "Date.h"
#include "WTItemContainer.h"
#include "WTItemsModel.h"

#include <QtGlobal>

#include <cmath>
#include <limits>
#include <memory>
#include <optional>
#include <vector>

class WTObject;

// One row of the items outline: a task, a group or an item, under the invisible root. Shared by the
// model's files (rows, following the store, drag and drop); nothing outside them sees it.
struct WTItemsModel::Node {
  enum Kind { Root, Task, Container, Item };
  Kind kind = Root;
  Node* parent = nullptr;
  int row = 0;
  WTObject* object = nullptr;  // tasks and items
  std::shared_ptr<WTItemContainer> container;
  std::vector<std::unique_ptr<Node>> children;

  void renumber(size_t from = 0) {
    for (size_t i = from; i < children.size(); ++i) children[i]->row = static_cast<int>(i);
  }

  // A group among its task's groups: its day in milliseconds, or kPendingKey for "Pending".
  using GroupKey = qint64;
  static constexpr GroupKey kPendingKey = std::numeric_limits<qint64>::min();
  static GroupKey keyOfDay(std::optional<Date> day) {
    return day ? static_cast<GroupKey>(std::llround(day->secondsSince1970() * 1000.0)) : kPendingKey;
  }
};
