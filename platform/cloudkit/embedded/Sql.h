#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>

#include "platform/cloudkit/CKCallContext.h"

struct sqlite3;
struct sqlite3_stmt;

namespace droxa::embedded {

// What the database library refused, with its code.
class SqlError : public std::runtime_error {
 public:
  SqlError(int code, const std::string &message) : std::runtime_error(message), code_(code) {}
  // The error that a call answers: damage, a full disk, a lock that wasn't to be had.
  NSError cloudError(const CKCallContext &context) const;
  bool isBusy() const;  // another connection has the lock

 private:
  int code_;
};

// A prepared statement in use: it is reset, and its bindings are cleared, when the scope ends. Columns count
// from 0, parameters from 1 in the order of bind(); what is bound is copied.
class SqlUse {
 public:
  explicit SqlUse(sqlite3_stmt *statement) : statement_(statement) {}
  ~SqlUse();
  SqlUse(const SqlUse &) = delete;
  SqlUse &operator=(const SqlUse &) = delete;

  SqlUse &bind(std::int64_t value);
  SqlUse &bind(std::string_view bytes);  // as a blob
  SqlUse &bindNull();

  bool step();  // true: there is a row
  void run();   // to the end

  std::int64_t integer(int column) const;
  std::string_view bytes(int column) const;  // until the next step
  std::string text(int column) const { return std::string(bytes(column)); }
  bool isNull(int column) const;

 private:
  void check(int code) const;
  sqlite3_stmt *const statement_;
  int bound_ = 0;
};

// A connection to a database file. Waits for locks and long reads end when the context says so.
// Thread contract: one thread at a time.
class SqlDatabase {
 public:
  SqlDatabase(const std::string &path, bool mayCreate);  // throws SqlError
  ~SqlDatabase();
  SqlDatabase(const SqlDatabase &) = delete;
  SqlDatabase &operator=(const SqlDatabase &) = delete;

  // The context of the calls that follow; it must outlive them. Null: none.
  void setContext(const CKCallContext *context) { context_ = context; }
  // `sql` must be a literal: statements are kept by its address.
  SqlUse use(const char *sql);
  void execute(const char *sql);
  std::int64_t changes() const;  // rows that the last statement changed

 private:
  static int onBusy(void *self, int count);
  static int onProgress(void *self);
  sqlite3 *handle_ = nullptr;
  const CKCallContext *context_ = nullptr;
  CKCallContext::Clock::time_point busySince_;
  std::map<const char *, sqlite3_stmt *> statements_;
};

// A transaction that is rolled back unless it was committed.
class SqlTransaction {
 public:
  enum class Kind { reading, writing };
  SqlTransaction(SqlDatabase &database, Kind kind);
  ~SqlTransaction();
  SqlTransaction(const SqlTransaction &) = delete;
  SqlTransaction &operator=(const SqlTransaction &) = delete;
  void commit();

 private:
  SqlDatabase &database_;
  bool isOpen_ = true;
};

}  // namespace droxa::embedded
