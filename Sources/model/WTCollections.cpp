#include "WTCollections.h"

namespace WTCollections {

QList<QVariantList> arrayBySplittingByKeyPath(const QVariantList& values, const QString& keyPath,
                                              const QList<KeyPath::SortDescriptor>& keySortDescriptors,
                                              const QList<KeyPath::SortDescriptor>& itemsSortDescriptors) {
  QVariantList keys;
  QList<QVariantList> groups;
  for (const QVariant& value : values) {
    const QVariant key = KeyPath::valueForKeyPath(value, keyPath);
    auto found = std::find_if(keys.cbegin(), keys.cend(),
                              [&](const QVariant& known) { return KeyPath::compareValues(known, key) == 0; });
    if (found == keys.cend()) {
      keys.append(key);
      groups.append({value});
    } else {
      groups[found - keys.cbegin()].append(value);
    }
  }
  if (!keySortDescriptors.isEmpty()) {
    // Sort the groups through their keys: wrap each key with its group index.
    QVariantList order;
    for (qsizetype i = 0; i < keys.size(); ++i) {
      order.append(QVariantMap{{QStringLiteral("self"), keys[i]}, {QStringLiteral("index"), i}});
    }
    order = KeyPath::sorted(std::move(order), keySortDescriptors);
    QList<QVariantList> sortedGroups;
    for (const QVariant& entry : order)
      sortedGroups.append(groups[entry.toMap().value(QStringLiteral("index")).toLongLong()]);
    groups = std::move(sortedGroups);
  }
  if (!itemsSortDescriptors.isEmpty()) {
    for (QVariantList& group : groups) group = KeyPath::sorted(std::move(group), itemsSortDescriptors);
  }
  return groups;
}

QList<QVariantMap> arrayBySplittingByKey(const QVariantList& values, const QString& keyPath,
                                         const QString& collectionKey) {
  QList<QVariantMap> result;
  for (const QVariantList& group : arrayBySplittingByKeyPath(values, keyPath)) {
    result.append({{collectionKey, group}, {keyPath, KeyPath::valueForKeyPath(group.last(), keyPath)}});
  }
  return result;
}

QVariantList sortedArrayUsingKeys(const QVariantList& values, const QStringList& keys) {
  QList<KeyPath::SortDescriptor> descriptors;
  for (const QString& key : keys) descriptors.append({key, true, false});
  return KeyPath::sorted(values, descriptors);
}

}  // namespace WTCollections
