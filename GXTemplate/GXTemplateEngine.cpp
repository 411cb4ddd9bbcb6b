#include "GXTemplateEngine.h"

#include "GXTemplateStandardFilters.h"
#include "GXTemplateStandardMarkers.h"
#include "GXTemplateValue.h"

#include <QCoreApplication>
#include <QFile>
#include <QStringDecoder>

namespace {

const QString kErrorDomain = QStringLiteral("GXTemplateEngineErrorDomain");

// "%@" of a name that may be missing.
QString named(const QString& name) {
  return name.isNull() ? QStringLiteral("(null)") : name;
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

QString invalidRangeMessage(const QString& name) {
  return QStringLiteral("Marker handler \"%1\" specified an invalid range to resume processing from")
      .arg(named(name));
}

}  // namespace

// What one run has built so far, and the template it reads.
struct GXTemplateEngine::Run {
  QString output;
  QStringView source;
  std::uint64_t length = 0;
  qint64 steps = 0;
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

void GXTemplateEngine::reportError(const QString& message, GXTemplateErrorCode code, bool continuing) {
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
  beginRun(templateText, variables);
  if (!matcher_) {
    reportError(QStringLiteral("No matcher has been configured for the template engine"),
                GXTemplateErrorCode::NoMatcher, false);
    return QString();
  }
  matcher_->engineSettingsChanged();
  Run run{QLatin1String(""), QStringView(templateContents_), std::uint64_t(templateLength_)};
  while (remainingRange_.location != kGXNotFound && !limitReached(run)) {
    const std::shared_ptr<const GXTemplateMatch> match = matcher_->firstMarkerWithinRange(remainingRange_);
    if (!match) {
      takeTextAfterLastMatch(run);
      break;
    }
    if (!takeTextBefore(*match, run)) break;
    if (handleLiteralMarker(*match, run)) continue;
    if (!match->isMarker()) {
      handleExpression(match, run);
    } else if (!handleMarker(match, run)) {
      break;
    }
  }
  endRun();
  return run.output;
}

void GXTemplateEngine::beginRun(const QString& templateText, const QVariantMap& variables) {
  openBlocksStack_.clear();
  openBlockHandlers_.clear();
  // Before the scopes begin: prepared entries point into the names they may forget.
  prepared_.clear();
  preparedAt_.assign(size_t(templateText.size()) + 1, -1);
  const QVariantMap delimiters{{QStringLiteral("markerStart"), markerStartDelimiter_},
                               {QStringLiteral("markerEnd"), markerEndDelimiter_},
                               {QStringLiteral("expressionStart"), expressionStartDelimiter_},
                               {QStringLiteral("expressionEnd"), expressionEndDelimiter_},
                               {QStringLiteral("filter"), filterDelimiter_}};
  scopes_.setGlobal(QStringLiteral("engine"), QVariantMap{{QStringLiteral("delimiters"), delimiters}});
  for (const char* name : {"true", "YES", "yes"}) scopes_.setGlobal(QLatin1String(name), true);
  for (const char* name : {"false", "NO", "no"}) scopes_.setGlobal(QLatin1String(name), false);
  scopes_.beginRun(variables);
  outputDisabledCount_ = 0;
  templateContents_ = templateText;
  templateLength_ = templateText.size();
  remainingRange_ = {0, std::uint64_t(templateLength_)};
  literal_ = false;
}

bool GXTemplateEngine::limitReached(Run& run) {
  if (maximumOutputLength_ > 0 && run.output.size() > maximumOutputLength_) {
    reportError(
        QStringLiteral("Processing stopped: the output grew beyond %1 characters").arg(maximumOutputLength_),
        GXTemplateErrorCode::LimitExceeded, false);
    return true;
  }
  if (maximumSteps_ > 0 && ++run.steps > maximumSteps_) {
    reportError(QStringLiteral("Processing stopped: more than %1 markers and expressions").arg(maximumSteps_),
                GXTemplateErrorCode::LimitExceeded, false);
    return true;
  }
  return false;
}

bool GXTemplateEngine::takeTextBefore(const GXTemplateMatch& match, Run& run) {
  const GXRange range = match.range;
  if (!GXRangeFitsLength(range, run.length) || range.location < remainingRange_.location) {
    // Only a faulty matcher gets here; resuming from its range could run forever.
    reportError(invalidRangeMessage(match.name), GXTemplateErrorCode::InvalidResumeRange, false);
    return false;
  }
  if (outputEnabled()) {
    run.output += run.source.mid(qsizetype(remainingRange_.location),
                                 qsizetype(range.location - remainingRange_.location));
  }
  const std::uint64_t end = range.location + range.length;
  remainingRange_ = {end, run.length - end};
  return true;
}

void GXTemplateEngine::takeTextAfterLastMatch(Run& run) {
  if (outputEnabled())
    run.output += run.source.mid(qsizetype(remainingRange_.location), qsizetype(remainingRange_.length));
  if (!openBlocksStack_.empty()) {
    QStringList names;
    for (const GXBlockInfo& block : openBlocksStack_) names.append(block.name);
    reportError(QStringLiteral("Finished processing template, but %1 %2 left open (%3).")
                    .arg(openBlocksStack_.size())
                    .arg(blockCountText(qsizetype(openBlocksStack_.size())), names.join(QLatin1String(", "))),
                GXTemplateErrorCode::BlocksLeftOpen, true);
  }
  remainingRange_.location = kGXNotFound;
}

// Literal sections: everything between the two markers is written as it stands. True when the match was
// taken as part of one.
bool GXTemplateEngine::handleLiteralMarker(const GXTemplateMatch& match, Run& run) {
  const QString& name = match.name;
  auto text = [&] { return run.source.mid(qsizetype(match.range.location), qsizetype(match.range.length)); };
  if (!name.isNull() && name == literalStartMarker_) {
    if (!literal_ || !outputEnabled()) {
      literal_ = true;
    } else {
      run.output += text();
    }
    return true;
  }
  if (!name.isNull() && name == literalEndMarker_) {
    literal_ = false;
    return true;
  }
  if (literal_ && outputEnabled()) {
    run.output += text();
    return true;
  }
  return false;
}

GXTemplateEngine::Prepared& GXTemplateEngine::prepared(const std::shared_ptr<const GXTemplateMatch>& match) {
  const size_t at = size_t(match->range.location);
  if (at >= preparedAt_.size()) preparedAt_.resize(at + 1, -1);
  std::int32_t& slot = preparedAt_[at];
  if (slot < 0 || prepared_[size_t(slot)].match != match) {
    slot = std::int32_t(prepared_.size());
    prepared_.push_back({match});
  }
  return prepared_[size_t(slot)];
}

void GXTemplateEngine::handleExpression(const std::shared_ptr<const GXTemplateMatch>& match, Run& run) {
  // An expression's value is only ever written or reported while output is enabled, and looking a value
  // up changes nothing, so a disabled region (a branch not taken, a level not shown) skips the lookup.
  if (!outputEnabled()) return;
  const QString& name = match->name;
  QVariant value;
  if (!name.isNull()) {
    Prepared& entry = prepared(match);
    if (!entry.name) entry.name = &scopes_.nameOf(name);
    value = scopes_.read(*entry.name, name);
  }
  if (GXTemplateValue::isNil(value)) {
    reportError(QStringLiteral("\"%1\" is not a valid %2").arg(named(name), QStringLiteral("variable")),
                GXTemplateErrorCode::UnknownVariable, true);
    return;
  }
  write(match, std::move(value), run);
}

bool GXTemplateEngine::handleMarker(const std::shared_ptr<const GXTemplateMatch>& match, Run& run) {
  const QString& name = match->name;
  Prepared& entry = prepared(match);
  if (!entry.handler && !name.isNull()) {
    const auto found = markers_.find(name);
    if (found != markers_.end()) entry.handler = found->second.get();
  }
  GXTemplateMarker* const handler = entry.handler;
  if (!handler) {
    reportError(QStringLiteral("\"%1\" is not a valid %2").arg(named(name), QStringLiteral("marker")),
                GXTemplateErrorCode::UnknownMarker, true);
    return true;
  }

  bool blockStarted = false;
  bool blockEnded = false;
  const bool enabledBefore = outputEnabled();
  bool enabled = enabledBefore;
  GXRange nextRange = remainingRange_;
  std::optional<QVariantMap> newVariables;
  // Names are never re-registered, so the handler that opened the top block is the one under its name.
  const bool openedTopBlock = !openBlocksStack_.empty() && openBlockHandlers_.back() == handler;
  QVariant value = handler->markerEncountered(
      name, match->args, match->range, blockStarted, blockEnded, enabled, nextRange,
      openedTopBlock ? &openBlocksStack_.back() : nullptr, newVariables);
  if (enabled != enabledBefore) enabled ? --outputDisabledCount_ : ++outputDisabledCount_;
  remainingRange_ = nextRange;
  if (!GXRangeFitsLength(nextRange, run.length)) {
    reportError(invalidRangeMessage(name), GXTemplateErrorCode::InvalidResumeRange, false);
    return false;
  }

  bool opened = false;
  if (blockStarted && blockEnded) {
    reportError(
        QStringLiteral("Marker \"%1\" reported that a block simultaneously began and ended").arg(named(name)),
        GXTemplateErrorCode::BlockBeganAndEnded, true);
  } else if (blockStarted) {
    if (!openBlock(*match, handler)) return true;
    opened = true;
  } else if (blockEnded && !closeBlock(name, openedTopBlock)) {
    return false;
  }
  if (newVariables) {
    for (auto it = newVariables->cbegin(); it != newVariables->cend(); ++it)
      scopes_.setValue(it.value(), it.key(), opened);
  }
  if (!GXTemplateValue::isNil(value) && outputEnabled()) write(match, std::move(value), run);
  return true;
}

bool GXTemplateEngine::openBlock(const GXTemplateMatch& match, GXTemplateMarker* handler) {
  const std::optional<QStringList> endNames = handler->endMarkersForMarker(match.name);
  if (!endNames) {
    reportError(QStringLiteral("Marker \"%1\" started a block but did not supply any suitable end-markers")
                    .arg(named(match.name)),
                GXTemplateErrorCode::NoEndMarkers, true);
    return false;
  }
  openBlocksStack_.push_back(GXBlockInfo{match.name, *endNames, match.args, match.range, {}});
  openBlockHandlers_.push_back(handler);
  reportBlockBoundaryStarted(true);
  return true;
}

bool GXTemplateEngine::closeBlock(const QString& name, bool handlerOpenedTopBlock) {
  if (!handlerOpenedTopBlock ||
      (!openBlocksStack_.empty() && !openBlocksStack_.back().endNames.contains(name))) {
    // Reported as continuing, yet the run ends here: what follows a wrongly closed block is not trusted.
    reportError(
        openBlocksStack_.empty()
            ? QStringLiteral("Marker \"%1\" reported that a non-existent block ended").arg(named(name))
            : QStringLiteral("Marker \"%1\" reported that a block ended, but current block was started by "
                             "\"%2\" marker")
                  .arg(named(name), openBlocksStack_.back().name),
        GXTemplateErrorCode::UnopenedBlockEnded, true);
    return false;
  }
  reportBlockBoundaryStarted(false);
  // (A handler that ran a template of its own on this engine has emptied the stack.)
  if (!openBlocksStack_.empty()) {
    scopes_.blockClosing();
    openBlocksStack_.pop_back();
    openBlockHandlers_.pop_back();
  }
  return true;
}

// Writes a value through the match's filter, if it has one (a filter nobody serves leaves the value as it
// is). Output is enabled.
void GXTemplateEngine::write(const std::shared_ptr<const GXTemplateMatch>& match, QVariant value, Run& run) {
  if (!match->filter.isNull()) {
    // A marker's handler may have run a template of its own meanwhile, so the entry is looked up again.
    Prepared& entry = prepared(match);
    if (!entry.filter) {
      const auto found = filters_.find(match->filter);
      if (found != filters_.end()) entry.filter = found->second.get();
    }
    if (entry.filter) value = entry.filter->filterInvoked(match->filter, match->filterArgs, value);
  }
  if (!GXTemplateValue::isNil(value)) appendDescription(run.output, value);
}

void GXTemplateEngine::endRun() {
  // Every registration hears of the end, so a handler under several names hears it once per name.
  std::vector<std::shared_ptr<GXTemplateMarker>> handlers;
  handlers.reserve(markers_.size());
  for (const auto& entry : markers_) handlers.push_back(entry.second);
  for (const std::shared_ptr<GXTemplateMarker>& handler : handlers)
    handler->engineFinishedProcessingTemplate();
  reportTemplateProcessingFinished();
}
