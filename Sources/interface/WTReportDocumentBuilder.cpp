#include "WTReportDocumentBuilder.h"

#include <QTextDocument>
#include <QThread>

#include <memory>
#include <utility>

namespace {

// A built document on its way back: whoever lets go of it last deletes it, unless it was handed on.
// The delivery may be superseded, or dropped unrun when the builder goes first.
struct DocumentHandOver {
  QTextDocument* document = nullptr;
  ~DocumentHandOver() { delete document; }
};

}  // namespace

WTReportDocumentBuilder::WTReportDocumentBuilder(QObject* parent) : QObject(parent) {
  // One at a time: the machine's other cores are the desktop's, and a build superseded before it began
  // is skipped.
  pool_.setMaxThreadCount(1);
}

WTReportDocumentBuilder::~WTReportDocumentBuilder() {
  ++generation_;
  pool_.waitForDone();
}

void WTReportDocumentBuilder::build(const QString& html, const QTextDocument& prototype) {
  const quint64 generation = ++generation_;
  ++pending_;
  const QFont font = prototype.defaultFont();
  const QString styleSheet = prototype.defaultStyleSheet();
  const qreal margin = prototype.documentMargin();
  QThread* home = thread();
  auto handOver = std::make_shared<DocumentHandOver>();
  pool_.start([this, generation, html, font, styleSheet, margin, home, handOver] {
    if (generation == generation_.load()) {
      auto* document = new QTextDocument;
      document->setDefaultFont(font);
      document->setDefaultStyleSheet(styleSheet);
      document->setDocumentMargin(margin);
      document->setHtml(html);
      document->moveToThread(home);
      handOver->document = document;
    }
    QMetaObject::invokeMethod(
        this,
        [this, generation, handOver] {
          --pending_;
          if (handOver->document && generation == generation_.load())
            emit documentReady(std::exchange(handOver->document, nullptr));
        },
        Qt::QueuedConnection);
  });
}
