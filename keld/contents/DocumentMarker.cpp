#include "keld/contents/DocumentMarker.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <sys/xattr.h>

namespace droxa::keld {

namespace {

// The first field of every marker. Another version's reads as no marker.
constexpr char kVersion[] = "1";
constexpr std::size_t kDigestDigits = 64;
constexpr std::size_t kMostMarkerBytes = 1024;

char letterOf(MarkerState state) {
  switch (state) {
    case MarkerState::present:
      return 'p';
    case MarkerState::evicting:
      return 'e';
    case MarkerState::dataless:
      return 'd';
    case MarkerState::folder:
      return 'f';
  }
  return '?';
}

std::optional<MarkerState> stateOf(std::string_view letter) {
  for (const auto state :
       {MarkerState::present, MarkerState::evicting, MarkerState::dataless, MarkerState::folder})
    if (letter.size() == 1 && letter.front() == letterOf(state)) return state;
  return std::nullopt;
}

bool isRecordName(std::string_view text) {
  return !text.empty() && text.size() <= kMostRecordNameBytes &&
         std::all_of(text.begin(), text.end(), [](char c) {
           const auto byte = static_cast<unsigned char>(c);
           return byte >= 0x20 && byte != 0x7f;
         });
}

bool isContentVersion(std::string_view text) {
  return text.size() <= kMostContentVersionBytes &&
         std::all_of(text.begin(), text.end(), [](char c) { return c > 0x20 && c < 0x7f; });
}

// Cuts the next field, up to a blank, off the front.
std::string_view takeField(std::string_view *rest) {
  const std::size_t end = std::min(rest->find(' '), rest->size());
  const std::string_view field = rest->substr(0, end);
  rest->remove_prefix(std::min(end + 1, rest->size()));
  return field;
}

template <class Number>
bool takeNumber(std::string_view *rest, Number *number) {
  const std::string_view field = takeField(rest);
  const auto [end, error] = std::from_chars(field.data(), field.data() + field.size(), *number);
  return error == std::errc() && end == field.data() + field.size();
}

}  // namespace

DocumentMarker DocumentMarker::ofFolder(std::string recordName) {
  DocumentMarker marker;
  marker.state = MarkerState::folder;
  marker.recordName = std::move(recordName);
  return marker;
}

bool DocumentMarker::isValid() const {
  if (!isRecordName(recordName)) return false;
  if (state == MarkerState::folder) return *this == ofFolder(recordName);
  return IsContentsDigest(digest) && isContentVersion(contentVersion) &&
         size <= static_cast<std::uint64_t>(INT64_MAX);
}

bool IsContentsDigest(std::string_view text) {
  return text.size() == kDigestDigits && std::all_of(text.begin(), text.end(), [](char c) {
           return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f');
         });
}

// The record's name comes last: it alone may hold blanks.
std::string EncodeMarker(const DocumentMarker &marker) {
  std::string bytes = std::string(kVersion) + ' ' + letterOf(marker.state) + ' ';
  if (marker.state != MarkerState::folder) {
    bytes += std::to_string(marker.size) + ' ' + std::to_string(marker.modified) + ' ' +
             std::to_string(marker.birth) + ' ' + marker.digest + " v" + marker.contentVersion + ' ';
  }
  return bytes + marker.recordName;
}

std::optional<DocumentMarker> ParseMarker(std::string_view bytes) {
  std::string_view rest = bytes;
  if (takeField(&rest) != kVersion) return std::nullopt;
  const auto state = stateOf(takeField(&rest));
  if (!state) return std::nullopt;
  DocumentMarker marker;
  marker.state = *state;
  if (marker.state != MarkerState::folder) {
    if (!takeNumber(&rest, &marker.size) || !takeNumber(&rest, &marker.modified) ||
        !takeNumber(&rest, &marker.birth))
      return std::nullopt;
    marker.digest = takeField(&rest);
    const std::string_view version = takeField(&rest);
    if (version.empty() || version.front() != 'v') return std::nullopt;
    marker.contentVersion = version.substr(1);
  }
  marker.recordName = rest;
  // What has a second way of being written (leading zeros, more blanks) wasn't written by EncodeMarker.
  if (!marker.isValid() || EncodeMarker(marker) != bytes) return std::nullopt;
  return marker;
}

int ReadMarkerOrError(int folder, const std::string *name, std::optional<DocumentMarker> *marker) {
  marker->reset();
  std::array<char, kMostMarkerBytes> bytes;
  ssize_t length;
  if (name) {
    // Through the descriptor's link: it works for a folder that is open as a path alone.
    const std::string path = "/proc/self/fd/" + std::to_string(folder) + "/" + *name;
    length = ::lgetxattr(path.c_str(), kMarkerAttribute, bytes.data(), bytes.size());
  } else {
    length = ::fgetxattr(folder, kMarkerAttribute, bytes.data(), bytes.size());
  }
  if (length >= 0) {
    *marker = ParseMarker(std::string_view(bytes.data(), static_cast<std::size_t>(length)));
    return 0;
  }
  // ERANGE: longer than any marker, so it is none.
  return errno == ENODATA || errno == ENOTSUP || errno == ERANGE ? 0 : errno;
}

std::optional<DocumentMarker> ReadMarker(int folder, const std::string &name) {
  std::optional<DocumentMarker> marker;
  ReadMarkerOrError(folder, &name, &marker);
  return marker;
}

std::optional<DocumentMarker> ReadMarker(int descriptor) {
  std::optional<DocumentMarker> marker;
  ReadMarkerOrError(descriptor, nullptr, &marker);
  return marker;
}

int WriteMarker(int descriptor, const DocumentMarker &marker) {
  if (!marker.isValid()) return EINVAL;
  const std::string bytes = EncodeMarker(marker);
  return ::fsetxattr(descriptor, kMarkerAttribute, bytes.data(), bytes.size(), 0) == 0 ? 0 : errno;
}

int RemoveMarker(int descriptor) {
  if (::fremovexattr(descriptor, kMarkerAttribute) == 0) return 0;
  return errno == ENODATA || errno == ENOTSUP ? 0 : errno;
}

}  // namespace droxa::keld
