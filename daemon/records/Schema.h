// The tables of the database, and how an older database gets them.
#pragma once

#include <cstdint>

#include "base/Result.h"
#include "daemon/records/Database.h"

namespace records {

// What the database's user_version says once it has all tables.
inline constexpr std::int64_t kSchemaVersion = 4;

base::Result<std::int64_t> schemaVersion(Connection& connection);

// Brings the database from one version to another, at most kSchemaVersion, in one transaction a version.
base::Result<void> migrate(Connection& connection, std::int64_t from, std::int64_t to);

// Checks every page, index and constraint, and that the tables are exactly those of that version. kDamaged
// where something is wrong.
base::Result<void> checkSoundness(Connection& connection, std::int64_t version);

}  // namespace records
