#include "fileproviderd/mount/DocumentState.h"

#include <array>
#include <cerrno>
#include <charconv>
#include <fcntl.h>
#include <string_view>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace droxa {

namespace {

struct Marker {
  char state = 0;  // 0: none
  std::uint64_t size = 0;
  std::int64_t modified = 0;
};

template <class Number>
void takeNumber(std::string_view *rest, Number *number) {
  const auto [end, error] = std::from_chars(rest->data(), rest->data() + rest->size(), *number);
  rest->remove_prefix(static_cast<std::size_t>(end - rest->data()));
  if (!rest->empty()) rest->remove_prefix(1);
}

Marker parseMarker(std::string_view text) {
  Marker marker;
  if (text.size() < 4 || !text.starts_with("1 ") || text[3] != ' ') return marker;
  marker.state = text[2];
  text.remove_prefix(4);
  takeNumber(&text, &marker.size);
  takeNumber(&text, &marker.modified);
  return marker;
}

std::string linkOf(int descriptor) {
  return "/proc/self/fd/" + std::to_string(descriptor);
}

// `mayReadExtents`: the descriptor is open for more than its path.
DocumentState stateOf(int descriptor, ssize_t length, std::string_view bytes, bool mayReadExtents) {
  const Marker marker =
      length > 0 ? parseMarker(bytes.substr(0, static_cast<std::size_t>(length))) : Marker();
  if (marker.state != 'p' && marker.state != 'd' && marker.state != 'e') return DocumentState::unmarked;
  struct stat status;
  if (::fstat(descriptor, &status) != 0 || status.st_size == 0 || marker.size == 0)
    return DocumentState::present;
  const std::int64_t modified = std::int64_t{status.st_mtim.tv_sec} * 1'000'000'000 + status.st_mtim.tv_nsec;
  const bool hasSize = static_cast<std::uint64_t>(status.st_size) == marker.size;
  if (marker.state == 'p')
    return hasSize && modified == marker.modified ? DocumentState::present : DocumentState::edited;
  if (marker.state == 'd' && !hasSize) return DocumentState::edited;
  if (marker.state == 'd' && mayReadExtents) {
    const off_t data = ::lseek(descriptor, 0, SEEK_DATA);
    // Files without extents of their own (very small ones) say that all of them is data.
    if (data >= 0 && modified != marker.modified) return DocumentState::edited;
  }
  return DocumentState::dataless;
}

}  // namespace

DocumentState stateOfOpenDocument(int descriptor) {
  std::array<char, 1024> bytes;
  const ssize_t length = ::fgetxattr(descriptor, kDocumentAttribute, bytes.data(), bytes.size());
  return stateOf(descriptor, length, {bytes.data(), bytes.size()}, true);
}

DocumentState stateOfPath(int descriptor) {
  std::array<char, 1024> bytes;
  const ssize_t length =
      ::getxattr(linkOf(descriptor).c_str(), kDocumentAttribute, bytes.data(), bytes.size());
  return stateOf(descriptor, length, {bytes.data(), bytes.size()}, false);
}

}  // namespace droxa
