#include "platform/cloudkit/embedded/Manifest.h"

#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {

bool KnowsAsset(const Connection &connection, const CKAssetReference &asset) {
  SqlUse row = connection.use(
      "SELECT size FROM assets WHERE digest = ?1 AND ("
      "EXISTS (SELECT 1 FROM uploads WHERE asset = ?1 AND account = ?2)"
      " OR EXISTS (SELECT 1 FROM record_assets JOIN zones ON zones.id = record_assets.zone"
      " WHERE record_assets.asset = ?1 AND zones.account = ?2)"
      " OR EXISTS (SELECT 1 FROM record_assets JOIN views ON views.zone = record_assets.zone"
      " JOIN view_records ON view_records.view = views.id AND view_records.record = record_assets.record"
      " WHERE record_assets.asset = ?1 AND views.account = ?2 AND view_records.visible))");
  return row.bind(asset.sha256).bind(connection.account).step() &&
         static_cast<std::uint64_t>(row.integer(0)) == asset.size;
}

void NoteUpload(const Connection &connection, const CKAssetReference &asset) {
  connection.use("INSERT OR IGNORE INTO uploads (asset, account) VALUES (?, ?)")
      .bind(asset.sha256)
      .bind(connection.account)
      .run();
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
