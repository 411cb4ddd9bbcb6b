#include "GXTemplateEngine.h"

#include "GXTemplateStandardFilters.h"
#include "GXTemplateStandardMarkers.h"
#include "GXTemplateValue.h"
#include "KeyPath.h"

#include <QCoreApplication>
#include <QFile>
#include <QStringDecoder>

#include <limits>

namespace {

const QString kErrorDomain = QStringLiteral("GXTemplateEngineErrorDomain");

// "%@" of a name that may be missing.
QString named(const QString& name) {
  return name.isNull() ? QStringLiteral("(null)") : name;
}

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

QString blockCountText(qsizetype count) {
  return count == 1 ? QStringLiteral("block was") : QStringLiteral("blocks were");
}

void appendDescription(QString& output, const QVariant& value) {
  if (value.typeId() == QMetaType::QString) {
    output += *static_cast<const QString*>(value.constData());
  } else {
    output += GXTemplateValue::description(value);
  }
}

}  // namespace

// One step from a root frame toward the container that holds a variable.
struct GXTemplateEngine::Step {
  bool isIndex = false;
  QString key;
  qsizetype index = 0;
};

// Where a variable lives: its root frame and the steps from there to its container, when those can be
// taken again to change it (maps by key, lists by index).
struct GXTemplateEngine::Place {
  QVariantMap* root = nullptr;
  std::vector<Step> steps;
  bool navigable = true;
  QString key;
  bool wantsParent = false;  // only callers of valueForVariable ask for the container itself
  QVariant parent;
};

QString GXTemplateEngine::version() {
  return QStringLiteral("1.0.0");
}

std::unique_ptr<GXTemplateEngine> GXTemplateEngine::templateEngine() {
  return std::make_unique<GXTemplateEngine>();
}

GXTemplateEngine::GXTemplateEngine() {
  loadMarker(std::make_shared<GXTemplateStandardMarkers>(this));
  loadFilter(std::make_shared<GXTemplateStandardFilters>());
}

GXTemplateEngine::~GXTemplateEngine() = default;

void GXTemplateEngine::addEntriesFromDictionary(const QVariantMap& entries) {
  for (auto it = entries.cbegin(); it != entries.cend(); ++it) globals_.insert(it.key(), it.value());
  ++rootKeysVersion_;
  ++valuesVersion_;
}

void GXTemplateEngine::loadMarker(std::shared_ptr<GXTemplateMarker> marker) {
  if (!marker) return;
  for (const QString& name : marker->markers()) markers_.try_emplace(name, marker);
}

void GXTemplateEngine::loadFilter(std::shared_ptr<GXTemplateFilter> filter) {
  if (!filter) return;
  for (const QString& name : filter->filters()) filters_.try_emplace(name, filter);
}

QString GXTemplateEngine::processTemplateInFileAtPath(const QString& path, const QVariantMap& variables) {
  QFile file(path);
  if (!file.open(QIODevice::ReadOnly)) return QString();
  const QByteArray data = file.readAll();
  if (file.error() != QFileDevice::NoError) return QString();
  // A byte-order mark decides the encoding; without one the text must be UTF-8.
  const std::optional<QStringConverter::Encoding> marked = QStringConverter::encodingForData(data);
  QStringDecoder decoder(marked.value_or(QStringConverter::Utf8));
  QString text = decoder.decode(data);
  if (decoder.hasError()) return QString();
  if (text.isNull()) text = QLatin1String("");
  return processTemplate(text, variables);
}

GXTemplateEngine::VariableName& GXTemplateEngine::nameOf(const QString& variable) {
  auto it = names_.find(variable);
  if (it != names_.end()) return it->second;
  VariableName name;
  name.components = variable.split(u'.');
  return names_.emplace(variable, std::move(name)).first->second;
}

