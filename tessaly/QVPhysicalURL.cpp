#include "tessaly/QVPhysicalURL.h"

#include <array>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace droxa {

namespace {

constexpr std::string_view kPrefix = ".";
constexpr std::string_view kSuffix = ".droxafault";
constexpr std::string_view kFirstLine = "droxa promise 1\n";
constexpr std::size_t kLongestName = 255;
constexpr std::size_t kHashDigits = 16;
constexpr std::size_t kLongestPromise = 4096;

bool isRegularFile(const std::string &path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

// The part between prefix and suffix of a shortened promise's name; empty for any other name.
std::string_view shortenedMiddle(std::string_view name) {
  if (name.size() <= kPrefix.size() + kSuffix.size() || name.substr(0, kPrefix.size()) != kPrefix ||
      name.substr(name.size() - kSuffix.size()) != kSuffix)
    return {};
  const auto middle = name.substr(kPrefix.size(), name.size() - kPrefix.size() - kSuffix.size());
  return QVIsShortenedPromiseName(middle) ? middle : std::string_view();
}

bool promises(const std::string &path, const std::string &name) {
  const int file = ::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) return false;
  std::array<char, kLongestPromise> bytes;
  const ssize_t length = isRegularFile(path) ? ::read(file, bytes.data(), bytes.size()) : -1;
  ::close(file);
  return length > 0 &&
         QVNameInPromise(std::string_view(bytes.data(), static_cast<std::size_t>(length))) == name;
}

// Looks through the folder, since the name of a long name's promise is a shortened one.
std::string shortenedPromise(const std::string &folder, const std::string &name) {
  DIR *stream = ::opendir(folder.c_str());
  if (!stream) return {};
  std::string found;
  while (const struct dirent *entry = ::readdir(stream)) {
    const std::string_view middle = shortenedMiddle(entry->d_name);
    const std::string_view beginning = middle.substr(0, middle.size() - kHashDigits - 1);
    if (middle.empty() || beginning != std::string_view(name).substr(0, beginning.size())) continue;
    const std::string path = folder + "/" + entry->d_name;
    if (!promises(path, name)) continue;
    found = path;
    break;
  }
  ::closedir(stream);
  return found;
}

}  // namespace

bool QVIsShortenedPromiseName(std::string_view middle) {
  if (middle.size() <= kHashDigits || middle[middle.size() - kHashDigits - 1] != '~') return false;
  return middle.find_first_not_of("0123456789abcdef", middle.size() - kHashDigits) == std::string_view::npos;
}

std::optional<std::string> QVPromiseNameForName(std::string_view name) {
  if (name.size() + kPrefix.size() + kSuffix.size() > kLongestName || QVIsShortenedPromiseName(name))
    return std::nullopt;
  return std::string(kPrefix) + std::string(name) + std::string(kSuffix);
}

// Four lines come before it: what it is, the mode, the date, the marker.
std::optional<std::string> QVNameInPromise(std::string_view text) {
  if (text.substr(0, kFirstLine.size()) != kFirstLine) return std::nullopt;
  for (int line = 0; line < 4; ++line) {
    const std::size_t end = text.find('\n');
    if (end == std::string_view::npos) return std::nullopt;
    text.remove_prefix(end + 1);
  }
  return std::string(text);
}

NSURL QVPhysicalURL(const NSURL &url) {
  if (!url.isFileURL()) return url;
  struct stat status {};
  if (::lstat(url.path().c_str(), &status) == 0 || errno != ENOENT) return url;
  const std::string name = url.lastPathComponent();
  const NSURL folder = url.URLByDeletingLastPathComponent();
  if (const auto promise = QVPromiseNameForName(name)) {
    const NSURL physical = folder.URLByAppendingPathComponent(*promise);
    return isRegularFile(physical.path()) ? physical : url;
  }
  const std::string found = shortenedPromise(folder.path(), name);
  return found.empty() ? url : NSURL::fileURLWithPath(found);
}

}  // namespace droxa
