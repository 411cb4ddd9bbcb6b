#include "GXTemplateScopes.h"

#include "KeyPath.h"

#include <limits>

namespace {

// One plain key on one value, as key-value access answers it: a map its entry, a record its value, a list
// the key asked of each element. A scalar answers no key but "self"; a list answers only when some element
// does, and not at all when one of its elements is a scalar.
QVariant valueForKey(const QVariant& value, const QString& key) {
  const int type = value.typeId();
  if (type == QMetaType::QVariantMap) return static_cast<const QVariantMap*>(value.constData())->value(key);
  if (type == QMetaType::QVariantHash) return static_cast<const QVariantHash*>(value.constData())->value(key);
  const bool isSelf = key == QLatin1String("self");
  if (const KeyValueCoding* object = KeyPath::objectFromVariant(value)) {
    return isSelf ? value : object->valueForKey(key);
  }
  if (GXTemplateValue::isList(value)) {
    const QVariantList list = value.toList();
    QVariantList mapped;
    mapped.reserve(list.size());
    bool answered = false;
    for (const QVariant& element : list) {
      const bool container = GXTemplateValue::isMap(element) || GXTemplateValue::isList(element) ||
                             KeyPath::objectFromVariant(element) != nullptr;
      if (!container && !isSelf) return {};
      QVariant result = container ? valueForKey(element, key) : element;
      answered = answered || !GXTemplateValue::isNil(result);
      mapped.append(std::move(result));
    }
    return answered ? QVariant(mapped) : QVariant();
  }
  return isSelf ? value : QVariant();
}

// The key path components[from...] on `value`. An operator component ("@sum") takes the rest of the
// path with it, as key-value access does.
QVariant valueForComponents(QVariant value, const QStringList& components, qsizetype from, qsizetype to) {
  for (qsizetype i = from; i < to && !GXTemplateValue::isNil(value); ++i) {
    if (components[i].startsWith(u'@')) {
      return KeyPath::valueForKeyPath(value, components.mid(i, to - i).join(u'.'));
    }
    value = valueForKey(value, components[i]);
  }
  return value;
}

// A leading run of decimal digits as an index, or -1 when there is none (or it is absurdly large).
qsizetype leadingIndex(const QString& component) {
  qsizetype index = -1;
  for (QChar c : component) {
    if (c < u'0' || c > u'9') break;
    index = (index < 0 ? 0 : index) * 10 + (c.unicode() - u'0');
    if (index > std::numeric_limits<int>::max()) return std::numeric_limits<qsizetype>::max();
  }
  return index;
}

}  // namespace

// One step from a root frame toward the container that holds a variable.
struct GXTemplateScopes::Step {
  bool isIndex = false;
  QString key;
  qsizetype index = 0;
};

// Where a variable lives: its root frame and the steps from there to its container, when those can be
// taken again to change it (maps by key, lists by index).
struct GXTemplateScopes::Place {
  QVariantMap* root = nullptr;
  std::vector<Step> steps;
  bool navigable = true;
  QString key;
};

GXTemplateScopes::Name& GXTemplateScopes::nameOf(const QString& variable) {
  // Texts are allocated on 16-byte boundaries: the address is mixed, and the product's top six bits
  // choose one of the 64 slots.
  const quint64 mixed = quint64(reinterpret_cast<quintptr>(variable.constData())) * 0x9E3779B97F4A7C15ull;
  static_assert(std::tuple_size_v<decltype(recent_)> == 64);
  Recent& recent = recent_[size_t(mixed >> 58)];
  if (recent.name && QStringView(recent.text) == QStringView(variable)) return *recent.name;
  auto it = names_.find(variable);
  if (it == names_.end()) {
    Name name;
    name.components = variable.split(u'.');
    it = names_.emplace(variable, std::move(name)).first;
  }
  recent = {variable, &it->second};
  return it->second;
}

QVariantMap* GXTemplateScopes::rootFor(Name& name, const QVariant** entry) {
  const QString& first = name.components.first();
  // The entry a frame holds under the first component, or null.
  auto entryIn = [&first](const QVariantMap& frame) -> const QVariant* {
    const auto it = frame.constFind(first);
    return it != frame.cend() && !GXTemplateValue::isNil(*it) ? &*it : nullptr;
  };
  // The run's variables shadow the globals, and both shadow block variables of the same first name.
  if (name.absentFromRootsVersion != rootKeysVersion_) {
    if ((*entry = entryIn(runVariables_))) return &runVariables_;
    if ((*entry = entryIn(globals_))) return &globals_;
    name.absentFromRootsVersion = rootKeysVersion_;
  }
  for (auto it = blocks_.rbegin(); it != blocks_.rend(); ++it) {
    if ((*entry = entryIn(it->vars))) return &it->vars;
  }
  return nullptr;
}

