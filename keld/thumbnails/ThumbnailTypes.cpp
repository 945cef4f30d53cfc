#include "keld/thumbnails/ThumbnailTypes.h"

#include <algorithm>
#include <array>
#include <string>

#include "keld/thumbnails/ExternalThumbnailers.h"
#include "platform/quicklook/QLThumbnailStoreRetrievalOperation.h"

namespace droxa::keld {

namespace {

constexpr std::array<std::string_view, 10> kPhotographs{
    "image/jpeg", "image/png",  "image/webp", "image/tiff",          "image/gif",
    "image/heic", "image/heif", "image/avif", "image/heif-sequence", "image/heic-sequence"};
constexpr std::array<std::string_view, 2> kDrawings{"image/svg+xml", "image/svg+xml-compressed"};

}  // namespace

std::optional<MakerKind> BuiltInThumbnailMaker(std::string_view mimeType) {
  if (std::find(kPhotographs.begin(), kPhotographs.end(), mimeType) != kPhotographs.end())
    return MakerKind::image;
  if (std::find(kDrawings.begin(), kDrawings.end(), mimeType) != kDrawings.end()) return MakerKind::drawing;
  if (mimeType == "application/pdf") return MakerKind::page;
  return std::nullopt;
}

bool CanMakeThumbnailOfType(const std::string &mimeType) {
  if (BuiltInThumbnailMaker(mimeType)) return true;
  return QLThumbnailStoreRetrievalOperation::canMostRecentClientsGenerateThumbnailsForUTI(mimeType) &&
         CanConfineThumbnailers();
}

}  // namespace droxa::keld
