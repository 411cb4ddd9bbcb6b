#pragma once

#include <vector>

#include "SqlDatabase.h"

namespace tessal::server {

// The scripts that make the server's tables on an empty database of the given kind, in order; each is safe to
// run again on a database that has them (every statement is IF NOT EXISTS), which is how a server starts.
std::vector<const char*> syncSchema(SqlDatabase::Kind kind);

}  // namespace tessal::server
