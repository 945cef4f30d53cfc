#include "keld/Schema.h"

#include <cstdio>
#include <ctime>
#include <fcntl.h>
#include <unistd.h>
#include <uuid/uuid.h>

#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr char kFirstStep[] = R"sql(
CREATE TABLE meta(key TEXT PRIMARY KEY, value) WITHOUT ROWID;
CREATE TABLE items(
  parent INTEGER NOT NULL,
  name BLOB NOT NULL,
  id INTEGER NOT NULL,
  kind INTEGER NOT NULL,
  flags INTEGER NOT NULL,
  rank INTEGER NOT NULL,
  age INTEGER NOT NULL,
  size INTEGER NOT NULL,
  mode INTEGER NOT NULL,
  inode INTEGER NOT NULL,
  device INTEGER NOT NULL,
  birth INTEGER NOT NULL,
  changed INTEGER NOT NULL,
  PRIMARY KEY(parent, name)
) WITHOUT ROWID;
CREATE UNIQUE INDEX items_id ON items(id);
CREATE INDEX items_rank ON items(rank);
CREATE INDEX folders_id ON items(id) WHERE kind = 1;
CREATE INDEX folders_inode ON items(inode) WHERE kind = 1;
CREATE INDEX folders_name ON items(name, id) WHERE kind = 1;
CREATE INDEX folders_age ON items(age, name, id) WHERE kind = 1;
CREATE TABLE tombstones(rank INTEGER PRIMARY KEY, id INTEGER NOT NULL, kind INTEGER NOT NULL);
CREATE INDEX tombstones_id ON tombstones(id);
CREATE TABLE containers(container TEXT PRIMARY KEY, documents INTEGER NOT NULL, shown BLOB NOT NULL) WITHOUT ROWID;
INSERT INTO meta VALUES ('bulkLoaded', 0), ('clean', 1), ('nextID', 1), ('rank', 0), ('tombstoneFloor', 0),
  ('documents', 0), ('folders', 0), ('aliases', 0);
)sql";

// NULL stands for none. Whatever the files bear already is read when they are looked at next.
constexpr char kMetadataStep[] = R"sql(
ALTER TABLE items ADD COLUMN tags BLOB;
ALTER TABLE items ADD COLUMN used INTEGER;
ALTER TABLE items ADD COLUMN favorite INTEGER;
UPDATE items SET changed = 0;
)sql";

std::string newUUID() {
  uuid_t uuid;
  uuid_generate(uuid);
  char text[37];
  uuid_unparse_lower(uuid, text);
  return text;
}

std::string markerPath(const std::string &path) {
  return path + ".damaged";
}

// The database with its companions, under a name that tells when it was found damaged.
std::string moveAside(const std::string &path) {
  const std::string target = path + ".damaged-" + std::to_string(std::time(nullptr));
  if (std::rename(path.c_str(), target.c_str()) != 0 && errno != ENOENT)
    throw SqlError(0, path + ": is damaged and can't be moved aside; move it away by hand");
  // A log of a database that is gone must never be replayed into a new one.
  for (const char *suffix : {"-wal", "-shm"}) std::rename((path + suffix).c_str(), (target + suffix).c_str());
  ::unlink(markerPath(path).c_str());
  return target;
}

void checkAfterCrash(SqlDatabase &database, const std::string &path) {
  if (database.integer("SELECT count(*) FROM sqlite_master WHERE name = 'meta'") == 0) return;
  if (database.integer("SELECT value FROM meta WHERE key = 'clean'") != 0) return;
  const std::string verdict = database.text("PRAGMA quick_check(1)");
  if (verdict != "ok") throw SqlError(11 /* the library's code for damage */, path + ": " + verdict);
}

std::unique_ptr<SqlDatabase> openChecked(const std::string &path) {
  auto database = std::make_unique<SqlDatabase>(path, SqlDatabase::Access::readWrite, 8192);
  database->execute("PRAGMA journal_mode = WAL");
  database->execute("PRAGMA synchronous = NORMAL");
  database->execute("PRAGMA wal_autocheckpoint = 4000");
  database->execute("PRAGMA journal_size_limit = 67108864");
  checkAfterCrash(*database, path);
  SchemaMigrate(*database, path);
  return database;
}

}  // namespace

const std::vector<SchemaStep> &SchemaSteps() {
  static const std::vector<SchemaStep> steps{{kFirstStep}, {kMetadataStep}};
  return steps;
}

void SchemaMigrate(SqlDatabase &database, const std::string &path) {
  const auto newest = static_cast<std::int64_t>(SchemaSteps().size());
  const std::int64_t version = database.integer("PRAGMA user_version");
  if (version > newest) {
    throw SchemaTooNew(
        path + ": was written by a newer version (schema " + std::to_string(version) + ", this one knows " +
        std::to_string(newest) +
        "). Update this program, or move the file away to have it built anew from the documents.");
  }
  for (std::int64_t step = version; step < newest; ++step) {
    SqlTransaction transaction(database);
    database.execute(SchemaSteps()[static_cast<std::size_t>(step)].sql);
    if (step == 0) database.execute("INSERT INTO meta VALUES ('uuid', '" + newUUID() + "')");
    database.execute("PRAGMA user_version = " + std::to_string(step + 1));
    transaction.commit();
  }
}

bool SchemaNeedsBulkLoad(SqlDatabase &database) {
  return database.integer("SELECT value FROM meta WHERE key = 'bulkLoaded'") == 0;
}

void SchemaFinishBulkLoad(SqlDatabase &database) {
  SqlTransaction transaction(database);
  database.execute("CREATE INDEX IF NOT EXISTS items_inode ON items(inode)");
  database.execute("CREATE INDEX IF NOT EXISTS items_age ON items(parent, age, name)");
  database.execute("UPDATE meta SET value = 1 WHERE key = 'bulkLoaded'");
  transaction.commit();
}

OpenedDatabase DatabaseOpen(const std::string &path) {
  OpenedDatabase opened;
  opened.isNew = ::access(path.c_str(), F_OK) != 0;
  if (::access(markerPath(path).c_str(), F_OK) == 0) opened.damagedCopy = moveAside(path);
  try {
    opened.database = openChecked(path);
  } catch (const SqlError &error) {
    if (!error.meansDamage()) throw;
    os_log_error(qvc_default_log(), "[ERROR] the item database is damaged: %s", error.what());
    opened.damagedCopy = moveAside(path);
    opened.database = openChecked(path);
  }
  if (!opened.damagedCopy.empty()) {
    os_log_error(qvc_default_log(),
                 "[ERROR] the damaged item database was moved to %s; a new one is built from the documents",
                 opened.damagedCopy);
  }
  return opened;
}

void DatabaseMarkDamaged(const std::string &path) {
  const int descriptor = ::open(markerPath(path).c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600);
  if (descriptor >= 0) ::close(descriptor);
}

}  // namespace droxa::keld
