// Tag data comes from other processes: any bytes must be read without harm, and what was read must be written
// and read back alike.

#include <cstdint>
#include <cstdlib>

#include "platform/fileprovider/FPTags.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t length) {
  using namespace droxa;
  const auto tags = FPGetTagsFromTagsData(NSData::dataWithBytes(bytes, length));
  const NSData made = FPGetTagsDataFromTags(tags);
  if (static_cast<bool>(made) == tags.empty()) std::abort();
  if (FPGetTagsFromTagsData(made) != tags) std::abort();
  if (made.length() > length) std::abort();
  return 0;
}