QVariantMap* GXTemplateEngine::rootFor(VariableName& name, const QVariant** entry) {
  const QString& first = name.components.first();
  // The entry a frame holds under the first component, or null.
  auto entryIn = [&first](const QVariantMap& frame) -> const QVariant* {
    const auto it = frame.constFind(first);
    return it != frame.cend() && !GXTemplateValue::isNil(*it) ? &*it : nullptr;
  };
  // The run's variables shadow the globals, and both shadow block variables of the same first name.
  if (name.absentFromRootsVersion != rootKeysVersion_) {
    if ((*entry = entryIn(templateVariables_))) return &templateVariables_;
    if ((*entry = entryIn(globals_))) return &globals_;
    name.absentFromRootsVersion = rootKeysVersion_;
  }
  for (auto it = openBlocksStack_.rbegin(); it != openBlocksStack_.rend(); ++it) {
    if ((*entry = entryIn(it->vars))) return &it->vars;
  }
  return nullptr;
}

QVariant GXTemplateEngine::lookUp(const QString& variable, Place* place) {
  if (variable.isNull()) return {};
  return lookUp(nameOf(variable), variable, place);
}

QVariant GXTemplateEngine::lookUp(VariableName& name, const QString& variable, Place* place) {
  // Only plain reads are remembered: a caller asking for the place may go on to change the value.
  if (place) return resolve(name, variable, place);
  if (name.memoVersion != valuesVersion_) {
    name.memo = resolve(name, variable, nullptr);
    name.memoVersion = valuesVersion_;
  }
  return name.memo;
}

QVariant GXTemplateEngine::resolve(VariableName& name, const QString& variable, Place* place) {
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
        if (place->wantsParent) place->parent = QVariant(*root);
      } else {
        place->key = components.last();
        QVariant parent = start;
        place->steps.push_back({false, first, 0});
        for (qsizetype i = 1; i < count - 1; ++i) {
          if (!GXTemplateValue::isMap(parent) || components[i].startsWith(u'@')) place->navigable = false;
          place->steps.push_back({false, components[i], 0});
          parent = valueForComponents(parent, components, i, i + 1);
        }
        if (place->wantsParent) place->parent = valueForComponents(start, components, 1, count - 1);
      }
    }
    return value;
  }
  if (count == 1) return {};

  // Then component by component, where a component that nothing answers may index a list.
  QVariant current = start;
  QVariant container = QVariant(*root);
  std::vector<Step> steps{{false, first, 0}};
  bool navigable = true;
  qsizetype i = 1;
  for (; i < count; ++i) {
    container = current;
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
    place->parent = container;
    place->steps = std::move(steps);
    place->navigable = navigable && i >= count;
  }
  return current;
}

QVariant GXTemplateEngine::valueForVariable(const QString& variable, QVariant* parent, QString* parentKey) {
  if (!parent && !parentKey) return lookUp(variable, nullptr);
  Place place;
  place.wantsParent = parent != nullptr;
  QVariant value = lookUp(variable, &place);
  if (parent) *parent = GXTemplateValue::isNil(value) && place.root == nullptr ? QVariant() : place.parent;
  if (parentKey) *parentKey = place.key;
  return value;
}

