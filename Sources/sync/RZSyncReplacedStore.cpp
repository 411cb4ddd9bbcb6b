#include "RZSyncReplacedStore.h"

#include "RZSyncTrack.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTObject.h"
#include "WTObjectContext.h"

Result<void> journalReplacedStore(WTObjectContext& context, const QString& journalPath) {
  RZSyncTrack journal;
  for (const WTObject* object :
       context.fetchObjectsForEntityName(QStringLiteral("WTObject")).value_or(QList<WTObject*>()))
    journal.updateValues(object->everyValue(), object->uuid(), RZSyncTrack::Section::Inserted);
  // The server sends no device what it wrote itself: under its old identity this installation would
  // never get back its own saves that the copy lacks, nor its own deletions.
  if (UserDefaults* defaults = context.userDefaults()) defaults->removeValue(SettingsKeys::kSyncDevice);
  return journal.writeToFile(journalPath);
}
