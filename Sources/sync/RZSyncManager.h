#pragma once

#include "RZSyncNetwork.h"
#include "RZSyncTrack.h"
#include "WTObjectContext.h"

#include <QObject>
#include <QPointer>
#include <QSet>
#include <QTimer>
#include <QUrl>
#include <QVariant>

#include <functional>
#include <memory>

class RZSyncErrorPresenter;
class RZSyncKeptWork;
class UserDefaults;
class WTObject;

// What became of one request, for whoever drives the sync (the `tessal sync` command, tests).
struct RZSyncExchange {
  enum class Outcome {
    Answered,  // the server answered (a "head" merged, a "save" confirmed, or a request to poll first)
    Refused,   // the server answered with an error other than code 4: syncing is off now
    Failed,    // no usable answer: transport failure or a reply that is not JSON
  };
  QString action;  // the action of the request that was answered: "head" or "save"
  Outcome outcome = Outcome::Answered;
  bool receivedChanges = false;  // a "head" whose result held any change
  QString message;               // what went wrong, for Refused and Failed
};

// Keeps the object store and the server account in step. It owns the change journal (attached to the
// context, so every save journals its records in its own transaction) and the network client, polls
// "head" on a timer, merges the server's changes into the context by uuid, sends local changes with
// "save", and writes what it changes in the journal as the rows it touches. Main thread only.
//
// To lose nothing it also: forgets only what a confirmed save sent (edits made while it
// was on its way stay pending); moves the journal's iteration to a merged head at once; resumes polling
// after a good reply that ends a run of failures; names this installation ("device") in every request;
// never lets the merge re-create or change a record whose deletion is still waiting to be sent; journals
// cleared values as null; journals as deletions what its local cascade removes beyond the server's;
// keeps from that cascade the work added here that the deleting device never saw (RZSyncKeptWork); folds
// records made here into those made elsewhere first by the same names or import rows (RZSyncTwins); and
// tells the user of what it kept and of changes made here that the server's replaced.
class RZSyncManager : public QObject, public RZSyncNetworkDelegate {
  Q_OBJECT
 public:
  static constexpr const char* kEndpointPath = "/sync/tessal/sync.php";

  struct Intervals {
    int pollMs = 5000;       // between polls
    int retryMs = 15000;     // after a failed exchange
    int afterSaveMs = 5000;  // after every save of the context
    // The records one save carries at most: a large journal (an import) goes in pieces, each well within
    // the server's limits on a request's size and time.
    int recordsPerSave = 5000;
  };

  // Reads the journal of the context's store (see RZSyncTrack), attaches it to `context` and watches the
  // context's saves. The server address and this installation's identity come from the context's user
  // defaults ("WTSyncServer", "WTSyncDevice"; the identity is made and stored on first use). Syncing is
  // off until enableSync(). `context` is not owned and must outlive the manager.
  explicit RZSyncManager(WTObjectContext* context, QObject* parent = nullptr);
  ~RZSyncManager() override;

  WTObjectContext* managedObjectContext() const { return context_; }
  // The journal; null only while detached during the save of a merge.
  RZSyncTrack* syncTrack() const { return attached_ ? track_.get() : nullptr; }
  RZSyncNetwork* syncNetwork() const { return network_; }
  // Not owned; null (the default) writes errors to the log.
  void setErrorPresenter(RZSyncErrorPresenter* presenter);
  // How local edits are saved before a merge (the delegate's saveChanges, which first commits an edit
  // in progress); the context's own save when not set.
  void setSaveHandler(std::function<Result<void>()> handler) { saveHandler_ = std::move(handler); }

  bool syncEnabled() const { return syncEnabled_; }
  bool hasNetworkError() const { return networkError_; }
  Intervals intervals() const { return intervals_; }
  void setIntervals(const Intervals& intervals) { intervals_ = intervals; }
  // Milliseconds until the pending poll was due when it was scheduled, or -1 when none is pending.
  int scheduledInterval() const { return timer_.isActive() ? timer_.interval() : -1; }

