#include "keld/contents/ContentsCapabilities.h"

#include <array>
#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <string>
#include <sys/xattr.h>
#include <unistd.h>

#include "keld/contents/DocumentMarker.h"
#include "keld/contents/FileLease.h"
#include "keld/contents/FileSteps.h"

namespace droxa::keld {

namespace {

// Whether a file of this size can be without data, and lose it again. Small sizes are tried too: some file
// systems keep small files within the inode.
bool hasHoles(int file, std::uint64_t size) {
  DataCoverage coverage;
  const auto length = static_cast<off_t>(size);
  if (::ftruncate(file, 0) != 0 || ::ftruncate(file, length) != 0) return false;
  if (ReadDataCoverage(file, size, &coverage) != 0 || coverage != DataCoverage::none) return false;
  const std::string bytes(size, 'x');
  if (::pwrite(file, bytes.data(), bytes.size(), 0) != length || ::fsync(file) != 0) return false;
  if (ReadDataCoverage(file, size, &coverage) != 0 || coverage != DataCoverage::all) return false;
  if (PunchOut(file, size) != 0) return false;
  return ReadDataCoverage(file, size, &coverage) == 0 && coverage == DataCoverage::none;
}

bool hasAttributes(int file) {
  DocumentMarker marker;
  marker.recordName = std::string(kMostRecordNameBytes, 'r');
  marker.digest = std::string(64, '0');
  marker.contentVersion = std::string(kMostContentVersionBytes, 'v');
  return WriteMarker(file, marker) == 0 && ReadMarker(file) == marker;
}

bool hasLeases(int folder, const std::string &name) {
  const OwnedDescriptor file = OpenFileIn(folder, name, O_RDONLY);
  return file && ::fcntl(file.get(), F_SETLEASE, F_RDLCK) == 0 &&
         ::fcntl(file.get(), F_SETLEASE, F_UNLCK) == 0;
}

}  // namespace

int ProbeContentsCapabilities(int folder, ContentsCapabilities *capabilities) {
  static constexpr std::array<const char *, 2> kNames = {".droxa-probe-1", ".droxa-probe-2"};
  OwnedDescriptor file = OpenFileIn(folder, kNames[0], O_RDWR | O_CREAT | O_TRUNC);
  if (!file) return errno;
  capabilities->extendedAttributes = hasAttributes(file.get());
  capabilities->holes = hasHoles(file.get(), 40) && hasHoles(file.get(), 16 * 1024);
  file = OwnedDescriptor();
  capabilities->leases = hasLeases(folder, kNames[0]);
  const OwnedDescriptor other = OpenFileIn(folder, kNames[1], O_RDWR | O_CREAT | O_TRUNC);
  capabilities->exchange = other && ExchangeNames(folder, kNames[0], folder, kNames[1]) == 0;
  for (const char *name : kNames) ::unlinkat(folder, name, 0);
  return 0;
}

}  // namespace droxa::keld
