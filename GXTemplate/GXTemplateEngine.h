#pragma once

#include "GXBlockInfo.h"
#include "GXRange.h"
#include "GXTemplateClassRegistry.h"
#include "GXTemplateEngineDelegate.h"
#include "GXTemplateEngineMatcher.h"
#include "GXTemplateFilter.h"
#include "GXTemplateMarker.h"
#include "GXTemplateScopes.h"
#include "GXTemplateValue.h"

#include <QString>
#include <QStringList>
#include <QVariant>
#include <QVariantMap>

#include <cstdint>
#include <memory>
#include <unordered_map>
#include <vector>

// Turns a template text plus a map of variables into an output text. It finds markers and expressions
// through its matcher, hands each marker to the handler registered under the marker's name, keeps the
// stack of open blocks (whose variable frames, with the run's variables and the globals, are its scopes),
// applies filters and reports errors (GXTemplateErrorCode) and block boundaries to its delegate. Main
// thread only; reusable: globals, markers, filters and registered classes persist across runs, everything
// else is reset by each run.
class GXTemplateEngine {
 public:
  // "1.0.0".
  static QString version();
  // A new engine with the standard markers and filters loaded, and no matcher.
  static std::unique_ptr<GXTemplateEngine> templateEngine();

  GXTemplateEngine();
  ~GXTemplateEngine();
  GXTemplateEngine(const GXTemplateEngine&) = delete;
  GXTemplateEngine& operator=(const GXTemplateEngine&) = delete;

  // Delimiters; defaults "{%", "%}", "{{", "}}", "|", and the literal section's marker names "literal" and
  // "/literal". The matcher reads them at the start of each run.
  QString markerStartDelimiter() const { return markerStartDelimiter_; }
  void setMarkerStartDelimiter(const QString& delimiter) { markerStartDelimiter_ = delimiter; }
  QString markerEndDelimiter() const { return markerEndDelimiter_; }
  void setMarkerEndDelimiter(const QString& delimiter) { markerEndDelimiter_ = delimiter; }
  QString expressionStartDelimiter() const { return expressionStartDelimiter_; }
  void setExpressionStartDelimiter(const QString& delimiter) { expressionStartDelimiter_ = delimiter; }
  QString expressionEndDelimiter() const { return expressionEndDelimiter_; }
  void setExpressionEndDelimiter(const QString& delimiter) { expressionEndDelimiter_ = delimiter; }
  QString filterDelimiter() const { return filterDelimiter_; }
  void setFilterDelimiter(const QString& delimiter) { filterDelimiter_ = delimiter; }
  QString literalStartMarker() const { return literalStartMarker_; }
  void setLiteralStartMarker(const QString& marker) { literalStartMarker_ = marker; }
  QString literalEndMarker() const { return literalEndMarker_; }
  void setLiteralEndMarker(const QString& marker) { literalEndMarker_ = marker; }

  // Not owned; may be null.
  GXTemplateEngineDelegate* delegate() const { return delegate_; }
  void setDelegate(GXTemplateEngineDelegate* delegate) { delegate_ = delegate; }
  // Shared with the caller; without one a run reports NoMatcher and gives no result.
  std::shared_ptr<GXTemplateEngineMatcher> matcher() const { return matcher_; }
  void setMatcher(std::shared_ptr<GXTemplateEngineMatcher> matcher) { matcher_ = std::move(matcher); }

  // The template of the current (or last) run, and the part of it not yet consumed.
  const QString& templateContents() const { return templateContents_; }
  GXRange remainingRange() const { return remainingRange_; }

  // Engine-wide variables ("globals"), kept across runs. Each run sets "engine" (a map with "delimiters")
  // and the booleans "true", "false", "YES", "NO", "yes", "no".
  void setObject(const QVariant& object, const QString& key) { scopes_.setGlobal(key, object); }
  void addEntriesFromDictionary(const QVariantMap& entries) { scopes_.addGlobals(entries); }
  QVariant objectForKey(const QString& key) const { return scopes_.global(key); }

  // Registers `marker` under each of its names not yet taken (the first handler loaded for a name keeps
  // it). Null is ignored.
  void loadMarker(std::shared_ptr<GXTemplateMarker> marker);
  void loadFilter(std::shared_ptr<GXTemplateFilter> filter);
  // The classes the "load" marker finds by name; register your own here before running templates that
  // load them.
  GXTemplateClassRegistry& classRegistry() { return classes_; }

  // The output of `templateText` over `variables`, or a null QString when no matcher is set. The output
  // built so far is returned also when processing stops on an error.
  QString processTemplate(const QString& templateText, const QVariantMap& variables);
  // The same for a file (UTF-8, or UTF-16/32 with a byte-order mark); a null QString when it can't be read.
  QString processTemplateInFileAtPath(const QString& path, const QVariantMap& variables);

