#include "platform/imaging/DesktopThumbnails.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <openssl/evp.h>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/ReadFile.h"
#include "platform/foundation/UUID.h"

namespace droxa {
namespace {

struct Size {
  const char *name;
  std::uint32_t side;
};
constexpr std::array<Size, 4> kSizes{{{"normal", 128}, {"large", 256}, {"x-large", 512}, {"xx-large", 1024}}};
constexpr char kURI[] = "Thumb::URI";
constexpr char kModified[] = "Thumb::MTime";
constexpr char kSize[] = "Thumb::Size";

std::string MD5Of(const std::string &text) {
  std::array<unsigned char, EVP_MAX_MD_SIZE> digest{};
  unsigned length = 0;
  EVP_Digest(text.data(), text.size(), digest.data(), &length, EVP_md5(), nullptr);
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string hex;
  for (unsigned i = 0; i < length; ++i) {
    hex += kDigits[digest[i] >> 4];
    hex += kDigits[digest[i] & 15];
  }
  return hex;
}

NSError MakeFolder(const std::string &path) {
  return mkdir(path.c_str(), 0700) == 0 || errno == EEXIST ? NSError()
                                                           : NSError::errorWithPOSIXCode(errno, path);
}

NSError WriteAll(int file, const NSData &data) {
  auto bytes = data.bytes();
  while (!bytes.empty()) {
    const ssize_t count = write(file, bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return NSError::errorWithPOSIXCode(errno);
    bytes = bytes.subspan(static_cast<std::size_t>(count));
  }
  return {};
}

// The cache may be thrown away at any time, so nothing waits for the disk.
NSError WriteWhole(const std::string &path, const NSData &data) {
  const std::string made = path + "." + UUID::generate().description();
  const int file = open(made.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
  if (file < 0) return NSError::errorWithPOSIXCode(errno, made);
  NSError error = WriteAll(file, data);
  if (close(file) != 0 && !error) error = NSError::errorWithPOSIXCode(errno, made);
  if (!error && std::rename(made.c_str(), path.c_str()) != 0)
    error = NSError::errorWithPOSIXCode(errno, path);
  if (error) unlink(made.c_str());
  return error;
}

}  // namespace

std::string DesktopThumbnails::userFolder() {
  const char *configured = std::getenv("XDG_CACHE_HOME");
  const bool isAbsolute = configured && configured[0] == '/';
  return (isAbsolute ? std::string(configured) : NSHomeDirectory() + "/.cache") + "/thumbnails";
}

std::string DesktopThumbnails::URIForPath(const std::string &path) {
  constexpr std::string_view kPlain = "-_.!~*'()/&=:@+$,";
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  std::string uri = "file://";
  for (const char character : path) {
    const auto byte = static_cast<unsigned char>(character);
    const bool isLetter = (byte >= 'a' && byte <= 'z') || (byte >= 'A' && byte <= 'Z');
    const bool isDigit = byte >= '0' && byte <= '9';
    if (isLetter || isDigit || kPlain.find(character) != std::string_view::npos) {
      uri += character;
    } else {
      uri += '%';
      uri += kDigits[byte >> 4];
      uri += kDigits[byte & 15];
    }
  }
  return uri;
}

std::string DesktopThumbnails::fileFor(const std::string &path, const std::string &sizeName) const {
  return folder_ + "/" + sizeName + "/" + MD5Of(URIForPath(path)) + ".png";
}

bool DesktopThumbnails::isValid(const std::string &file, const DesktopThumbnailSubject &subject) const {
  const FileContents contents = ReadFile(file, PNGImage::kMostBytes);
  return contents.code == 0 && PNGTextOf(contents.bytes, kURI) == URIForPath(subject.path) &&
         PNGTextOf(contents.bytes, kModified) == std::to_string(subject.modifiedSeconds);
}

bool DesktopThumbnails::hasAll(const DesktopThumbnailSubject &subject) const {
  for (const Size &size : kSizes)
    if (!isValid(fileFor(subject.path, size.name), subject)) return false;
  return true;
}

NSError DesktopThumbnails::store(const DesktopThumbnailSubject &subject, const PNGImage &picture) const {
  const std::string cache = folder_.substr(0, folder_.rfind('/'));
  for (const std::string &folder : {cache, folder_})
    if (NSError error = MakeFolder(folder)) return error;
  const PNGTexts texts{{kURI, URIForPath(subject.path)},
                       {kModified, std::to_string(subject.modifiedSeconds)},
                       {kSize, std::to_string(subject.size)}};
  for (const Size &size : kSizes) {
    const std::string file = fileFor(subject.path, size.name);
    if (isValid(file, subject)) continue;
    if (NSError error = MakeFolder(folder_ + "/" + size.name)) return error;
    if (NSError error = WriteWhole(file, picture.scaledToFit(size.side).file(texts))) return error;
  }
  return {};
}

}  // namespace droxa
