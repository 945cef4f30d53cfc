#include "keld/Sql.h"

#include <sqlite3.h>

namespace droxa::keld {

namespace {

[[noreturn]] void fail(sqlite3 *database, int code, std::string_view during) {
  std::string message = database ? sqlite3_errmsg(database) : sqlite3_errstr(code);
  if (!during.empty()) message += " (in " + std::string(during.substr(0, 120)) + ")";
  throw SqlError(code, message);
}

}  // namespace

bool SqlError::meansDamage() const {
  const int primary = code_ & 0xff;
  return primary == SQLITE_CORRUPT || primary == SQLITE_NOTADB;
}

SqlStatement::SqlStatement(sqlite3 *database, std::string_view sql) : database_(database) {
  const int code = sqlite3_prepare_v3(database, sql.data(), static_cast<int>(sql.size()),
                                      SQLITE_PREPARE_PERSISTENT, &statement_, nullptr);
  if (code != SQLITE_OK) fail(database, code, sql);
}

SqlStatement::~SqlStatement() {
  sqlite3_finalize(statement_);
}

SqlStatement &SqlStatement::bind(int parameter, std::int64_t value) {
  const int code = sqlite3_bind_int64(statement_, parameter, value);
  if (code != SQLITE_OK) fail(database_, code, sqlite3_sql(statement_));
  return *this;
}

SqlStatement &SqlStatement::bind(int parameter, std::uint64_t value) {
  return bind(parameter, static_cast<std::int64_t>(value));
}

SqlStatement &SqlStatement::bindBlob(int parameter, std::string_view bytes) {
  // A null pointer would bind NULL, which differs from an empty blob.
  const int code = sqlite3_bind_blob64(statement_, parameter, bytes.empty() ? "" : bytes.data(), bytes.size(),
                                       SQLITE_TRANSIENT);
  if (code != SQLITE_OK) fail(database_, code, sqlite3_sql(statement_));
  return *this;
}

SqlStatement &SqlStatement::bindNull(int parameter) {
  const int code = sqlite3_bind_null(statement_, parameter);
  if (code != SQLITE_OK) fail(database_, code, sqlite3_sql(statement_));
  return *this;
}

SqlStatement &SqlStatement::bindText(int parameter, std::string_view text) {
  const int code = sqlite3_bind_text64(statement_, parameter, text.empty() ? "" : text.data(), text.size(),
                                       SQLITE_TRANSIENT, SQLITE_UTF8);
  if (code != SQLITE_OK) fail(database_, code, sqlite3_sql(statement_));
  return *this;
}

bool SqlStatement::step() {
  const int code = sqlite3_step(statement_);
  if (code == SQLITE_ROW) return true;
  if (code == SQLITE_DONE) return false;
  fail(database_, code, sqlite3_sql(statement_));
}

void SqlStatement::run() {
  SqlScope scope(*this);
  while (step()) {
  }
}

void SqlStatement::reset() {
  sqlite3_reset(statement_);
}

std::int64_t SqlStatement::integer(int column) const {
  return sqlite3_column_int64(statement_, column);
}

std::string_view SqlStatement::bytes(int column) const {
  const void *data = sqlite3_column_blob(statement_, column);
  const int size = sqlite3_column_bytes(statement_, column);
  return data ? std::string_view(static_cast<const char *>(data), static_cast<std::size_t>(size))
              : std::string_view();
}

SqlDatabase::SqlDatabase(const std::string &path, Access access, int cacheKilobytes) {
  const int flags =
      (access == Access::readOnly ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE) |
      SQLITE_OPEN_NOMUTEX;
  const int code = sqlite3_open_v2(path.c_str(), &handle_, flags, nullptr);
  if (code != SQLITE_OK) {
    const std::string message = handle_ ? sqlite3_errmsg(handle_) : sqlite3_errstr(code);
    sqlite3_close(handle_);
    throw SqlError(code, path + ": " + message);
  }
  sqlite3_extended_result_codes(handle_, 1);
  sqlite3_busy_timeout(handle_, 10000);
  try {
    execute("PRAGMA cache_size = -" + std::to_string(cacheKilobytes));
  } catch (...) {
    sqlite3_close(handle_);
    throw;
  }
}

SqlDatabase::~SqlDatabase() {
  sqlite3_close_v2(handle_);
}

void SqlDatabase::execute(const std::string &sql) {
  const int code = sqlite3_exec(handle_, sql.c_str(), nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) fail(handle_, code, sql);
}

std::int64_t SqlDatabase::integer(const std::string &sql) {
  SqlStatement statement(handle_, sql);
  return statement.step() ? statement.integer(0) : 0;
}

std::string SqlDatabase::text(const std::string &sql) {
  SqlStatement statement(handle_, sql);
  return statement.step() ? std::string(statement.bytes(0)) : std::string();
}

SqlTransaction::SqlTransaction(SqlDatabase &database, bool forWriting) : database_(database) {
  database_.execute(forWriting ? "BEGIN IMMEDIATE" : "BEGIN");
}

SqlTransaction::~SqlTransaction() {
  // A failed statement may have rolled the transaction back already.
  if (open_ && !sqlite3_get_autocommit(database_.handle()))
    sqlite3_exec(database_.handle(), "ROLLBACK", nullptr, nullptr, nullptr);
}

void SqlTransaction::commit() {
  database_.execute("COMMIT");
  open_ = false;
}

}  // namespace droxa::keld
