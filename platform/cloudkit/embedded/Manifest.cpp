#include "platform/cloudkit/embedded/Manifest.h"

#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {

bool KnowsAsset(const Connection &connection, const CKAssetReference &asset) {
  SqlUse row = connection.use("SELECT size FROM assets WHERE digest = ?");
  return row.bind(asset.sha256).step() && static_cast<std::uint64_t>(row.integer(0)) == asset.size;
}

std::vector<Piece> PiecesFrom(const Connection &connection, const CKAssetReference &asset,
                              std::uint64_t offset, std::size_t limit) {
  std::vector<Piece> pieces;
  SqlUse row = connection.use(
      "SELECT start, size, chunk FROM pieces WHERE asset = ?1 AND start + size > ?2 ORDER BY number LIMIT "
      "?3");
  row.bind(asset.sha256).bind(static_cast<std::int64_t>(offset)).bind(static_cast<std::int64_t>(limit));
  while (row.step()) {
    pieces.push_back({static_cast<std::uint64_t>(row.integer(0)), static_cast<std::uint64_t>(row.integer(1)),
                      row.text(2)});
  }
  return pieces;
}

bool NamesChunk(const Connection &connection, const std::string &chunk) {
  SqlUse row = connection.use("SELECT 1 FROM pieces WHERE chunk = ? LIMIT 1");
  return row.bind(chunk).step();
}

void WriteManifest(const Connection &connection, const CKAssetReference &asset,
                   const std::vector<Piece> &pieces) {
  // Written anew in any case: chunks that were damaged may have been cut differently before.
  connection.use("INSERT OR REPLACE INTO assets (digest, size, touched) VALUES (?, ?, ?)")
      .bind(asset.sha256)
      .bind(static_cast<std::int64_t>(asset.size))
      .bind(SecondsNow())
      .run();
  connection.use("DELETE FROM pieces WHERE asset = ?").bind(asset.sha256).run();
  std::int64_t number = 0;
  for (const Piece &piece : pieces) {
    connection.use("INSERT INTO pieces (asset, number, start, chunk, size) VALUES (?, ?, ?, ?, ?)")
        .bind(asset.sha256)
        .bind(number++)
        .bind(static_cast<std::int64_t>(piece.start))
        .bind(piece.chunk)
        .bind(static_cast<std::int64_t>(piece.size))
        .run();
  }
}

}  // namespace droxa::embedded
