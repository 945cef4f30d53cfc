#include "platform/cloudkit/embedded/Sql.h"

#include <algorithm>
#include <chrono>
#include <sqlite3.h>

#include "platform/cloudkit/CKError.h"

namespace droxa::embedded {
namespace {

// A lock that can't be had for so long answers zoneBusy, also to a caller without a deadline.
constexpr std::chrono::seconds kLongestWait{30};
constexpr int kInstructionsBetweenChecks = 20000;

[[noreturn]] void fail(sqlite3 *database, int code) {
  throw SqlError(code, database ? sqlite3_errmsg(database) : sqlite3_errstr(code));
}

}  // namespace

bool SqlError::isBusy() const {
  return (code_ & 0xff) == SQLITE_BUSY;
}

NSError SqlError::cloudError(const CKCallContext &context) const {
  if (NSError stopped = context.check()) return stopped;
  const std::string text = "The cloud's database: " + std::string(what());
  switch (code_ & 0xff) {
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      return CKErrorMake(CKErrorCode::zoneBusy, text);
    case SQLITE_FULL:
      return CKErrorMake(CKErrorCode::serviceUnavailable, text, NSError::errorWithPOSIXCode(ENOSPC));
    case SQLITE_IOERR:
    case SQLITE_CANTOPEN:
    case SQLITE_READONLY:
    case SQLITE_PERM:
    case SQLITE_INTERRUPT:
    case SQLITE_NOMEM:
      return CKErrorMake(CKErrorCode::serviceUnavailable, text);
    default:
      return CKErrorMake(CKErrorCode::internalError, text);
  }
}

SqlUse::~SqlUse() {
  sqlite3_reset(statement_);
  sqlite3_clear_bindings(statement_);
}

void SqlUse::check(int code) const {
  if (code != SQLITE_OK) fail(sqlite3_db_handle(statement_), code);
}

SqlUse &SqlUse::bind(std::int64_t value) {
  check(sqlite3_bind_int64(statement_, ++bound_, value));
  return *this;
}

SqlUse &SqlUse::bind(std::string_view bytes) {
  // A null pointer would bind NULL, which differs from an empty blob.
  check(sqlite3_bind_blob64(statement_, ++bound_, bytes.empty() ? "" : bytes.data(), bytes.size(),
                            SQLITE_TRANSIENT));
  return *this;
}

SqlUse &SqlUse::bindNull() {
  check(sqlite3_bind_null(statement_, ++bound_));
  return *this;
}

bool SqlUse::step() {
  const int code = sqlite3_step(statement_);
  if (code == SQLITE_ROW) return true;
  if (code != SQLITE_DONE) fail(sqlite3_db_handle(statement_), code);
  return false;
}

void SqlUse::run() {
  while (step()) {
  }
}

std::int64_t SqlUse::integer(int column) const {
  return sqlite3_column_int64(statement_, column);
}

std::string_view SqlUse::bytes(int column) const {
  const auto *data = static_cast<const char *>(sqlite3_column_blob(statement_, column));
  const int size = sqlite3_column_bytes(statement_, column);
  return data ? std::string_view(data, static_cast<std::size_t>(size)) : std::string_view();
}

bool SqlUse::isNull(int column) const {
  return sqlite3_column_type(statement_, column) == SQLITE_NULL;
}

SqlDatabase::SqlDatabase(const std::string &path, bool mayCreate) {
  const int flags = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX | (mayCreate ? SQLITE_OPEN_CREATE : 0);
  const int code = sqlite3_open_v2(path.c_str(), &handle_, flags, nullptr);
  if (code != SQLITE_OK) {
    const SqlError error(code, handle_ ? sqlite3_errmsg(handle_) : sqlite3_errstr(code));
    sqlite3_close(handle_);
    throw error;
  }
  sqlite3_extended_result_codes(handle_, 1);
  sqlite3_busy_handler(handle_, &onBusy, this);
  sqlite3_progress_handler(handle_, kInstructionsBetweenChecks, &onProgress, this);
}

SqlDatabase::~SqlDatabase() {
  for (const auto &entry : statements_) sqlite3_finalize(entry.second);
  sqlite3_close(handle_);
}

int SqlDatabase::onBusy(void *self, int count) {
  auto &database = *static_cast<SqlDatabase *>(self);
  const auto now = CKCallContext::Clock::now();
  if (count == 0) database.busySince_ = now;
  if (now - database.busySince_ > kLongestWait) return 0;
  // Short waits at first: a writer holds the lock for the time of one fsync.
  const std::chrono::milliseconds wait(std::min(1 + count / 4, 10));
  static const auto *none = new CKCallContext;
  const CKCallContext &context = database.context_ ? *database.context_ : *none;
  return context.waitUntil(now + wait) ? 0 : 1;
}

int SqlDatabase::onProgress(void *self) {
  const auto &database = *static_cast<SqlDatabase *>(self);
  return database.context_ && database.context_->check() ? 1 : 0;
}

SqlUse SqlDatabase::use(const char *sql) {
  sqlite3_stmt *&statement = statements_[sql];
  if (!statement) {
    const int code = sqlite3_prepare_v3(handle_, sql, -1, SQLITE_PREPARE_PERSISTENT, &statement, nullptr);
    if (code != SQLITE_OK) fail(handle_, code);
  }
  return SqlUse(statement);
}

void SqlDatabase::execute(const char *sql) {
  const int code = sqlite3_exec(handle_, sql, nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) fail(handle_, code);
}

std::int64_t SqlDatabase::changes() const {
  return sqlite3_changes64(handle_);
}

SqlTransaction::SqlTransaction(SqlDatabase &database, Kind kind) : database_(database) {
  database_.execute(kind == Kind::writing ? "BEGIN IMMEDIATE" : "BEGIN");
}

SqlTransaction::~SqlTransaction() {
  if (!isOpen_) return;
  // The rollback itself isn't to be stopped; a transaction that an error has ended already is none.
  database_.setContext(nullptr);
  try {
    database_.execute("ROLLBACK");
  } catch (const SqlError &) {
  }
}

void SqlTransaction::commit() {
  database_.execute("COMMIT");
  isOpen_ = false;
}

}  // namespace droxa::embedded
