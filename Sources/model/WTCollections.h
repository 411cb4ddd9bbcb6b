#pragma once

#include "KeyPath.h"

#include <QList>
#include <QVariant>
#include <QVariantList>
#include <QVariantMap>

#include <algorithm>

// Collection helpers over variant lists (records travel as KeyPath::variantFromObject).
namespace WTCollections {

// Splits `values` into groups of equal `keyPath` value. With key sort descriptors the groups are
// ordered by their value (descriptor key paths are read on the value itself, "self" meaning the value);
// without them they come in first-seen order. Elements keep their relative order in a group unless
// item sort descriptors are given.
QList<QVariantList> arrayBySplittingByKeyPath(
    const QVariantList& values, const QString& keyPath,
    const QList<KeyPath::SortDescriptor>& keySortDescriptors = {},
    const QList<KeyPath::SortDescriptor>& itemsSortDescriptors = {});

// Splits as above and returns a map per group: the group under `collectionKey`, and the group's value
// (read from its last element) under `keyPath`.
QList<QVariantMap> arrayBySplittingByKey(const QVariantList& values, const QString& keyPath,
                                         const QString& collectionKey);

// Sorts ascending by the first key, then by each further one.
QVariantList sortedArrayUsingKeys(const QVariantList& values, const QStringList& keys);

// Moves the element at `from` so that it lands before the element that was at `to`; returns where it
// landed. Nothing moves when `from` equals `to`.
template <class T>
qsizetype moveObjectAtIndex(QList<T>& list, qsizetype from, qsizetype to) {
  if (from == to) return from;
  T element = list.takeAt(from);
  const qsizetype landed = to > from ? to - 1 : to;
  list.insert(landed, std::move(element));
  return landed;
}

// True when some element is a record whose class is `Class` or derives from it.
template <class Class>
bool containsObjectOfKind(const QVariantList& values) {
  return std::any_of(values.begin(), values.end(), [](const QVariant& value) {
    return dynamic_cast<Class*>(KeyPath::objectFromVariant(value)) != nullptr;
  });
}

}  // namespace WTCollections
