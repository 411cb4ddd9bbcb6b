#pragma once

#include <QCoreApplication>
#include <QHash>
#include <QList>
#include <QSet>
#include <QString>
#include <QStringList>
#include <QVariantMap>

class RZSyncTrack;
class WTObject;
class WTObjectContext;
class WTProject;
class WTTask;

// Deletes win over what the deleting device knew, not over work it never saw. During one merge, takes out
// of each local cascade the tasks and items inserted here and not sent yet (with what they own), files
// them under new copies of the owners that go, and journals the copies and the moves as insertions.
class RZSyncKeptWork {
  Q_DECLARE_TR_FUNCTIONS(RZSyncManager)

 public:
  // `deletedThere`: the uuids the merge's head deleted.
  RZSyncKeptWork(WTObjectContext& context, RZSyncTrack& track, const QSet<QString>& deletedThere)
      : context_(context), track_(track), deletedThere_(deletedThere) {}

  // `gone` is a deleted record, then what it owns, owners before what they own; what is kept leaves it.
  void keepFrom(QList<WTObject*>& gone);
  // What the user is told of the work kept in this merge; empty when none was.
  QString message() const;

  // The server keeps work a deleting device never saw under copies of what it deleted. Before a merge
  // applies `inserted`, notes which of its records are such copies, new here; afterwards, what the user
  // is told of them (empty when none came).
  void noteServerCopies(const QVariantMap& inserted);
  QString serverCopiesMessage() const;

 private:
  // What the work filed under an owner that goes is filed under instead: a live record of the same name
  // under the same owner (made again on the other device), else a new copy. A task's in its project, or
  // in what that project's work goes to when the project goes too.
  WTProject* copyOf(WTProject* project, const QList<WTObject*>& gone);
  WTTask* copyOf(WTTask* task, const QList<WTObject*>& gone);
  void journalOrder(const WTProject& project);
  // In the cascade at hand, or deleted by the same head.
  bool goes(const WTObject* record, const QList<WTObject*>& gone) const;
  template <class T>
  T* namesake(const T& gone, const QList<T*>& candidates) const;

  WTObjectContext& context_;
  RZSyncTrack& track_;
  const QSet<QString> deletedThere_;
  QSet<WTObject*> kept_;  // the records taken out of a cascade, copies among them
  // Of the owners that go, by their uuids: an owner deleted in this merge may leave its address to a new
  // record.
  QHash<QString, WTObject*> copies_;
  QSet<WTObject*> made_;  // the new copies among them
  QStringList serverCopies_;
};
