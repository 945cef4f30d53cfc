#include "tessaly/QVItemMetadata.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <sys/stat.h>
#include <sys/xattr.h>

#include "platform/fileprovider/FPTags.h"
#include "platform/foundation/UTF8.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

constexpr std::int64_t kSecond = 1'000'000'000;
constexpr std::size_t kLongestAttribute = 65536;  // the kernel's own limit

bool hasControlCharacter(std::string_view text) {
  for (std::size_t at = 0; at < text.size(); ++at) {
    const auto byte = static_cast<unsigned char>(text[at]);
    if (byte < 0x20 || byte == 0x7f) return true;
    // U+0080 to U+009F
    if (byte == 0xc2 && at + 1 < text.size() && static_cast<unsigned char>(text[at + 1]) < 0xa0) return true;
  }
  return false;
}

std::string_view withoutBlanks(std::string_view text) {
  while (!text.empty() && text.front() == ' ') text.remove_prefix(1);
  while (!text.empty() && text.back() == ' ') text.remove_suffix(1);
  return text;
}

NSError refusal(const std::string &name, const std::string &why) {
  return qvc_error(QVErrorInvalidArgument, "the tag \"" + name + "\" " + why);
}

NSError checkTagName(const std::string &name) {
  if (!UTF8IsValid(name)) return refusal(name, "isn't UTF-8 text; nothing was changed");
  if (hasControlCharacter(name)) return refusal(name, "has a control character in it; leave that out");
  if (name.find(',') != std::string::npos)
    return refusal(name, "has a comma in it, which separates tags where they are kept; leave that out");
  if (name.size() > QVLongestTag)
    return refusal(name, "is longer than " + std::to_string(QVLongestTag) + " bytes; make it shorter");
  return NSError();
}

// "" when there is none.
std::string readAttribute(const std::string &path, const char *name) {
  std::string bytes(512, '\0');
  ssize_t length = ::lgetxattr(path.c_str(), name, bytes.data(), bytes.size());
  if (length < 0 && errno == ERANGE) {
    bytes.resize(kLongestAttribute);
    length = ::lgetxattr(path.c_str(), name, bytes.data(), bytes.size());
  }
  bytes.resize(length > 0 ? static_cast<std::size_t>(length) : 0);
  return bytes;
}

// In a list of names of which each ends with a NUL.
bool isListed(std::string_view list, const char *name) {
  const std::string_view wanted(name, std::strlen(name) + 1);
  for (std::size_t at = list.find(wanted); at != std::string_view::npos; at = list.find(wanted, at + 1))
    if (at == 0 || list[at - 1] == '\0') return true;
  return false;
}

// An empty value removes the attribute.
int writeAttribute(const std::string &path, const char *name, const std::string &value) {
  if (!value.empty()) return ::lsetxattr(path.c_str(), name, value.data(), value.size(), 0) == 0 ? 0 : errno;
  return ::lremovexattr(path.c_str(), name) == 0 || errno == ENODATA ? 0 : errno;
}

bool takeDigits(std::string_view *text, std::size_t count, std::int64_t *number) {
  if (text->size() < count) return false;
  *number = 0;
  for (std::size_t at = 0; at < count; ++at) {
    const char digit = (*text)[at];
    if (digit < '0' || digit > '9') return false;
    *number = *number * 10 + (digit - '0');
  }
  text->remove_prefix(count);
  return true;
}

bool takeCharacter(std::string_view *text, char character) {
  if (text->empty() || text->front() != character) return false;
  text->remove_prefix(1);
  return true;
}

// ".123456789", of which any number of digits may be there.
bool takeFraction(std::string_view *text, std::int64_t *nanoseconds) {
  *nanoseconds = 0;
  if (!takeCharacter(text, '.')) return true;
  std::int64_t unit = kSecond;
  while (!text->empty() && text->front() >= '0' && text->front() <= '9') {
    unit /= 10;
    *nanoseconds += (text->front() - '0') * unit;
    text->remove_prefix(1);
  }
  return unit != kSecond;
}

}  // namespace

QVItemMetadata QVItemMetadataChange::appliedTo(QVItemMetadata metadata) const {
  if (tags) metadata.tags = *tags;
  if (lastUsed) metadata.lastUsed = *lastUsed;
  if (favoriteRank) metadata.favoriteRank = *favoriteRank;
  return metadata;
}

NSError QVNormalizeTagNames(std::vector<std::string> *names) {
  std::vector<std::string> kept;
  for (const std::string &given : *names) {
    std::string name(withoutBlanks(given));
    if (const NSError error = checkTagName(name)) return error;
    if (!name.empty() && std::find(kept.begin(), kept.end(), name) == kept.end())
      kept.push_back(std::move(name));
  }
  if (kept.size() > QVMostTags)
    return qvc_error(QVErrorInvalidArgument, std::to_string(kept.size()) +
                                                 " tags are too many for one item; it can have " +
                                                 std::to_string(QVMostTags));
  *names = std::move(kept);
  return NSError();
}

std::string QVEncodeTagNames(const std::vector<std::string> &names) {
  std::string text;
  for (const std::string &name : names) {
    if (!text.empty()) text += ',';
    text += name;
  }
  return text;
}

