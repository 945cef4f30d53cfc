#pragma once

#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>

struct sqlite3;
struct sqlite3_stmt;

namespace droxa::keld {

// What the database library refused, with its code.
class SqlError : public std::runtime_error {
 public:
  SqlError(int code, const std::string &message) : std::runtime_error(message), code_(code) {}
  int code() const { return code_; }
  bool meansDamage() const;  // the file isn't a database, or not an intact one

 private:
  int code_;
};

// A prepared statement. Columns count from 0, parameters from 1; text and blobs are copied when bound.
// Thread contract: the thread that uses the database it belongs to.
class SqlStatement {
 public:
  SqlStatement(sqlite3 *database, std::string_view sql);
  ~SqlStatement();
  SqlStatement(const SqlStatement &) = delete;
  SqlStatement &operator=(const SqlStatement &) = delete;

  SqlStatement &bind(int parameter, std::int64_t value);
  SqlStatement &bind(int parameter, std::uint64_t value);
  SqlStatement &bindBlob(int parameter, std::string_view bytes);
  SqlStatement &bindNull(int parameter);
  SqlStatement &bindText(int parameter, std::string_view text);

  bool step();  // true: there is a row
  void run();   // steps to the end and resets
  void reset();

  std::int64_t integer(int column) const;
  std::uint64_t number(int column) const { return static_cast<std::uint64_t>(integer(column)); }
  std::string_view bytes(int column) const;  // until the next step

 private:
  sqlite3 *const database_;
  sqlite3_stmt *statement_ = nullptr;
};

// Resets a statement when the scope ends: a statement that stands on a row keeps its snapshot open.
class SqlScope {
 public:
  explicit SqlScope(SqlStatement &statement) : statement_(statement) { statement_.reset(); }
  ~SqlScope() { statement_.reset(); }
  SqlScope(const SqlScope &) = delete;
  SqlScope &operator=(const SqlScope &) = delete;
  SqlStatement *operator->() { return &statement_; }

 private:
  SqlStatement &statement_;
};

// A connection to a database file.
// Thread contract: one thread at a time.
class SqlDatabase {
 public:
  enum class Access { readWrite, readOnly };
  // Throws SqlError.
  SqlDatabase(const std::string &path, Access access, int cacheKilobytes);
  ~SqlDatabase();
  SqlDatabase(const SqlDatabase &) = delete;
  SqlDatabase &operator=(const SqlDatabase &) = delete;

  void execute(const std::string &sql);
  std::int64_t integer(const std::string &sql);  // the first column of the first row; 0 without a row
  std::string text(const std::string &sql);
  sqlite3 *handle() const { return handle_; }

 private:
  sqlite3 *handle_ = nullptr;
};

// A transaction that is rolled back unless it was committed.
class SqlTransaction {
 public:
  explicit SqlTransaction(SqlDatabase &database, bool forWriting = true);
  ~SqlTransaction();
  SqlTransaction(const SqlTransaction &) = delete;
  SqlTransaction &operator=(const SqlTransaction &) = delete;
  void commit();

 private:
  SqlDatabase &database_;
  bool open_ = true;
};

}  // namespace droxa::keld
