#include "WTKeyTable.h"

#include <algorithm>

WTKeyTable::WTKeyTable(const WTKeyTable* base, std::initializer_list<WTKeyDescriptor> keys) {
  if (base) {
    keys_ = base->keys_;
    index_ = base->index_;
    owner_ = base->owner_;
  }
  for (const WTKeyDescriptor& key : keys) {
    const auto known = index_.constFind(key.name);
    if (known == index_.constEnd()) {
      Q_ASSERT(!key.refines);
      index_.insert(key.name, int(keys_.size()));
      keys_.push_back(key);
      continue;
    }
    // A key the base declares: a refinement keeps whatever it does not give.
    Q_ASSERT(key.refines);
    WTKeyDescriptor& declared = keys_[size_t(*known)];
    if (key.get) declared.get = key.get;
    if (key.set) declared.set = key.set;
    if (!key.affectedBy.isEmpty()) declared.affectedBy = key.affectedBy;
  }
  for (int i = 0; i < int(keys_.size()); ++i) {
    if (keys_[size_t(i)].stored) stored_.append(keys_[size_t(i)].name);
    if (keys_[size_t(i)].type == WTKeyType::ToOne) owner_ = i;
    byName_.push_back(i);
  }
  std::sort(byName_.begin(), byName_.end(),
            [this](int a, int b) { return keys_[size_t(a)].name < keys_[size_t(b)].name; });
}
