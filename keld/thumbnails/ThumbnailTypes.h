#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "keld/thumbnails/maker/MakerProtocol.h"

namespace droxa::keld {

// Which of the makers of droxa-thumbnailer makes a thumbnail of documents of a MIME type; nullopt: none does.
// Never MakerKind::external. Any thread.
std::optional<MakerKind> BuiltInThumbnailMaker(std::string_view mimeType);

// Whether a thumbnail of documents of that type can be made on this machine at all: by a maker of its own, or
// by an installed thumbnailer that can be confined. Any thread.
bool CanMakeThumbnailOfType(const std::string &mimeType);

}  // namespace droxa::keld
