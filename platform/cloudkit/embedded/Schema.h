#pragma once

#include "platform/cloudkit/embedded/Sql.h"

namespace droxa::embedded {

// The version of the tables. Files of earlier ones are brought to it; a file of a later one isn't used.
inline constexpr std::int64_t kFormat = 2;
inline constexpr std::int64_t kOldestFormat = 1;  // that UpgradeTables() takes

// Sets up a fresh connection. Throws SqlError.
void ConfigureConnection(SqlDatabase &database);
// Makes the tables and the cloud's identifier in a file that has none. Throws SqlError. Inside a transaction.
void CreateTables(SqlDatabase &database);
// Brings the tables of an earlier version to this one, whatever they hold; nothing for tables of this version
// or of one unknown. Throws SqlError. Inside a transaction.
void UpgradeTables(SqlDatabase &database);

}  // namespace droxa::embedded
