#pragma once

#include <QObject>
#include <QThreadPool>

#include <atomic>

class QTextDocument;

// Turns a report's HTML into a text document on a thread of its own. A year of a client's entries is
// megabytes of HTML, and reading it into a document takes over a second: on the window's thread that
// second would stall the whole application, the timers' display included.
//
// Only the newest build is delivered: one started while another is under way, or a cancel(), makes the
// older one's document go unseen (it is deleted). Destroying the builder waits for a build under way.
class WTReportDocumentBuilder : public QObject {
  Q_OBJECT
 public:
  explicit WTReportDocumentBuilder(QObject* parent = nullptr);
  ~WTReportDocumentBuilder() override;

  // Builds a document of `html` with `prototype`'s default font, default style sheet and margin, then
  // emits documentReady on this object's thread.
  void build(const QString& html, const QTextDocument& prototype);
  // Whatever is under way is not delivered.
  void cancel() { ++generation_; }
  bool isBuilding() const { return pending_ > 0; }

 signals:
  // The receiver owns `document`, which lives on this object's thread.
  void documentReady(QTextDocument* document);

 private:
  QThreadPool pool_;
  std::atomic<quint64> generation_ = 0;
  int pending_ = 0;
};
