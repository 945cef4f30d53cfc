#include "tessaly/QVFileCoordinatorReadingOptions.h"

#include "platform/oslog/LogFormat.h"

namespace droxa {

namespace {

struct NamedOption {
  std::uint64_t bit;
  const char *name;
};

constexpr NamedOption kOptions[] = {
    {NSFileCoordinatorReadingWithoutChanges, "without changes"},
    {NSFileCoordinatorReadingResolvesSymbolicLink, "resolves symbolic link"},
    {NSFileCoordinatorReadingImmediatelyAvailableMetadataOnly, "immediately available metadata only"},
    {NSFileCoordinatorReadingForUploading, "for uploading"},
    {QVFileCoordinatorReadingForcedDownload, "forced download"},
};

std::string hexadecimal(std::uint64_t bits) {
  return NSStringWithFormat("0x%llx", bits);
}

}  // namespace

std::string QVFileCoordinatorReadingOptionsPrettyPrint(std::uint64_t options) {
  if (options == 0) return "0 (none)";
  std::string names;
  std::uint64_t rest = options;
  for (const NamedOption &option : kOptions) {
    if ((options & option.bit) == 0) continue;
    if (!names.empty()) names += " | ";
    names += option.name;
    rest &= ~option.bit;
  }
  if (rest != 0) names += (names.empty() ? "" : " | ") + hexadecimal(rest);
  return hexadecimal(options) + " (" + names + ")";
}

}  // namespace droxa
