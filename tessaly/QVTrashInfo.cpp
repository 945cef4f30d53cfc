#include "tessaly/QVTrashInfo.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <ctime>

namespace droxa {

namespace {

constexpr std::string_view kGroup = "[Trash Info]";
constexpr std::string_view kPathKey = "Path";
constexpr std::string_view kDateKey = "DeletionDate";
constexpr std::string_view kFolderKey = "X-Droxa-Folder";
constexpr std::string_view kFolderInodeKey = "X-Droxa-Folder-Inode";

bool isPlain(char byte) {
  return (byte >= 'a' && byte <= 'z') || (byte >= 'A' && byte <= 'Z') || (byte >= '0' && byte <= '9') ||
         std::string_view("-_.~/").find(byte) != std::string_view::npos;
}

std::string percentEncoded(std::string_view bytes) {
  constexpr char kDigits[] = "0123456789ABCDEF";
  std::string text;
  for (const char byte : bytes) {
    if (isPlain(byte)) {
      text += byte;
      continue;
    }
    const auto value = static_cast<unsigned char>(byte);
    text += '%';
    text += kDigits[value >> 4];
    text += kDigits[value & 15];
  }
  return text;
}

int hexDigit(char digit) {
  if (digit >= '0' && digit <= '9') return digit - '0';
  if (digit >= 'a' && digit <= 'f') return digit - 'a' + 10;
  if (digit >= 'A' && digit <= 'F') return digit - 'A' + 10;
  return -1;
}

// nullopt for a broken escape.
std::optional<std::string> percentDecoded(std::string_view text) {
  std::string bytes;
  for (std::size_t at = 0; at < text.size(); ++at) {
    if (text[at] != '%') {
      bytes += text[at];
      continue;
    }
    const int high = at + 2 < text.size() ? hexDigit(text[at + 1]) : -1;
    const int low = at + 2 < text.size() ? hexDigit(text[at + 2]) : -1;
    if (high < 0 || low < 0) return std::nullopt;
    bytes += static_cast<char>(high * 16 + low);
    at += 2;
  }
  return bytes;
}

bool isUsablePath(std::string_view path) {
  if (path.size() < 2 || path.front() != '/' || path.back() == '/' ||
      path.find('\0') != std::string_view::npos)
    return false;
  for (std::size_t at = 1; at <= path.size();) {
    const std::size_t slash = std::min(path.find('/', at), path.size());
    const std::string_view name = path.substr(at, slash - at);
    if (name.empty() || name == "." || name == "..") return false;
    at = slash + 1;
  }
  return true;
}

std::string_view trimmed(std::string_view text) {
  const auto isBlank = [](char byte) { return byte == ' ' || byte == '\t' || byte == '\r'; };
  while (!text.empty() && isBlank(text.front())) text.remove_prefix(1);
  while (!text.empty() && isBlank(text.back())) text.remove_suffix(1);
  return text;
}

void takeValue(std::string_view key, std::string_view value, QVTrashInfo *info) {
  if (key == kDateKey && info->deletionDate.empty()) info->deletionDate = value;
  if (key == kFolderKey && !info->folder) {
    const auto folder = QVFileObjectID::fileObjectIDWithString(std::string(value));
    if (folder && folder->isFolderOrAliasID()) info->folder = folder;
  }
  if (key == kFolderInodeKey && info->folderInode == 0)
    std::from_chars(value.data(), value.data() + value.size(), info->folderInode);
}

}  // namespace

std::string QVEncodeTrashInfo(const QVTrashInfo &info) {
  std::string text = std::string(kGroup) + "\nPath=" + percentEncoded(info.path) +
                     "\nDeletionDate=" + info.deletionDate + "\n";
  if (info.folder) {
    text += std::string(kFolderKey) + "=" + info.folder->asString() + "\n";
    text += std::string(kFolderInodeKey) + "=" + std::to_string(info.folderInode) + "\n";
  }
  return text;
}

std::optional<QVTrashInfo> QVParseTrashInfo(std::string_view text) {
  QVTrashInfo info;
  bool isInGroup = false, hasPath = false;
  while (!text.empty()) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = trimmed(text.substr(0, end));
    text.remove_prefix(std::min(end + 1, text.size()));
    if (line.empty() || line.front() == '#') continue;
    if (line.front() == '[') {
      if (isInGroup) break;  // what follows isn't about the trash
      isInGroup = line == kGroup;
      continue;
    }
    const std::size_t sign = line.find('=');
    if (!isInGroup || sign == std::string_view::npos) continue;
    const std::string_view key = trimmed(line.substr(0, sign));
    const std::string_view value = trimmed(line.substr(sign + 1));
    if (key != kPathKey) {
      takeValue(key, value, &info);
      continue;
    }
    if (hasPath) continue;  // the first one counts
    const auto path = percentDecoded(value);
    if (!path || !isUsablePath(*path)) return std::nullopt;
    info.path = *path;
    hasPath = true;
  }
  return hasPath ? std::optional(info) : std::nullopt;
}

std::string QVTrashDateNow() {
  const std::time_t now = std::time(nullptr);
  std::tm parts{};
  ::localtime_r(&now, &parts);
  std::array<char, 32> text{};
  std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &parts);
  return text.data();
}

}  // namespace droxa