QVariant GXTemplateScopes::lookUp(const QString& variable, Place* place) {
  if (variable.isNull()) return {};
  Name& name = nameOf(variable);
  // Only plain reads are remembered: a caller asking for the place may go on to change the value.
  return place ? resolve(name, variable, place) : read(name, variable);
}

QVariant GXTemplateScopes::resolve(Name& name, const QString& variable, Place* place) {
  const QStringList& components = name.components;
  const QString& first = components.first();
  const QVariant* entry = nullptr;
  QVariantMap* root = rootFor(name, &entry);
  if (!root) return {};
  const qsizetype count = components.size();

  // Most variables are a path through maps: follow it without copying anything on the way.
  if (!place) {
    const QVariant* current = entry;
    qsizetype i = 1;
    for (; i < count && !components[i].startsWith(u'@'); ++i) {
      const QString& component = components[i];
      if (current->typeId() == QMetaType::QVariantMap) {
        const auto* map = static_cast<const QVariantMap*>(current->constData());
        const auto it = map->constFind(component);
        if (it == map->cend()) return {};
        current = &*it;
      } else if (current->typeId() == QMetaType::QVariantHash) {
        const auto* hash = static_cast<const QVariantHash*>(current->constData());
        const auto it = hash->constFind(component);
        if (it == hash->cend()) return {};
        current = &*it;
      } else {
        break;
      }
    }
    if (i == count) return *current;
  }
  const QVariant start = *entry;

  // The whole key path first.
  QVariant value = valueForComponents(start, components, 1, count);
  if (!GXTemplateValue::isNil(value)) {
    if (place) {
      place->root = root;
      if (count == 1) {
        place->key = variable;
      } else {
        place->key = components.last();
        QVariant parent = start;
        place->steps.push_back({false, first, 0});
        for (qsizetype i = 1; i < count - 1; ++i) {
          if (!GXTemplateValue::isMap(parent) || components[i].startsWith(u'@')) place->navigable = false;
          place->steps.push_back({false, components[i], 0});
          parent = valueForComponents(parent, components, i, i + 1);
        }
      }
    }
    return value;
  }
  if (count == 1) return {};

  // Then component by component, where a component that nothing answers may index a list.
  QVariant current = start;
  std::vector<Step> steps{{false, first, 0}};
  bool navigable = true;
  qsizetype i = 1;
  for (; i < count; ++i) {
    const QString& component = components[i];
    QVariant next = component.startsWith(u'@') ? KeyPath::valueForKeyPath(current, component)
                                               : valueForKey(current, component);
    if (GXTemplateValue::isNil(next) && GXTemplateValue::isList(current)) {
      const QVariantList list = current.toList();
      const qsizetype index = leadingIndex(component);
      if (index >= 0 && index < list.size()) {
        next = list[index];
        if (i < count - 1) steps.push_back({true, component, index});
      }
    } else if (i < count - 1) {
      if (!GXTemplateValue::isMap(current) || component.startsWith(u'@')) navigable = false;
      steps.push_back({false, component, 0});
    }
    current = next;
    if (GXTemplateValue::isNil(current)) break;
  }
  if (place) {
    place->root = root;
    place->key = components[qMin(i, count - 1)];
    place->steps = std::move(steps);
    place->navigable = navigable && i >= count;
  }
  return current;
}

QVariant GXTemplateScopes::valueForVariable(const QString& variable) {
  return lookUp(variable, nullptr);
}

