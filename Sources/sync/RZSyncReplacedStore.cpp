#include "RZSyncReplacedStore.h"

#include "RZSyncTrack.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTObjectContext.h"

Result<void> journalReplacedStore(WTObjectContext& context) {
  RZSyncTrack journal(context.store(), RZSyncTrack::Loading::OnDemand);
  if (Result<void> written = journal.journalEveryRecord(context); !written) return written;
  // The server sends no device what it wrote itself: under its old identity this installation would
  // never get back its own saves that the copy lacks, nor its own deletions.
  if (UserDefaults* defaults = context.userDefaults()) defaults->removeValue(SettingsKeys::kSyncDevice);
  return {};
}
