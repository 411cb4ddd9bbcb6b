#include "INSortDescriptorsProxy.h"

#include "WTEntity.h"

QList<KeyPath::SortDescriptor> INSortDescriptorsProxy::valueForKey(const QString& rawKey) const {
  if (stored_) return *stored_;
  QString key = rawKey;
  const qsizetype plus = key.indexOf(u'+');
  if (plus >= 0) key = key.mid(plus + 1);
  bool ascending = true;
  if (key.startsWith(u'_')) {
    ascending = false;
    key.remove(0, 1);
  }
  bool caseInsensitive = false;
  if (key.startsWith(u'@')) {
    caseInsensitive = true;
    key.remove(0, 1);
  }
  key.replace(u'@', u'.');
  return {KeyPath::SortDescriptor{key, ascending, caseInsensitive}};
}

void INSortDescriptorsProxy::setValue(const QString&, const QList<KeyPath::SortDescriptor>& descriptors) {
  stored_ = descriptors;
}

std::optional<QString> INClassProxy::valueForKey(const QString& key) {
  if (!WTEntities::isEntityName(key)) return std::nullopt;
  return key;
}
