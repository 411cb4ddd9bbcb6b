#pragma once

#include "GXBlockInfo.h"

#include <QString>

class GXTemplateEngine;

// An error of a template run: domain "GXTemplateEngineErrorDomain", a code from 0 to 8 and the message
// (localized, with the "Fatal Error: " prefix when processing could not continue).
struct GXTemplateError {
  QString domain;
  int code = 0;
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
