#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/Chunker.h"
#include "platform/cloudkit/embedded/Manifest.h"
#include "platform/oslog/os_log.h"

namespace droxa::embedded {
namespace {

constexpr std::size_t kPiecesAtOnce = 256;

NSError unavailable(const CKAssetReference &asset, const std::string &reason, int code) {
  return CKErrorMake(CKErrorCode::assetNotAvailable,
                     "The asset " + asset.description() + " can't be read: " + reason,
                     code != 0 ? NSError::errorWithPOSIXCode(code) : NSError());
}

// One transfer from an offset to the end.
class Transfer {
 public:
  Transfer(Home &home, const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
           const CKProgressHandler &progress, const CKCallContext &context)
      : home_(home), asset_(asset), at_(offset), sink_(sink), progress_(progress), context_(context) {}

  NSError run() {
    do {
      if (NSError error = nextPieces()) return error;
      for (const Piece &piece : pieces_) {
        if (NSError error = give(piece)) return error;
      }
    } while (at_ < asset_.size);
    return {};
  }

 private:
  NSError nextPieces() {
    NSError error = home_.run(Home::Access::read, context_, [this](const Connection &connection) {
      if (!KnowsAsset(connection, asset_)) {
        Fail(CKErrorCode::unknownItem, "The cloud has no contents " + asset_.description());
      }
      pieces_ = PiecesFrom(connection, asset_, at_, kPiecesAtOnce);
    });
    if (!error && pieces_.empty() && at_ < asset_.size) error = unavailable(asset_, "a part is unknown", 0);
    return error;
  }

  NSError give(const Piece &piece) {
    if (NSError stopped = context_.check()) return stopped;
    if (piece.start > at_ || piece.size > kLargestChunk) return unavailable(asset_, "a part is unknown", 0);
    if (NSError error = readChunk(piece)) return error;
    const auto skipped = static_cast<std::size_t>(at_ - piece.start);
    if (NSError refused = sink_(std::span<const std::uint8_t>(buffer_).subspan(skipped))) return refused;
    at_ = piece.start + piece.size;
    if (progress_) progress_(at_, asset_.size);
    return {};
  }

  NSError readChunk(const Piece &piece) {
    int code = 0;
    auto reading = home_.chunks().read(piece.chunk, piece.size, buffer_, &code);
    // Once more, lest a passing failure counts as damage.
    if (reading == ChunkStore::Reading::damaged) {
      reading = home_.chunks().read(piece.chunk, piece.size, buffer_, &code);
    }
    if (reading == ChunkStore::Reading::intact) return {};
    const bool isDamaged = reading == ChunkStore::Reading::damaged;
    const std::string reason = std::string(isDamaged ? "damaged" : "missing") + " chunk " + piece.chunk;
    os_log_error(os_log_create("droxa", "cloudkit"), "asset %s: %s, error %d", asset_.description(), reason,
                 code);
    if (isDamaged && code == 0) home_.chunks().setAside(piece.chunk);
    return unavailable(asset_, reason, code);
  }

  Home &home_;
  const CKAssetReference &asset_;
  std::uint64_t at_;
  const CKAssetSink &sink_;
  const CKProgressHandler &progress_;
  const CKCallContext &context_;
  std::vector<Piece> pieces_;
  std::vector<std::uint8_t> buffer_;
};

}  // namespace

NSError ReadAsset(Home &home, const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                  const CKProgressHandler &progress, const CKCallContext &context) {
  if (!asset.isWellFormed() || offset > asset.size || !sink) {
    return CKErrorMake(CKErrorCode::invalidArguments,
                       "The asset " + asset.description() + " can't be read from " + std::to_string(offset));
  }
  return Transfer(home, asset, offset, sink, progress, context).run();
}

CKAssetPresence HasAsset(Home &home, const CKAssetReference &asset, const CKCallContext &context) {
  CKAssetPresence presence;
  std::uint64_t at = 0;
  do {
    std::vector<Piece> pieces;
    bool isKnown = false;
    presence.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
      isKnown = KnowsAsset(connection, asset);
      if (isKnown) pieces = PiecesFrom(connection, asset, at, kPiecesAtOnce);
    });
    if (presence.error || !isKnown || (pieces.empty() && at < asset.size)) return presence;
    for (const Piece &piece : pieces) {
      if (!home.chunks().has(piece.chunk, piece.size)) return presence;
      at = piece.start + piece.size;
    }
  } while (at < asset.size);
  presence.isPresent = true;
  return presence;
}

}  // namespace droxa::embedded
