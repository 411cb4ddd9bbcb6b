#pragma once

#include "Result.h"

class WTObjectContext;

// After the store was replaced by a copy of itself from earlier (a restored backup): the journal inside
// the copy describes the day it was made, and the server's iteration in it no longer holds. This starts
// the journal again at iteration 0 with every record of `context` (the copy, loaded whole) as changed
// with all its values, and gives the installation a new device identity, so that the next "head" brings
// everything the server holds, its own earlier writes included. The merge takes the server's values and
// deletions (the server never brings back what it deleted, and what others added since comes back), and
// what the server never had is sent.
Result<void> journalReplacedStore(WTObjectContext& context);
