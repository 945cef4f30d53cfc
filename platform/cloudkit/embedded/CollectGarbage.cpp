#include <algorithm>

#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/Manifest.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

constexpr std::int64_t kAssetsAtOnce = 200;  // in one transaction, so that writers get their turn
constexpr std::size_t kChunksAtOnce = 200;

// Manifests first, in transactions of their own: a chunk is removed only when no manifest names it.
class Collection {
 public:
  Collection(Home &home, std::chrono::seconds grace, const CKCallContext &context)
      : home_(home), before_(SecondsNow() - grace.count()), context_(context) {}

  EmbeddedCloud::Garbage run() {
    NSError error = forgetAssets();
    for (unsigned folder = 0; folder < 256 && !error; ++folder) error = removeChunks(folder);
    if (!error) home_.chunks().removeUnfinished(before_);
    garbage_.error = error;
    return garbage_;
  }

 private:
  NSError forgetAssets() {
    for (;;) {
      std::vector<std::string> forgotten;
      const NSError error = home_.run(Home::Access::write, context_, [&](const Connection &connection) {
        forgotten = unreferred(connection);
        for (const std::string &digest : forgotten) {
          connection.use("DELETE FROM pieces WHERE asset = ?").bind(digest).run();
          connection.use("DELETE FROM uploads WHERE asset = ?").bind(digest).run();
          connection.use("DELETE FROM assets WHERE digest = ?").bind(digest).run();
        }
      });
      if (error) return error;
      garbage_.assets += forgotten.size();
      if (forgotten.empty()) return {};
    }
  }

  std::vector<std::string> unreferred(const Connection &connection) const {
    std::vector<std::string> digests;
    SqlUse row = connection.use(
        "SELECT digest FROM assets WHERE touched <= ? AND NOT EXISTS"
        " (SELECT 1 FROM record_assets WHERE asset = digest) LIMIT ?");
    row.bind(before_).bind(kAssetsAtOnce);
    while (row.step()) digests.push_back(row.text(0));
    return digests;
  }

  NSError removeChunks(unsigned folder) {
    std::vector<ChunkStore::Found> candidates = home_.chunks().unneededSince(before_, folder);
    NSError error = keepUnneeded(candidates);
    while (!error && !candidates.empty()) {
      const std::size_t count = std::min(candidates.size(), kChunksAtOnce);
      const std::vector<ChunkStore::Found> some(candidates.end() - static_cast<std::ptrdiff_t>(count),
                                                candidates.end());
      candidates.resize(candidates.size() - count);
      // A writer that found such a chunk looks for it again in its own transaction.
      error = home_.run(Home::Access::write, context_, [&](const Connection &connection) {
        for (const ChunkStore::Found &chunk : some) removeChunk(connection, chunk);
      });
    }
    return error;
  }

  // Drops those that a manifest names: most, so that writers aren't held up for them.
  NSError keepUnneeded(std::vector<ChunkStore::Found> &chunks) {
    if (chunks.empty()) return {};
    return home_.run(Home::Access::read, context_, [&](const Connection &connection) {
      std::erase_if(chunks,
                    [&](const ChunkStore::Found &chunk) { return NamesChunk(connection, chunk.digest); });
    });
  }

  void removeChunk(const Connection &connection, const ChunkStore::Found &chunk) {
    if (NamesChunk(connection, chunk.digest)) return;
    if (!home_.chunks().removeUnlessNeeded(chunk.digest, before_)) return;
    ++garbage_.chunks;
    garbage_.bytes += chunk.size;
  }

  Home &home_;
  const std::int64_t before_;  // seconds since 1970
  const CKCallContext &context_;
  EmbeddedCloud::Garbage garbage_;
};

}  // namespace

EmbeddedCloud::Garbage CollectGarbage(Home &home, std::chrono::seconds grace, const CKCallContext &context) {
  return Collection(home, grace, context).run();
}

}  // namespace droxa::embedded