  // The endpoint on a server given as "host", "host:port", or a URL with scheme http or https and
  // perhaps a path prefix; https when no scheme is given. Invalid for anything else.
  static QUrl endpointURL(const QString& server);
  // The endpoint of the server in the user default "WTSyncServer"; invalid when unset.
  QUrl configuredEndpoint() const;

  // One poll: sends "head" with the journal's iteration when the network is idle, and schedules the
  // next poll unless syncing is off or the last exchange failed.
  void sync();
  // Replaces the pending poll by one `milliseconds` from now.
  void rescheduleTimer(int milliseconds);
  // Switches polling on (polling at once) or off; either way announces syncStatusDidChange.
  void enableSync();
  void disableSync();

  // Applies a server change set {"i", "u", "x"} to the context: records found or made by uuid, values
  // converted (dates from seconds, uuids to records, ordered lists of uuids to ordered relationships),
  // server values replacing pending local values of the same key in the same journal section, deletions
  // last. Records whose deletion is pending here are neither made nor changed, and nothing is filed
  // under them. Does not save.
  void mergeWithDictionary(const QVariantMap& changes);

  // RZSyncNetworkDelegate.
  void syncNetworkReceivedJSONObject(RZSyncNetwork* network, const QVariant& object) override;
  void syncNetworkDidFailWithError(RZSyncNetwork* network, const QString& error) override;

 signals:
  // "RZSyncManagerDidChangeStatusNotification": syncing was switched on or off.
  void syncStatusDidChange();
  // After each answered or failed request has been dealt with.
  void exchangeDidFinish(const RZSyncExchange& exchange);

 private:
  struct Request {
    QString action;
    QVariantMap data;      // what a "save" sent
    bool complete = true;  // a "save" sent every change the journal held
  };

  void fileNotifications();
  void removeNotifications();
  void managedObjectContextDidSave();
  void post(const QVariantMap& data, const QString& action, qint64 iteration);
  // Sends the journal's changes, as many as one request may carry; the rest follow each confirmation.
  void postChanges(qint64 iteration);
  // Saves local edits, merges a "head" reply's result, saves it unjournaled and sends what is pending.
  void mergeHead(const QVariantMap& result, qint64 iteration);
  // Adds to `replaced` the records whose pending values here the server's replaced, each with the name
  // typed here when that was one of them (else an empty text).
  void mergeWithDictionary(const QVariantMap& changes, const QString& key, const QSet<QString>& pending,
                           QHash<QString, QString>* replaced);
  // A record as a notice names it; the records of `uuids` and `names` as a notice lists them (at most
  // three, then how many more), with their number.
  static QString named(const WTObject& record);
  // Whether a change of `record` made here waits to be sent.
  bool changedHere(const WTObject& record) const;
  QString recordsNamed(const QSet<QString>& uuids, qsizetype* count) const;
  static QString listed(QStringList names, qsizetype* count);
  QVariant mergedValue(WTObject* object, const QString& key, const QVariant& value,
                       const QSet<QString>& pending, bool* skip);
  // Deletes a record here with what it owns but the work `kept` takes out, journaling as deletions what
  // the server did not delete; adds to `lost` the names of those of its records with changes not sent.
  void deleteMerged(WTObject* object, const QSet<QString>& deletedThere, RZSyncKeptWork& kept,
                    QStringList* lost);
  void writeTrack(bool logFailure);
  // A reply came: the run of failures, if any, is over and polling goes on.
  void endFailureRun();
  void finish(RZSyncExchange exchange);
  UserDefaults* userDefaults() const;

  QPointer<WTObjectContext> context_;
  std::unique_ptr<RZSyncTrack> track_;
  bool attached_ = false;
  RZSyncNetwork* network_;
  RZSyncErrorPresenter* presenter_ = nullptr;
  std::unique_ptr<RZSyncErrorPresenter> logPresenter_;
  bool syncEnabled_ = false;
  bool networkError_ = false;
  QTimer timer_;
  Intervals intervals_;
  Request inFlight_;
  QMetaObject::Connection saveConnection_;
  std::function<Result<void>()> saveHandler_;
};
