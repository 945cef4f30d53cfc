#include "platform/cloudkit/embedded/Home.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <random>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

#include "platform/cloudkit/embedded/Schema.h"
#include "platform/oslog/os_log.h"

namespace droxa::embedded {
namespace {

constexpr std::size_t kMostIdleConnections = 8;
constexpr std::chrono::seconds kLongestMaking{10};
constexpr std::chrono::milliseconds kBetweenTries{5};

std::int64_t randomNumber() {
  std::random_device source;
  return static_cast<std::int64_t>((std::uint64_t{source()} << 32 | source()) >> 1);
}

CallFailed unusable(const std::string &path, int code) {
  return {CKErrorMake(CKErrorCode::serviceUnavailable, "The cloud's folder can't be used: " + path,
                      NSError::errorWithPOSIXCode(code))};
}

// An account is made by its first opening.
std::int64_t accountNumber(SqlDatabase &database, const std::string &name) {
  SqlUse row = database.use("SELECT id FROM accounts WHERE name = ?");
  return row.bind(name).step() ? row.integer(0) : 0;
}

void makeAccount(SqlDatabase &database, const std::string &name) {
  SqlTransaction transaction(database, SqlTransaction::Kind::writing);
  bool isEmpty = false;
  {
    SqlUse version = database.use("PRAGMA user_version");
    isEmpty = version.step() && version.integer(0) == 0;
  }
  if (isEmpty) CreateTables(database);
  UpgradeTables(database);
  {
    // Whoever shares with that handle means the account that has it.
    SqlUse taken = database.use("SELECT 1 FROM accounts WHERE handle = ?1 AND name <> ?1");
    if (taken.bind(name).step()) {
      Fail(CKErrorCode::invalidArguments, "The account's name is the handle of another account: " + name);
    }
  }
  database.use("INSERT OR IGNORE INTO accounts (name) VALUES (?)").bind(name).run();
  transaction.commit();
}

std::int64_t formatOf(SqlDatabase &database) {
  SqlUse version = database.use("PRAGMA user_version");
  return version.step() ? version.integer(0) : 0;
}

// A cloud that an earlier version left, or put into this one's place.
void upgradeIfOld(SqlDatabase &database) {
  const std::int64_t format = formatOf(database);
  if (format < kOldestFormat || format >= kFormat) return;
  SqlTransaction transaction(database, SqlTransaction::Kind::writing);
  UpgradeTables(database);
  transaction.commit();
}

void checkFormat(SqlDatabase &database, const std::string &path) {
  const std::int64_t format = formatOf(database);
  if (format == kFormat) return;
  if (format == 0) Fail(CKErrorCode::serviceUnavailable, "The cloud is being made: " + path);
  Fail(CKErrorCode::internalError, "Not a cloud of this version: " + path);
}

UUID cloudUUID(SqlDatabase &database) {
  UUID uuid;
  SqlUse row = database.use("SELECT uuid FROM cloud");
  if (!row.step() || row.bytes(0).size() != uuid.bytes.size()) {
    Fail(CKErrorCode::internalError, "The cloud's database has no identifier");
  }
  std::memcpy(uuid.bytes.data(), row.bytes(0).data(), uuid.bytes.size());
  return uuid;
}

}  // namespace

void Fail(CKErrorCode code, std::string description) {
  throw CallFailed{CKErrorMake(code, std::move(description))};
}

Home::Home(std::string folder, std::string account, std::string device, CKDatabaseScope scope)
    : folder_(std::move(folder)),
      account_(std::move(account)),
      device_(std::move(device)),
      scope_(scope),
      session_(randomNumber()),
      chunks_(folder_) {}

FileIdentity Home::currentIdentity() const {
  struct stat status {};
  if (stat(databaseFile().c_str(), &status) != 0) throw unusable(databaseFile(), errno);
  return {status.st_dev, status.st_ino};
}

// A file that several processes make at once gets its journal's mode from one of them, and the library
// doesn't wait for that one: the others are told that it is busy.
std::unique_ptr<Connection> Home::connectAndMake() const {
  const auto until = std::chrono::steady_clock::now() + kLongestMaking;
  for (;;) {
    try {
      return connect(true);
    } catch (const SqlError &refused) {
      if (!refused.isBusy() || std::chrono::steady_clock::now() >= until) throw;
    }
    std::this_thread::sleep_for(kBetweenTries);
  }
}

std::unique_ptr<Connection> Home::connect(bool mayCreate) const {
  auto connection = std::make_unique<Connection>();
  if (!mayCreate) connection->identity = currentIdentity();
  connection->database = std::make_unique<SqlDatabase>(databaseFile(), mayCreate);
  ConfigureConnection(*connection->database);
  if (mayCreate) {
    makeAccount(*connection->database, account_);
  }
  if (const FileIdentity now = currentIdentity(); mayCreate) {
    connection->identity = now;
  } else if (now != connection->identity) {
    Fail(CKErrorCode::serviceUnavailable, "The cloud is being replaced: " + folder_);
  }
  upgradeIfOld(*connection->database);
  checkFormat(*connection->database, databaseFile());
  connection->cloud = cloudUUID(*connection->database);
  connection->scope = scope_;
  connection->account = accountNumber(*connection->database, account_);
  if (connection->account == 0) {
    // Another cloud came into its place; the account is opened there as it was here.
    makeAccount(*connection->database, account_);
    connection->account = accountNumber(*connection->database, account_);
  }
  return connection;
}

NSError Home::create() {
  std::error_code error;
  const bool isNew = std::filesystem::create_directories(folder_, error);
  if (isNew && !error) std::filesystem::permissions(folder_, std::filesystem::perms::owner_all, error);
  if (error) return unusable(folder_, error.value()).error;
  if (const int code = chunks_.create(); code != 0) return unusable(folder_, code).error;
  const int watched = open(watchedFile().c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
  if (watched < 0) return unusable(watchedFile(), errno).error;
  close(watched);
  try {
    checkIn(connectAndMake());
  } catch (const SqlError &refused) {
    return refused.cloudError({});
  } catch (const CallFailed &failed) {
    return failed.error;
  }
  return {};
}

std::unique_ptr<Connection> Home::checkOut() {
  const FileIdentity identity = currentIdentity();
  std::vector<std::unique_ptr<Connection>> stale;  // closed without the lock
  {
    const Lock lock(mutex_);
    while (!idle_.empty()) {
      std::unique_ptr<Connection> connection = std::move(idle_.back());
      idle_.pop_back();
      if (connection->identity == identity) return connection;
      stale.push_back(std::move(connection));
    }
  }
  return connect(false);
}

void Home::checkIn(std::unique_ptr<Connection> connection) {
  connection->database->setContext(nullptr);
  const Lock lock(mutex_);
  if (idle_.size() < kMostIdleConnections) idle_.push_back(std::move(connection));
}

NSError Home::run(Access access, const CKCallContext &context,
                  const std::function<void(const Connection &)> &body) {
  if (NSError stopped = context.check()) return stopped;
  try {
    std::unique_ptr<Connection> connection = checkOut();
    connection->database->setContext(&context);
    try {
      transact(access, context, *connection, body);
    } catch (const CallFailed &failed) {
      checkIn(std::move(connection));
      return failed.error;
    }
    checkIn(std::move(connection));
    return {};
  } catch (const SqlError &refused) {
    return refused.cloudError(context);  // the connection is given up: nothing is known of its state
  } catch (const CallFailed &failed) {
    return failed.error;
  }
}

void Home::transact(Access access, const CKCallContext &context, const Connection &connection,
                    const std::function<void(const Connection &)> &body) const {
  if (access == Access::read) {
    SqlTransaction transaction(*connection.database, SqlTransaction::Kind::reading);
    body(connection);
    transaction.commit();
    return;
  }
  {
    SqlTransaction transaction(*connection.database, SqlTransaction::Kind::writing);
    body(connection);
    if (NSError stopped = context.check()) throw CallFailed{stopped};
    // From here on it is done as a whole, whatever the context says.
    connection.database->setContext(nullptr);
    transaction.commit();
  }
  wakeWatchers();
  // A commit into a file that was removed meanwhile is none.
  if (currentIdentity() != connection.identity) {
    Fail(CKErrorCode::serviceUnavailable, "The cloud was replaced: " + folder_);
  }
}

void Home::wakeWatchers() const {
  const int file = open(watchedFile().c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
  if (file < 0 || pwrite(file, "x", 1, 0) != 1) {
    // Watchers look by themselves from time to time.
    os_log_error(os_log_create("droxa", "cloudkit"), "can't tell of a change: %s: error %d", watchedFile(),
                 errno);
  }
  if (file >= 0) close(file);
}

}  // namespace droxa::embedded
