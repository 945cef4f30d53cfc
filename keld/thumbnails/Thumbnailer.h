#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "keld/FolderReading.h"
#include "platform/cloudkit/CKCallContext.h"

namespace droxa::keld {

struct ThumbnailResult {
  enum class Outcome : std::uint8_t {
    made,
    refused,      // of these contents there is none, however often it is tried
    unavailable,  // thumbnails can't be made at all now
    cancelled
  };
  Outcome outcome = Outcome::unavailable;
  std::string why;      // of refused and unavailable, for people
  OwnedDescriptor png;  // of made: memory, open for reading
  std::uint64_t size = 0;
  unsigned width = 0, height = 0;
};

// Makes thumbnails of documents: PNG, at most 1024 pixels a side. Thread contract: any thread; several calls
// may be under way.
class Thumbnailer {
 public:
  virtual ~Thumbnailer() = default;
  virtual bool canMake(const std::string &mimeType) = 0;
  // Blocks, at most for a few seconds more than a thumbnail may take; soon ended by the cancellation. The
  // contents are an open file, of which only reads at offsets and a duplicate are made; what they say is
  // never trusted.
  virtual ThumbnailResult make(int contents, const std::string &mimeType,
                               const CKCancellation &cancellation) = 0;
  // Nothing is asked for for now: what is kept for the next document may go.
  virtual void rest() {}
};

}  // namespace droxa::keld
