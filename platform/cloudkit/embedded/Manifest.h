#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/cloudkit/embedded/Home.h"

namespace droxa::embedded {

// One chunk's place in an asset.
struct Piece {
  std::uint64_t start = 0;
  std::uint64_t size = 0;
  std::string chunk;
};

// Whether the cloud knows contents of that digest and size that the account may read, or refer to: it
// uploaded them, or sees a record that refers to them, in whichever database.
bool KnowsAsset(const Connection &connection, const CKAssetReference &asset);
// The pieces that end after `offset`, in order, at most `limit`.
std::vector<Piece> PiecesFrom(const Connection &connection, const CKAssetReference &asset,
                              std::uint64_t offset, std::size_t limit);
// Whether any asset has such a piece.
bool NamesChunk(const Connection &connection, const std::string &chunk);
// Keeps that the account has, or had, these contents itself.
void NoteUpload(const Connection &connection, const CKAssetReference &asset);
// Keeps an asset's manifest, in the place of an earlier one, and that it was needed now.
void WriteManifest(const Connection &connection, const CKAssetReference &asset,
                   const std::vector<Piece> &pieces);

}  // namespace droxa::embedded
