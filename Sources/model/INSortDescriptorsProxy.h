#pragma once

#include "KeyPath.h"

#include <QList>
#include <QString>

#include <optional>

// Turns a key into a sort order so that lists can name their order as a key: "_" in front means
// descending, "@" in front case-insensitive, and every further "@" stands for "." ("@client@name" sorts
// case-insensitively by client.name). Only the text after a "+" counts. Once an order was stored into
// the proxy, every key answers that one stored order (one slot for all keys, on purpose).
class INSortDescriptorsProxy {
 public:
  QList<KeyPath::SortDescriptor> valueForKey(const QString& key) const;
  void setValue(const QString& key, const QList<KeyPath::SortDescriptor>& descriptors);

 private:
  std::optional<QList<KeyPath::SortDescriptor>> stored_;
};

// Answers an entity class by name, so that lists can name the kind of record they hold.
class INClassProxy {
 public:
  // The entity of that name ("WTTask" ...), or none.
  static std::optional<QString> valueForKey(const QString& key);
};
