#pragma once

#include "platform/cloudkit/embedded/Sql.h"

namespace droxa::embedded {

// The version of the tables; a file of another one isn't used.
inline constexpr std::int64_t kFormat = 1;

// Sets up a fresh connection. Throws SqlError.
void ConfigureConnection(SqlDatabase &database);
// Makes the tables and the cloud's identifier in a file that has none. Throws SqlError. Inside a transaction.
void CreateTables(SqlDatabase &database);

}  // namespace droxa::embedded
