#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"

// What a user notes on an item besides its contents, and how the item's file keeps it: in extended attributes
// that a person can read with getfattr. Where there are none (a symbolic link, some file systems), the daemon
// keeps it (QVProtocol::setMetadataAtURL). Any thread.

namespace droxa {

inline constexpr char QVTagsAttribute[] = "user.xdg.tags";             // "Red,Work": as file managers keep it
inline constexpr char QVLastUsedAttribute[] = "user.droxa.last-used";  // "2026-01-31T12:00:00.123456789Z"
inline constexpr char QVFavoriteRankAttribute[] = "user.droxa.favorite-rank";  // "12"

inline constexpr std::size_t QVMostTags = 100;
inline constexpr std::size_t QVLongestTag = 255;  // bytes

struct QVItemMetadata {
  std::vector<std::string> tags;   // UTF-8, without commas and control characters, each once
  std::int64_t lastUsed = 0;       // nanoseconds since 1970; 0: never
  std::uint64_t favoriteRank = 0;  // 0: none

  bool isEmpty() const { return tags.empty() && lastUsed == 0 && favoriteRank == 0; }
  bool operator==(const QVItemMetadata &) const = default;
};

// What is to become different; what has no value stays as it is.
struct QVItemMetadataChange {
  std::optional<std::vector<std::string>> tags;
  std::optional<std::int64_t> lastUsed;
  std::optional<std::uint64_t> favoriteRank;

  static QVItemMetadataChange to(const QVItemMetadata &metadata) {
    return {metadata.tags, metadata.lastUsed, metadata.favoriteRank};
  }
  QVItemMetadata appliedTo(QVItemMetadata metadata) const;
  bool operator==(const QVItemMetadataChange &) const = default;
};

// The names without blanks around them, each once, without empty ones. nil, or QVErrorInvalidArgument for
// names that can't be kept: with a comma or a control character, not UTF-8, too long, too many.
NSError QVNormalizeTagNames(std::vector<std::string> *names);

// The attributes' texts. Reading passes over whatever makes no sense.
std::string QVEncodeTagNames(const std::vector<std::string> &names);
std::vector<std::string> QVDecodeTagNames(std::string_view text);
std::string QVEncodeLastUsed(std::int64_t nanoseconds);
std::int64_t QVDecodeLastUsed(std::string_view text);  // 0 for what is no date
std::uint64_t QVDecodeFavoriteRank(std::string_view text);

// The tag data that the framework is given for them; nil for none. Their colours aren't kept.
NSData QVTagDataOfNames(const std::vector<std::string> &names);

// What the file at `path` bears (a link itself, not its target): one system call when it bears nothing. 0 or
// an errno. `hasOther` (may be null) is set to whether it bears an attribute `other` besides.
int QVReadItemAttributes(const std::string &path, QVItemMetadata *metadata, const char *other = nullptr,
                         bool *hasOther = nullptr);
// Whether the file at `path` could bear them at all.
bool QVKeepsItemAttributes(const std::string &path);
// 0 or an errno, with which some of it may have been written: ENOTSUP where the file can't bear attributes (a
// link among them).
int QVWriteItemAttributes(const std::string &path, const QVItemMetadataChange &change);

}  // namespace droxa
