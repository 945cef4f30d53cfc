#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace droxa::keld {

enum class MarkerState : std::uint8_t {
  present,   // the contents are here
  evicting,  // the contents are being let go of; what is left of them is worth nothing
  dataless,  // the contents are in the cloud alone
  folder,    // a folder's marker: it has a record name and nothing else
};

// The extended attribute that holds a marker.
inline constexpr char kMarkerAttribute[] = "user.droxa.document";

inline constexpr std::size_t kMostRecordNameBytes = 255;
inline constexpr std::size_t kMostContentVersionBytes = 255;

// What a document of the replica bears in an extended attribute: which of the cloud's contents it stands
// for. Thread contract: a value.
struct DocumentMarker {
  MarkerState state = MarkerState::present;
  std::string recordName;      // 1 to 255 bytes, no control characters
  std::string contentVersion;  // up to 255 printable ASCII bytes, no blanks
  std::string digest;          // of the contents: SHA-256 in 64 small hexadecimal digits
  std::uint64_t size = 0;      // of the contents
  std::int64_t modified = 0;   // nanoseconds since 1970: the file's modification time with these contents
  std::int64_t birth = 0;      // the cloud's creation date, as a file's own can't be set; 0 when not known

  static DocumentMarker ofFolder(std::string recordName);
  bool isValid() const;  // every field as told above
  bool operator==(const DocumentMarker &) const = default;
};

// Whether it reads as a SHA-256: 64 small hexadecimal digits.
bool IsContentsDigest(std::string_view text);

// The marker as the attribute's bytes. REQUIRES: marker.isValid()
std::string EncodeMarker(const DocumentMarker &marker);
// nullopt for anything that EncodeMarker doesn't write.
std::optional<DocumentMarker> ParseMarker(std::string_view bytes);

// The marker of `name` in the open folder (which may be open as a path alone); a link is not followed.
// nullopt when there is none, or one that can't be read or parsed.
std::optional<DocumentMarker> ReadMarker(int folder, const std::string &name);
// The marker of an open file or folder.
std::optional<DocumentMarker> ReadMarker(int descriptor);
// The same of `name` in the folder, or of the descriptor itself where `name` is null; tells "none" (0 and no
// marker) from "can't be read" (an errno).
int ReadMarkerOrError(int folder, const std::string *name, std::optional<DocumentMarker> *marker);

// Writes the marker onto an open file or folder (not one open as a path alone). It is durable after the next
// fsync. 0 or an errno: ENOTSUP where the file system has no such attributes, EINVAL for a marker that isn't
// valid.
int WriteMarker(int descriptor, const DocumentMarker &marker);
// 0 also when there was none.
int RemoveMarker(int descriptor);

}  // namespace droxa::keld