void GXTemplateEngine::assign(const Place& place, const QVariant& value) {
  if (!place.root || !place.navigable) return;
  ++valuesVersion_;
  if (place.root == &templateVariables_ || place.root == &globals_) ++rootKeysVersion_;
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

void GXTemplateEngine::setValue(const QVariant& value, const QString& variable, bool forceCurrentStackFrame) {
  ++valuesVersion_;
  if (!forceCurrentStackFrame && !variable.isNull()) {
    // A plain name (loop variables, "currentLoop") replaces the value where it is found.
    VariableName& name = nameOf(variable);
    const QVariant* entry = nullptr;
    if (name.components.size() == 1) {
      if (QVariantMap* root = rootFor(name, &entry)) {
        if (root == &templateVariables_ || root == &globals_) ++rootKeysVersion_;
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
  QVariantMap& target = openBlocksStack_.empty() ? templateVariables_ : openBlocksStack_.back().vars;
  if (&target == &templateVariables_) ++rootKeysVersion_;
  if (GXTemplateValue::isNil(value)) {
    target.remove(variable);
  } else {
    target.insert(variable, value);
  }
}

QVariant* GXTemplateEngine::variableInInnermostBlock(const QString& name) {
  if (openBlocksStack_.empty() || name.isNull()) return nullptr;
  VariableName& variable = nameOf(name);
  if (variable.components.size() != 1) return nullptr;
  const QVariant* entry = nullptr;
  QVariantMap& frame = openBlocksStack_.back().vars;
  if (rootFor(variable, &entry) != &frame) return nullptr;
  ++valuesVersion_;
  return &frame[name];
}

void GXTemplateEngine::reportError(const QString& message, int code, bool continuing) {
  if (!delegate_) return;
  QString text = QCoreApplication::translate("GXTemplateEngine", message.toUtf8().constData());
  if (!continuing)
    text = QCoreApplication::translate("GXTemplateEngine", "Fatal Error") + QLatin1String(": ") + text;
  delegate_->templateEngineEncounteredError(this, GXTemplateError{kErrorDomain, code, text}, continuing);
}

void GXTemplateEngine::reportBlockBoundaryStarted(bool started) {
  if (!delegate_ || openBlocksStack_.empty() || !delegate_->observesBlocks()) return;
  // A copy: the delegate may call back into the engine.
  const GXBlockInfo top = openBlocksStack_.back();
  if (started) {
    delegate_->templateEngineBlockStarted(this, top);
  } else {
    delegate_->templateEngineBlockEnded(this, top);
  }
}

void GXTemplateEngine::reportTemplateProcessingFinished() {
  if (delegate_) delegate_->templateEngineFinishedProcessingTemplate(this);
}

QString GXTemplateEngine::processTemplate(const QString& templateText, const QVariantMap& variables) {
  openBlocksStack_.clear();
  openBlockHandlers_.clear();
  prepared_.clear();
  // Names are kept from run to run, but not without bound (prepared entries of a run point into them).
  if (names_.size() > 4096) names_.clear();
  const QVariantMap delimiters{{QStringLiteral("markerStart"), markerStartDelimiter_},
                               {QStringLiteral("markerEnd"), markerEndDelimiter_},
                               {QStringLiteral("expressionStart"), expressionStartDelimiter_},
                               {QStringLiteral("expressionEnd"), expressionEndDelimiter_},
                               {QStringLiteral("filter"), filterDelimiter_}};
  globals_.insert(QStringLiteral("engine"), QVariantMap{{QStringLiteral("delimiters"), delimiters}});
  for (const char* name : {"true", "YES", "yes"}) globals_.insert(QLatin1String(name), true);
  for (const char* name : {"false", "NO", "no"}) globals_.insert(QLatin1String(name), false);
  outputDisabledCount_ = 0;
  templateContents_ = templateText;
  templateLength_ = templateText.size();
  templateVariables_ = variables;  // values, not references: the caller's variables stay as they are
  ++valuesVersion_;
  ++rootKeysVersion_;
  remainingRange_ = {0, std::uint64_t(templateLength_)};
  literal_ = false;

  if (!matcher_) {
    reportError(QStringLiteral("No matcher has been configured for the template engine"), 7, false);
    return QString();
  }
  matcher_->engineSettingsChanged();
  QString output = QLatin1String("");
  const QStringView source(templateContents_);
  const std::uint64_t length = std::uint64_t(templateLength_);
  qint64 steps = 0;
  auto overLimit = [&] {
    if (maximumOutputLength_ > 0 && output.size() > maximumOutputLength_) {
      reportError(QStringLiteral("Processing stopped: the output grew beyond %1 characters")
                      .arg(maximumOutputLength_),
                  8, false);
      return true;
    }
    return false;
  };

  while (remainingRange_.location != kGXNotFound) {
    if (overLimit()) break;
    if (maximumSteps_ > 0 && ++steps > maximumSteps_) {
      reportError(
          QStringLiteral("Processing stopped: more than %1 markers and expressions").arg(maximumSteps_), 8,
          false);
      break;
    }
    const std::shared_ptr<const GXTemplateMatch> match = matcher_->firstMarkerWithinRange(remainingRange_);
    if (!match) {
      if (outputEnabled())
        output += source.mid(qsizetype(remainingRange_.location), qsizetype(remainingRange_.length));
      if (!openBlocksStack_.empty()) {
        QStringList names;
        for (const GXBlockInfo& block : openBlocksStack_) names.append(block.name);
        reportError(
            QStringLiteral("Finished processing template, but %1 %2 left open (%3).")
                .arg(openBlocksStack_.size())
                .arg(blockCountText(qsizetype(openBlocksStack_.size())), names.join(QLatin1String(", "))),
            6, true);
      }
      remainingRange_.location = kGXNotFound;
      break;
    }

    const GXRange matchRange = match->range;
    const QString& name = match->name;
    if (!GXRangeFitsLength(matchRange, length) || matchRange.location < remainingRange_.location) {
      // Only a faulty matcher gets here; resuming from its range could run forever.
      reportError(QStringLiteral("Marker handler \"%1\" specified an invalid range to resume processing from")
                      .arg(named(name)),
                  5, false);
      break;
    }
    if (outputEnabled()) {
      output += source.mid(qsizetype(remainingRange_.location),
                           qsizetype(matchRange.location - remainingRange_.location));
    }
    const std::uint64_t matchEnd = matchRange.location + matchRange.length;
    remainingRange_ = {matchEnd, length - matchEnd};
    const QStringView matchSource = source.mid(qsizetype(matchRange.location), qsizetype(matchRange.length));

    // Literal sections: everything between the two markers is written as it stands.
    if (!name.isNull() && name == literalStartMarker_) {
      if (!literal_ || !outputEnabled()) {
        literal_ = true;
      } else {
        output += matchSource;
      }
      continue;
    }
    if (!name.isNull() && name == literalEndMarker_) {
      literal_ = false;
      continue;
    }
    if (literal_ && outputEnabled()) {
      output += matchSource;
      continue;
    }

    QVariant value;
    const bool isMarker = match->isMarker();
    GXTemplateMarker* handler = nullptr;
    Prepared& prepared = prepared_[match.get()];
    if (!prepared.match) prepared.match = match;
    if (!isMarker) {
      // An expression's value is only ever written or reported while output is enabled, and looking a
      // value up changes nothing, so a disabled region (the other levels of a report) skips the lookup.
      if (!name.isNull() && outputEnabled()) {
        if (!prepared.name) prepared.name = &nameOf(name);
        value = lookUp(*prepared.name, name, nullptr);
      }
    } else {
      if (!prepared.handler && !name.isNull()) {
        const auto found = markers_.find(name);
        if (found != markers_.end()) prepared.handler = found->second.get();
      }
      handler = prepared.handler;
      bool blockStarted = false;
      bool blockEnded = false;
      const bool enabledBefore = outputEnabled();
      bool enabled = enabledBefore;
      GXRange nextRange = remainingRange_;
      std::optional<QVariantMap> newVariables;
      const GXBlockInfo* currentBlock = nullptr;
      // Names are never re-registered, so the handler that opened the top block is the one under its name.
      if (handler && !openBlocksStack_.empty() && openBlockHandlers_.back() == handler) {
        currentBlock = &openBlocksStack_.back();
      }
      const bool hadCurrentBlock = currentBlock != nullptr;
      if (handler) {
        value = handler->markerEncountered(name, match->args, matchRange, blockStarted, blockEnded, enabled,
                                           nextRange, currentBlock, newVariables);
      }
      if (enabled != enabledBefore) enabled ? --outputDisabledCount_ : ++outputDisabledCount_;
      remainingRange_ = nextRange;
      if (!GXRangeFitsLength(nextRange, length)) {
        reportError(
            QStringLiteral("Marker handler \"%1\" specified an invalid range to resume processing from")
                .arg(named(name)),
            5, false);
        break;
      }

      bool pushed = false;
      if (blockStarted && blockEnded) {
        reportError(QStringLiteral("Marker \"%1\" reported that a block simultaneously began and ended")
                        .arg(named(name)),
                    0, true);
      } else if (blockStarted) {
        const std::optional<QStringList> endNames = handler->endMarkersForMarker(name);
        if (!endNames) {
          reportError(
              QStringLiteral("Marker \"%1\" started a block but did not supply any suitable end-markers")
                  .arg(named(name)),
              4, true);
          continue;
        }
        openBlocksStack_.push_back(GXBlockInfo{name, *endNames, match->args, matchRange, {}});
        openBlockHandlers_.push_back(handler);
        reportBlockBoundaryStarted(true);
        pushed = true;
      } else if (blockEnded) {
        if (!hadCurrentBlock ||
            (!openBlocksStack_.empty() && !openBlocksStack_.back().endNames.contains(name))) {
          // Reported as continuing, yet the run ends here: what follows a wrongly closed block is not
          // trusted.
          reportError(
              openBlocksStack_.empty()
                  ? QStringLiteral("Marker \"%1\" reported that a non-existent block ended").arg(named(name))
                  : QStringLiteral("Marker \"%1\" reported that a block ended, but current block was started "
                                   "by \"%2\" marker")
                        .arg(named(name), openBlocksStack_.back().name),
              1, true);
          break;
        }
        reportBlockBoundaryStarted(false);
        if (!openBlocksStack_.empty()) {
          // Only a frame that held values changes what a name reads (an opened one starts empty).
          if (!openBlocksStack_.back().vars.isEmpty()) ++valuesVersion_;
          openBlocksStack_.pop_back();
          openBlockHandlers_.pop_back();
        }
      }
      if (newVariables) {
        for (auto it = newVariables->cbegin(); it != newVariables->cend(); ++it)
          setValue(it.value(), it.key(), pushed);
      }
    }

    if (!GXTemplateValue::isNil(value)) {
      if (outputEnabled()) {
        if (!match->filter.isNull()) {
          // A filter nobody serves leaves the value as it is. (The handler may have run a template of its
          // own meanwhile, so the prepared entry is looked up again.)
          Prepared& again = prepared_[match.get()];
          if (!again.match) again.match = match;
          if (!again.filter) {
            const auto found = filters_.find(match->filter);
            if (found != filters_.end()) again.filter = found->second.get();
          }
          if (again.filter) value = again.filter->filterInvoked(match->filter, match->filterArgs, value);
        }
        if (!GXTemplateValue::isNil(value)) appendDescription(output, value);
      }
    } else if (isMarker) {
      if (!handler)
        reportError(QStringLiteral("\"%1\" is not a valid %2").arg(named(name), QStringLiteral("marker")), 2,
                    true);
    } else if (outputEnabled()) {
      reportError(QStringLiteral("\"%1\" is not a valid %2").arg(named(name), QStringLiteral("variable")), 3,
                  true);
    }
  }

  // Every registration hears of the end, so a handler under several names hears it once per name.
  std::vector<std::shared_ptr<GXTemplateMarker>> handlers;
  handlers.reserve(markers_.size());
  for (const auto& entry : markers_) handlers.push_back(entry.second);
  for (const std::shared_ptr<GXTemplateMarker>& handler : handlers)
    handler->engineFinishedProcessingTemplate();
  reportTemplateProcessingFinished();
  return output;
}
