#pragma once

#include "Result.h"

#include <QString>

#include <functional>

class UserDefaults;
class WTObjectContext;

// Where an installation keeps its data and what a new store and the settings start with. The desktop
// and the commands share it: either may be the one that makes the store.
namespace WTStoreSetup {

// $XDG_DATA_HOME/Tessal2 (the temporary folder's Tessal2 when there is no data location); not created.
QString applicationSupportFolder();
QString storePath();

// Puts the copy at `backup` in place of the store (see WTStoreBackup::restore) and returns the name
// the replaced store, with the journal inside it, now has. The restored store is journaled anew
// (journalReplacedStore). The caller holds the writer lock and knows no desktop copy runs. `mayReplace`
// as WTStoreBackup::restore asks it.
Result<QString> restoreBackup(const QString& backup, UserDefaults& defaults,
                              const std::function<Result<void>()>& mayReplace = {});

// The settings' values until the user sets them.
void registerDefaults(UserDefaults& defaults);

// What a store file gets when it is made, by the desktop copy or by a command: "Default Project" with
// "Default Task", for the first day's work. Not when this installation syncs (a "WTSyncUser" is set):
// its projects come from the account, which would otherwise gain a first project from every device
// set up. A store that exists is never filled, so the user's own emptying it sticks. Saves nothing.
void fillNewStore(WTObjectContext& context);

}  // namespace WTStoreSetup
