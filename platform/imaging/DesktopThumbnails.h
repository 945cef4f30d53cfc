#pragma once

#include <cstdint>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/imaging/PNGImage.h"

namespace droxa {

// What a thumbnail is of, as the desktop asks for it.
struct DesktopThumbnailSubject {
  std::string path;  // absolute, as programs see it
  std::int64_t modifiedSeconds = 0;
  std::uint64_t size = 0;  // bytes
};

// The cache of thumbnails that the desktop's programs share: a folder for each size, "normal" (128 pixels),
// "large" (256), "x-large" (512) and "xx-large" (1024), and in it a PNG file for each document, named after
// the MD5 of the document's URI, that says which document and which state of it the picture is of.
// Thread contract: immutable; any thread and any process, since every file appears as a whole.
class DesktopThumbnails {
 public:
  // $XDG_CACHE_HOME/thumbnails, or ~/.cache/thumbnails.
  static std::string userFolder();
  // As programs of the desktop write it: "file:///a%20b".
  static std::string URIForPath(const std::string &path);

  explicit DesktopThumbnails(std::string folder) : folder_(std::move(folder)) {}

  // Where the thumbnail of one size (by its folder's name) is looked for.
  std::string fileFor(const std::string &path, const std::string &sizeName) const;
  // Whether there is a thumbnail of this state of the document in every size.
  bool hasAll(const DesktopThumbnailSubject &subject) const;
  // Writes those sizes that aren't there, scaled down from the picture, which is as large as it is in the
  // sizes above its own. Files are for the user alone. nil, or why one couldn't be written.
  NSError store(const DesktopThumbnailSubject &subject, const PNGImage &picture) const;

 private:
  bool isValid(const std::string &file, const DesktopThumbnailSubject &subject) const;

  const std::string folder_;
};

}  // namespace droxa
