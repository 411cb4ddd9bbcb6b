#pragma once

#include "GXBlockInfo.h"

#include <QString>

class GXTemplateEngine;

// What went wrong in a template run. The numbers are part of the engine's interface (`tessal template`
// prints them as "error CODE: MESSAGE"), so they never change.
enum class GXTemplateErrorCode {
  BlockBeganAndEnded = 0,  // a marker both began and ended a block; neither is honoured
  UnopenedBlockEnded = 1,  // a block ended that is not open; processing stops
  UnknownMarker = 2,
  UnknownVariable = 3,
  NoEndMarkers = 4,        // a block without end markers; the marker's output and variables are dropped
  InvalidResumeRange = 5,  // fatal
  BlocksLeftOpen = 6,      // reported at the end of the run
  NoMatcher = 7,           // fatal, no result
  LimitExceeded = 8,       // a run exceeded its work or output limit; fatal (see setMaximumSteps)
};

// An error of a template run: domain "GXTemplateEngineErrorDomain", its code and the message (localized,
// with the "Fatal Error: " prefix when processing could not continue).
struct GXTemplateError {
  QString domain;
  GXTemplateErrorCode code = GXTemplateErrorCode::BlockBeganAndEnded;
  QString localizedDescription;
};

// Told of a run's errors and block boundaries. Every operation is optional: the defaults do nothing.
class GXTemplateEngineDelegate {
 public:
  virtual ~GXTemplateEngineDelegate() = default;
  // Whether the two block calls below are wanted. A delegate that has no use for them says no, and the
  // engine spares each block's opening and closing the copy of its block info that the calls need.
  virtual bool observesBlocks() const { return true; }
  // A block was opened; `blockInfo` is the new innermost block.
  virtual void templateEngineBlockStarted(GXTemplateEngine* engine, const GXBlockInfo& blockInfo) {
    (void)engine;
    (void)blockInfo;
  }
  // A block is about to close; `blockInfo` is the closing block, still on the stack.
  virtual void templateEngineBlockEnded(GXTemplateEngine* engine, const GXBlockInfo& blockInfo) {
    (void)engine;
    (void)blockInfo;
  }
  virtual void templateEngineFinishedProcessingTemplate(GXTemplateEngine* engine) { (void)engine; }
  virtual void templateEngineEncounteredError(GXTemplateEngine* engine, const GXTemplateError& error,
                                              bool isContinuing) {
    (void)engine;
    (void)error;
    (void)isContinuing;
  }
};
