#pragma once

#include "WTImportFile.h"

#include <QString>
#include <QStringList>

#include <vector>

class QTimeZone;
class WTObjectContext;

// What importing a file does to a store, told before anything changes: the clients, projects and tasks it
// makes and those it finds (by name, as the commands find them), the entries it adds and those a former
// import of the same file added already, and the time and money per client.
struct WTImportPlan {
  struct Counts {
    int created = 0;
    int reused = 0;  // found in the store, for new entries or for those already there
  };
  Counts clients, projects, tasks;
  int entries = 0;
  int alreadyThere = 0;
  struct ClientTotal {
    QString client;
    qint64 minutes = 0;
    Decimal money;
    bool priced = false;     // whether the file gives a rate for any of the client's entries
    qint64 notBillable = 0;  // minutes the file marks not billable, which Tessal bills like the others
    QString currency;
  };
  std::vector<ClientTotal> totals;  // in the order of the file
  // Entries still running when the file was written, left out unless they are to be stopped (rows of
  // the file planned).
  std::vector<const WTImportRow*> running;
  QStringList notes;  // rates the import could not place where the file puts them
};

namespace WTImport {

struct Options {
  // A running entry is imported as stopped where it had got to, rather than left out.
  bool stopRunning = false;
};

// The plan without changing `context`.
WTImportPlan plan(const WTObjectContext& context, const WTImportFile& file, const Options& options);
// Makes what the plan tells, in `context`: saving it is the caller's, one save for the whole import.
// Rows that cannot be read are left out; a caller that imports all or nothing checks file.problems first.
WTImportPlan apply(WTObjectContext& context, const WTImportFile& file, const Options& options);

// The plan and every row that cannot be read, for people; times in `zone`.
QString preview(const WTImportFile& file, const WTImportPlan& plan, const QTimeZone& zone);

}  // namespace WTImport