  // The value of a dotted variable, looked up first among the run's variables, then the globals, then the
  // open blocks' frames from the innermost outward; null when there is none. A component that no map,
  // record or list answers may index a list by its leading digits ("items.2" is the third item).
  QVariant valueForVariable(const QString& variable) { return scopes_.valueForVariable(variable); }
  // Stores a value: where the variable already lives (unless forced), else in the innermost block's frame
  // (or the run's variables when no block is open) under the whole dotted name.
  void setValue(const QVariant& value, const QString& variable, bool forceCurrentStackFrame) {
    scopes_.setValue(value, variable, forceCurrentStackFrame);
  }
  // For the handler of the innermost block, to change one of its frame's values in place (a loop's next
  // round): the value of the plain `name` when that frame is where setValue would store it, else null.
  // The caller must leave a value there (nil would be removed by setValue).
  QVariant* variableInInnermostBlock(const QString& name) { return scopes_.variableInInnermostBlock(name); }
  QVariant resolveVariable(const QString& variable) { return valueForVariable(variable); }
  // A copy of the run's variables.
  QVariantMap templateVariables() const { return scopes_.runVariables(); }

  // For the engine and its handlers: tell the delegate.
  void reportError(const QString& message, GXTemplateErrorCode code, bool continuing);
  void reportBlockBoundaryStarted(bool started);
  void reportTemplateProcessingFinished();

  // Guards against runaway templates (loops over huge ranges, loops that never end): a run stops with the
  // fatal error LimitExceeded once it has handled more markers and expressions than `steps`, or once its
  // output holds more than `length` UTF-16 units. 0 means no limit. Defaults: 200,000,000 steps, 256 Mi
  // units.
  void setMaximumSteps(qint64 steps) { maximumSteps_ = steps; }
  void setMaximumOutputLength(qint64 length) { maximumOutputLength_ = length; }

 private:
  struct Run;
  struct Prepared;

  void beginRun(const QString& templateText, const QVariantMap& variables);
  bool limitReached(Run& run);
  // One handler per kind of thing the matcher finds, each given the match it found. Those that return a
  // flag return false when processing stops.
  bool takeTextBefore(const GXTemplateMatch& match, Run& run);
  void takeTextAfterLastMatch(Run& run);
  bool handleLiteralMarker(const GXTemplateMatch& match, Run& run);
  void handleExpression(const std::shared_ptr<const GXTemplateMatch>& match, Run& run);
  bool handleMarker(const std::shared_ptr<const GXTemplateMatch>& match, Run& run);
  // The block-opening and -closing halves of a marker; openBlock returns false when the marker's output and
  // variables are to be dropped.
  bool openBlock(const GXTemplateMatch& match, GXTemplateMarker* handler);
  bool closeBlock(const QString& name, bool handlerOpenedTopBlock);
  void write(const std::shared_ptr<const GXTemplateMatch>& match, QVariant value, Run& run);
  void endRun();
  Prepared& prepared(const std::shared_ptr<const GXTemplateMatch>& match);
  bool outputEnabled() const { return outputDisabledCount_ == 0; }

  QString markerStartDelimiter_ = QStringLiteral("{%");
  QString markerEndDelimiter_ = QStringLiteral("%}");
  QString expressionStartDelimiter_ = QStringLiteral("{{");
  QString expressionEndDelimiter_ = QStringLiteral("}}");
  QString filterDelimiter_ = QStringLiteral("|");
  QString literalStartMarker_ = QStringLiteral("literal");
  QString literalEndMarker_ = QStringLiteral("/literal");

  GXTemplateEngineDelegate* delegate_ = nullptr;
  std::shared_ptr<GXTemplateEngineMatcher> matcher_;
  QString templateContents_;
  GXRange remainingRange_{0, 0};

  std::vector<GXBlockInfo> openBlocksStack_;
  // The handler that opened each open block (the one registered under its name), beside the stack.
  std::vector<GXTemplateMarker*> openBlockHandlers_;
  GXTemplateScopes scopes_{openBlocksStack_};
  GXTemplateClassRegistry classes_;
  std::unordered_map<QString, std::shared_ptr<GXTemplateMarker>, GXTemplateValue::StringHash> markers_;
  std::unordered_map<QString, std::shared_ptr<GXTemplateFilter>, GXTemplateValue::StringHash> filters_;
  int outputDisabledCount_ = 0;
  qint64 templateLength_ = 0;
  bool literal_ = false;

  qint64 maximumSteps_ = 200'000'000;
  qint64 maximumOutputLength_ = qint64(256) * 1024 * 1024;
  // What the engine looked up for each match of the current run, found again by where the match starts
  // in the template: preparedAt_ holds the entry's index in prepared_, or -1. An entry is the match's
  // only while it holds that match (a handler may have run a template of its own meanwhile). Only
  // handlers and filters that exist are kept: a name unknown now may be loaded later in the run. An
  // entry is good until the next call of prepared().
  struct Prepared {
    std::shared_ptr<const GXTemplateMatch> match;
    GXTemplateMarker* handler = nullptr;
    GXTemplateFilter* filter = nullptr;
    GXTemplateScopes::Name* name = nullptr;
  };
  std::vector<std::int32_t> preparedAt_;
  std::vector<Prepared> prepared_;
};
