#pragma once

#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"

#include <gtest/gtest.h>

#include <QString>
#include <QStringList>
#include <QVariant>

#include <ostream>
#include <vector>

// Readable failure messages for texts.
inline void PrintTo(const QString& text, std::ostream* out) {
  *out << '"' << text.toStdString() << '"';
}

// Records everything the engine tells its delegate.
class RecordingDelegate : public GXTemplateEngineDelegate {
 public:
  struct Error {
    int code;
    QString message;
    bool continuing;
  };

  void templateEngineBlockStarted(GXTemplateEngine*, const GXBlockInfo& block) override {
    events.append(QStringLiteral("start ") + block.name);
  }
  void templateEngineBlockEnded(GXTemplateEngine*, const GXBlockInfo& block) override {
    events.append(QStringLiteral("end ") + block.name);
  }
  void templateEngineFinishedProcessingTemplate(GXTemplateEngine*) override {
    events.append(QStringLiteral("finished"));
  }
  void templateEngineEncounteredError(GXTemplateEngine*, const GXTemplateError& error,
                                      bool continuing) override {
    EXPECT_EQ(error.domain, QStringLiteral("GXTemplateEngineErrorDomain"));
    errors.push_back({int(error.code), error.localizedDescription, continuing});
  }

  QList<int> codes() const {
    QList<int> result;
    for (const Error& error : errors) result.append(error.code);
    return result;
  }

  std::vector<Error> errors;
  QStringList events;
};

// An engine with the ICU matcher and a recording delegate, as the report window sets one up.
class TemplateTest : public ::testing::Test {
 protected:
  TemplateTest() {
    engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
    engine.setDelegate(&delegate);
  }

  QString render(const QString& text, const QVariantMap& variables = {}) {
    delegate.errors.clear();
    delegate.events.clear();
    return engine.processTemplate(text, variables);
  }

  GXTemplateEngine engine;
  RecordingDelegate delegate;
};