void GXTemplateScopes::assign(const Place& place, const QVariant& value) {
  if (!place.root || !place.navigable) return;
  ++valuesVersion_;
  if (place.root == &runVariables_ || place.root == &globals_) ++rootKeysVersion_;
  const bool remove = GXTemplateValue::isNil(value);
  auto storeIn = [&](QVariant& container) {
    if (container.typeId() == QMetaType::QVariantMap) {
      auto* map = static_cast<QVariantMap*>(container.data());
      remove ? void(map->remove(place.key)) : void(map->insert(place.key, value));
    } else if (container.typeId() == QMetaType::QVariantHash) {
      auto* hash = static_cast<QVariantHash*>(container.data());
      remove ? void(hash->remove(place.key)) : void(hash->insert(place.key, value));
    } else if (GXTemplateValue::isList(container) && !remove) {
      // A list replaces the element at the key's integer value.
      if (container.typeId() == QMetaType::QStringList) container = QVariant(container.toList());
      auto* list = static_cast<QVariantList*>(container.data());
      const int index = GXTemplateValue::intValue(QStringView(place.key));
      if (index >= 0 && index < list->size()) (*list)[index] = value;
    }
    // Anything else (records, texts, numbers) takes no keys.
  };
  if (place.steps.empty()) {
    remove ? void(place.root->remove(place.key)) : void(place.root->insert(place.key, value));
    return;
  }
  auto it = place.root->find(place.steps.front().key);
  if (it == place.root->end()) return;
  QVariant* current = &it.value();
  for (size_t s = 1; s < place.steps.size(); ++s) {
    const Step& step = place.steps[s];
    if (step.isIndex) {
      if (current->typeId() == QMetaType::QStringList) *current = QVariant(current->toList());
      if (current->typeId() != QMetaType::QVariantList) return;
      auto* list = static_cast<QVariantList*>(current->data());
      if (step.index < 0 || step.index >= list->size()) return;
      current = &(*list)[step.index];
    } else if (current->typeId() == QMetaType::QVariantMap) {
      auto* map = static_cast<QVariantMap*>(current->data());
      auto found = map->find(step.key);
      if (found == map->end()) return;
      current = &found.value();
    } else if (current->typeId() == QMetaType::QVariantHash) {
      auto* hash = static_cast<QVariantHash*>(current->data());
      auto found = hash->find(step.key);
      if (found == hash->end()) return;
      current = &found.value();
    } else {
      return;
    }
  }
  storeIn(*current);
}

void GXTemplateScopes::setValue(const QVariant& value, const QString& variable, bool forceCurrentStackFrame) {
  ++valuesVersion_;
  if (!forceCurrentStackFrame && !variable.isNull()) {
    // A plain name (loop variables, "currentLoop") replaces the value where it is found.
    Name& name = nameOf(variable);
    const QVariant* entry = nullptr;
    if (name.components.size() == 1) {
      if (QVariantMap* root = rootFor(name, &entry)) {
        if (root == &runVariables_ || root == &globals_) ++rootKeysVersion_;
        GXTemplateValue::isNil(value) ? void(root->remove(variable)) : void(root->insert(variable, value));
        return;
      }
    }
  }
  if (!forceCurrentStackFrame) {
    Place place;
    if (!GXTemplateValue::isNil(lookUp(variable, &place))) {
      assign(place, value);
      return;
    }
  }
  QVariantMap& target = blocks_.empty() ? runVariables_ : blocks_.back().vars;
  if (&target == &runVariables_) ++rootKeysVersion_;
  if (GXTemplateValue::isNil(value)) {
    target.remove(variable);
  } else {
    target.insert(variable, value);
  }
}

QVariant* GXTemplateScopes::variableInInnermostBlock(const QString& name) {
  if (blocks_.empty() || name.isNull()) return nullptr;
  Name& variable = nameOf(name);
  if (variable.components.size() != 1) return nullptr;
  const QVariant* entry = nullptr;
  QVariantMap& frame = blocks_.back().vars;
  if (rootFor(variable, &entry) != &frame) return nullptr;
  ++valuesVersion_;
  return &frame[name];
}

void GXTemplateScopes::setGlobal(const QString& key, const QVariant& value) {
  globals_.insert(key, value);
  ++rootKeysVersion_;
  ++valuesVersion_;
}

void GXTemplateScopes::addGlobals(const QVariantMap& entries) {
  for (auto it = entries.cbegin(); it != entries.cend(); ++it) globals_.insert(it.key(), it.value());
  ++rootKeysVersion_;
  ++valuesVersion_;
}

void GXTemplateScopes::beginRun(const QVariantMap& variables) {
  // Names are kept from run to run, but not without bound.
  if (names_.size() > 4096) {
    recent_.fill({});
    names_.clear();
  }
  runVariables_ = variables;  // values, not references: the caller's variables stay as they are
  ++valuesVersion_;
  ++rootKeysVersion_;
}
