#pragma once

#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "keld/Sql.h"

namespace droxa::keld {

// The item database's tables. Version n is what the first n steps make.
//
// items is clustered on (parent, name), so that a listing by name reads neighbouring rows. Dates are kept
// negated
// ("age"), so that "newest first, then by name" is one ascending order.
//
// The indexes by file and by date are made after the first bulk load (SchemaFinishBulkLoad): adding to them
// row by row would cost more than the load itself.
struct SchemaStep {
  const char *sql;
};
const std::vector<SchemaStep> &SchemaSteps();

// The database was written by a newer version of this program.
class SchemaTooNew : public std::runtime_error {
  using std::runtime_error::runtime_error;
};

// Brings the database to the newest version, each step in a transaction of its own. Throws SqlError,
// SchemaTooNew.
void SchemaMigrate(SqlDatabase &database, const std::string &path);

bool SchemaNeedsBulkLoad(SqlDatabase &database);
void SchemaFinishBulkLoad(SqlDatabase &database);

struct OpenedDatabase {
  std::unique_ptr<SqlDatabase> database;
  bool isNew = false;       // there was none
  std::string damagedCopy;  // where a damaged one was moved to; "" when it was intact
};

// Opens the item database at `path` for writing. A damaged one is moved aside, which is logged, and a new one
// is made. Throws SqlError, SchemaTooNew.
OpenedDatabase DatabaseOpen(const std::string &path);

// Asks for the database at `path` to be moved aside at the next start, after damage was met while it was in
// use.
void DatabaseMarkDamaged(const std::string &path);

}  // namespace droxa::keld
