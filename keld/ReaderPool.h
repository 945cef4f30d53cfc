#pragma once

#include <condition_variable>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "keld/ItemQueries.h"
#include "keld/Sql.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// A few read-only connections to the item database, so that questions don't wait for writes, nor for one
// another. Thread contract: any thread.
class ReaderPool {
 public:
  explicit ReaderPool(std::string path, std::size_t most = 4);
  ~ReaderPool();

  // Runs `work` in a read transaction of its own: all that it asks is of one moment. Throws SqlError, and
  // what `work` throws.
  void read(const std::function<void(ItemQueries &)> &work);

 private:
  struct Reader {
    explicit Reader(const std::string &path)
        : database(path, SqlDatabase::Access::readOnly, 2048), queries(database) {}
    SqlDatabase database;
    ItemQueries queries;
  };
  std::unique_ptr<Reader> take();
  void giveBack(std::unique_ptr<Reader> reader);

  const std::string path_;
  const std::size_t most_;
  Mutex mutex_;
  std::condition_variable_any free_;
  std::vector<std::unique_ptr<Reader>> idle_ GUARDED_BY(mutex_);
  std::size_t made_ GUARDED_BY(mutex_) = 0;
};

}  // namespace droxa::keld