std::vector<std::string> QVDecodeTagNames(std::string_view text) {
  std::vector<std::string> names;
  while (!text.empty() && names.size() < QVMostTags) {
    const std::size_t comma = std::min(text.find(','), text.size());
    std::string name(withoutBlanks(text.substr(0, comma)));
    text.remove_prefix(std::min(comma + 1, text.size()));
    if (name.empty() || checkTagName(name)) continue;
    if (std::find(names.begin(), names.end(), name) == names.end()) names.push_back(std::move(name));
  }
  return names;
}

std::string QVEncodeLastUsed(std::int64_t nanoseconds) {
  if (nanoseconds == 0) return {};
  std::int64_t seconds = nanoseconds / kSecond;
  std::int64_t rest = nanoseconds % kSecond;
  if (rest < 0) {
    --seconds;
    rest += kSecond;
  }
  const std::time_t time = seconds;
  std::tm parts{};
  ::gmtime_r(&time, &parts);
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%04d-%02d-%02dT%02d:%02d:%02d.%09lldZ", parts.tm_year + 1900,
                parts.tm_mon + 1, parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec,
                static_cast<long long>(rest));
  return text.data();
}

std::int64_t QVDecodeLastUsed(std::string_view text) {
  text = withoutBlanks(text);
  std::int64_t year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0, fraction = 0;
  const bool isDate = takeDigits(&text, 4, &year) && takeCharacter(&text, '-') &&
                      takeDigits(&text, 2, &month) && takeCharacter(&text, '-') && takeDigits(&text, 2, &day);
  if (!isDate || month < 1 || month > 12 || day < 1 || day > 31) return 0;
  if (!takeCharacter(&text, 'T') && !takeCharacter(&text, ' ')) return 0;
  const bool isTime = takeDigits(&text, 2, &hour) && takeCharacter(&text, ':') &&
                      takeDigits(&text, 2, &minute) && takeCharacter(&text, ':') &&
                      takeDigits(&text, 2, &second) && takeFraction(&text, &fraction) &&
                      takeCharacter(&text, 'Z') && text.empty();
  // What nanoseconds can count: 1677-09-22 to 2262-04-10.
  if (!isTime || hour > 23 || minute > 59 || second > 60 || year < 1678 || year > 2261) return 0;
  std::tm parts{};
  parts.tm_year = static_cast<int>(year) - 1900;
  parts.tm_mon = static_cast<int>(month) - 1;
  parts.tm_mday = static_cast<int>(day);
  parts.tm_hour = static_cast<int>(hour);
  parts.tm_min = static_cast<int>(minute);
  parts.tm_sec = static_cast<int>(second);
  return static_cast<std::int64_t>(::timegm(&parts)) * kSecond + fraction;
}

std::uint64_t QVDecodeFavoriteRank(std::string_view text) {
  text = withoutBlanks(text);
  std::uint64_t rank = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), rank);
  return error == std::errc() && end == text.data() + text.size() ? rank : 0;
}

NSData QVTagDataOfNames(const std::vector<std::string> &names) {
  std::vector<FPTag> tags;
  tags.reserve(names.size());
  for (const std::string &name : names) tags.push_back({name, 0});
  return FPGetTagsDataFromTags(tags);
}

int QVReadItemAttributes(const std::string &path, QVItemMetadata *metadata, const char *other,
                         bool *hasOther) {
  *metadata = {};
  std::array<char, 4096> names;
  const ssize_t length = ::llistxattr(path.c_str(), names.data(), names.size());
  if (length < 0 && errno != ERANGE) return errno;
  const bool isPartial = length < 0;  // too many to tell: each is asked for
  const std::string_view list(names.data(), isPartial ? 0 : static_cast<std::size_t>(length));
  const auto has = [&](const char *name) { return isPartial || isListed(list, name); };
  const auto text = [&](const char *name) { return has(name) ? readAttribute(path, name) : std::string(); };
  metadata->tags = QVDecodeTagNames(text(QVTagsAttribute));
  metadata->lastUsed = QVDecodeLastUsed(text(QVLastUsedAttribute));
  metadata->favoriteRank = QVDecodeFavoriteRank(text(QVFavoriteRankAttribute));
  if (hasOther) *hasOther = has(other);
  return 0;
}

bool QVKeepsItemAttributes(const std::string &path) {
  struct stat status {};
  if (::lstat(path.c_str(), &status) != 0 || S_ISLNK(status.st_mode)) return false;
  char byte;
  return ::lgetxattr(path.c_str(), QVTagsAttribute, &byte, 0) >= 0 || errno == ENODATA;
}

int QVWriteItemAttributes(const std::string &path, const QVItemMetadataChange &change) {
  struct stat status {};
  if (::lstat(path.c_str(), &status) != 0) return errno;
  if (S_ISLNK(status.st_mode)) return ENOTSUP;
  int error = 0;
  if (change.tags) error = writeAttribute(path, QVTagsAttribute, QVEncodeTagNames(*change.tags));
  if (error == 0 && change.lastUsed)
    error = writeAttribute(path, QVLastUsedAttribute, QVEncodeLastUsed(*change.lastUsed));
  if (error == 0 && change.favoriteRank)
    error = writeAttribute(path, QVFavoriteRankAttribute,
                           *change.favoriteRank == 0 ? std::string() : std::to_string(*change.favoriteRank));
  return error;
}

}  // namespace droxa
