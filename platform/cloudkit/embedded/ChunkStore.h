#pragma once

#include <cstdint>
#include <functional>
#include <set>
#include <span>
#include <string>
#include <vector>

#include "platform/foundation/UUID.h"

namespace droxa::embedded {

// The files that hold chunks: chunks/<first two digits>/<SHA-256 of the bytes>. A file appears under its name
// whole, or not at all; its modification time says when it was needed last.
// Thread contract: immutable; every member may be called on any thread and by several processes.
class ChunkStore {
 public:
  explicit ChunkStore(const std::string &folder);
  int create() const;  // the folders; an errno value

  // Whether the file is there, of that size.
  bool has(const std::string &digest, std::uint64_t size) const;
  enum class Reading { intact, missing, damaged };
  // Reads a chunk whole and verifies it. `code` is the system's reason, 0 when there is none.
  Reading read(const std::string &digest, std::uint64_t size, std::vector<std::uint8_t> &bytes,
               int *code) const;
  // Puts a chunk that was found damaged out of the way, so that another upload writes it again.
  void setAside(const std::string &digest) const;

  struct Found {
    std::string digest;
    std::uint64_t size;
  };
  // The chunks that weren't needed since the time (seconds since 1970), one folder of 256 at a time.
  std::vector<Found> unneededSince(std::int64_t time, unsigned folder) const;
  // Removes it if it still wasn't needed since; whether it did.
  bool removeUnlessNeeded(const std::string &digest, std::int64_t time) const;
  void removeUnfinished(std::int64_t time) const;  // what dead writers left

 private:
  friend class ChunkWriter;
  std::string path(const std::string &digest) const;
  std::string folderOf(const std::string &digest) const;
  const std::string chunks_;
  const std::string unfinished_;
  const std::string damaged_;
};

// Puts chunks into a store. They are there for good, power failures included, once finish() answered 0.
// Thread contract: one thread.
class ChunkWriter {
 public:
  explicit ChunkWriter(const ChunkStore &store);
  ~ChunkWriter();  // removes what isn't finished
  ChunkWriter(const ChunkWriter &) = delete;
  ChunkWriter &operator=(const ChunkWriter &) = delete;

  // An errno value. `isKept` tells, of a chunk that is there already, whether something that is on the disk
  // for good names it: only then is its name there for good, too.
  int add(const std::string &digest, std::span<const std::uint8_t> bytes,
          const std::function<bool(const std::string &digest)> &isKept);
  int finish();

 private:
  struct Pending {
    int file;
    std::string temporary;
    std::string digest;
  };
  int write(const std::string &digest, std::span<const std::uint8_t> bytes);
  int flush();
  int syncFiles();
  int syncFolders();
  int syncAll();
  const ChunkStore &store_;
  const std::string prefix_;
  const int root_;  // the folder of all chunks
  std::uint64_t count_ = 0;
  std::vector<Pending> pending_;
  std::set<std::string> folders_;  // with names that may not be there for good yet
};

}  // namespace droxa::embedded
