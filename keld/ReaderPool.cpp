#include "keld/ReaderPool.h"

namespace droxa::keld {

ReaderPool::ReaderPool(std::string path, std::size_t most) : path_(std::move(path)), most_(most) {}

ReaderPool::~ReaderPool() = default;

std::unique_ptr<ReaderPool::Reader> ReaderPool::take() {
  {
    Lock lock(mutex_);
    while (idle_.empty() && made_ == most_) free_.wait(mutex_);
    if (!idle_.empty()) {
      auto reader = std::move(idle_.back());
      idle_.pop_back();
      return reader;
    }
    ++made_;
  }
  try {
    return std::make_unique<Reader>(path_);
  } catch (...) {
    const Lock lock(mutex_);
    --made_;
    free_.notify_one();
    throw;
  }
}

void ReaderPool::giveBack(std::unique_ptr<Reader> reader) {
  const Lock lock(mutex_);
  idle_.push_back(std::move(reader));
  free_.notify_one();
}

void ReaderPool::read(const std::function<void(ItemQueries &)> &work) {
  // Given back in every case; after the transaction, which ends first.
  struct Borrowed {
    ReaderPool &pool;
    std::unique_ptr<Reader> reader;
    ~Borrowed() { pool.giveBack(std::move(reader)); }
  } borrowed{*this, take()};
  SqlTransaction transaction(borrowed.reader->database, false);
  work(borrowed.reader->queries);
  transaction.commit();
}

}  // namespace droxa::keld
