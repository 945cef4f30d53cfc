#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/cloudkit/CKCloud.h"
#include "platform/cloudkit/embedded/ChunkStore.h"
#include "platform/cloudkit/embedded/Sql.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::embedded {

// Leaves a call with the error that it answers.
struct CallFailed {
  NSError error;
};
[[noreturn]] void Fail(CKErrorCode code, std::string description);

// Which file a path led to, so that a replaced one is noticed.
struct FileIdentity {
  std::uint64_t device = 0;
  std::uint64_t inode = 0;
  bool operator==(const FileIdentity &) const = default;
};

// A connection to the cloud's database, with what doesn't change while that file is in its place.
// Thread contract: one thread at a time.
struct Connection {
  std::unique_ptr<SqlDatabase> database;
  FileIdentity identity;
  UUID cloud;
  std::int64_t account = 0;
  CKDatabaseScope scope = CKDatabaseScope::privateDatabase;

  SqlUse use(const char *sql) const { return database->use(sql); }
};

// One device's opening of a database of a cloud folder: its names, its connections, the chunks beside it.
// Thread contract: every member may be called on any thread; mutex_ guards the idle connections and is held
// for no call to the database.
class Home {
 public:
  Home(std::string folder, std::string account, std::string device,
       CKDatabaseScope scope = CKDatabaseScope::privateDatabase);

  // Makes what is missing. Call once, before anything else.
  NSError create();

  // Runs the body with a connection and answers its failure. A writing body runs in a transaction that is
  // committed when it returns; readers see one state. Watchers are woken by a write.
  enum class Access { read, write };
  NSError run(Access access, const CKCallContext &context,
              const std::function<void(const Connection &)> &body);

  const std::string &folder() const { return folder_; }
  const std::string &accountName() const { return account_; }
  const std::string &deviceName() const { return device_; }
  CKDatabaseScope scope() const { return scope_; }
  // Tells this object's writes from those of others.
  std::int64_t session() const { return session_; }
  ChunkStore &chunks() { return chunks_; }
  std::string watchedFile() const { return folder_ + "/changes"; }

 private:
  std::string databaseFile() const { return folder_ + "/cloud.sqlite"; }
  void transact(Access access, const CKCallContext &context, const Connection &connection,
                const std::function<void(const Connection &)> &body) const;
  std::unique_ptr<Connection> connect(bool mayCreate) const;
  std::unique_ptr<Connection> connectAndMake() const;
  std::unique_ptr<Connection> checkOut() EXCLUDES(mutex_);
  void checkIn(std::unique_ptr<Connection> connection) EXCLUDES(mutex_);
  FileIdentity currentIdentity() const;  // throws CallFailed while it is gone
  void wakeWatchers() const;

  const std::string folder_;
  const std::string account_;
  const std::string device_;
  const CKDatabaseScope scope_;
  const std::int64_t session_;
  ChunkStore chunks_;

  Mutex mutex_;
  std::vector<std::unique_ptr<Connection>> idle_ GUARDED_BY(mutex_);
};

}  // namespace droxa::embedded
