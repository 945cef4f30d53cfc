#include "platform/foundation/NSURLResources.h"

#include <algorithm>
#include <cerrno>
#include <memory>
#include <optional>
#include <set>
#include <sys/stat.h>
#include <sys/xattr.h>

#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/Paths.h"
#include "platform/foundation/ReadFile.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

namespace {

using Extensions = std::set<std::string>;

constexpr char kPackageAttribute[] = "user.droxa.package";
constexpr std::size_t kLargestExtensionsFile = 64U << 10;

std::string inLowerCase(std::string text) {
  for (char &c : text)
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  return text;
}

Extensions readExtensions() {
  const FileContents file =
      ReadFile(DroxaProcessHome().configuration() + "/package-extensions", kLargestExtensionsFile);
  if (file.code != 0) return {"bundle", "odpkg", "rtfd", "sparsebundle"};
  Extensions extensions;
  for (std::size_t start = 0; start < file.bytes.size();) {
    const std::size_t end = std::min(file.bytes.find('\n', start), file.bytes.size());
    std::string line = file.bytes.substr(start, end - start);
    start = end + 1;
    line.erase(std::min(line.find('#'), line.size()));
    std::erase_if(line, [](char c) { return c == ' ' || c == '\t' || c == '\r'; });
    if (!line.empty() && line[0] == '.') line.erase(0, 1);
    if (!line.empty()) extensions.insert(inLowerCase(line));
  }
  return extensions;
}

// The list, kept once it has been read.
struct ExtensionsCache {
  Mutex mutex;
  std::optional<Extensions> extensions GUARDED_BY(mutex);
};

ExtensionsCache &cache() {
  static ExtensionsCache &made = *new ExtensionsCache;
  return made;
}

bool isPackageExtension(const std::string &extension) {
  const Lock lock(cache().mutex);
  if (!cache().extensions) cache().extensions = readExtensions();
  return cache().extensions->count(inLowerCase(extension)) != 0;
}

bool hasPackageName(const std::string &name) {
  const std::size_t dot = name.rfind('.');
  return dot != std::string::npos && dot != 0 && isPackageExtension(name.substr(dot + 1));
}

bool hasPackageAttribute(const std::string &path) {
  return lgetxattr(path.c_str(), kPackageAttribute, nullptr, 0) >= 0;
}

// Whether there is something at the URL.
bool look(const NSURL &url, struct stat *status, NSError *error) {
  const int code = !url.isFileURL() ? EINVAL : lstat(url.path().c_str(), status) == 0 ? 0 : errno;
  if (code != 0 && error)
    *error = NSError(NSCocoaErrorDomain, NSFileReadNoSuchFileError,
                     {{NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(code, url.path())}});
  return code == 0;
}

}  // namespace

bool checkResourceIsReachableAndReturnError(const NSURL &url, NSError *error) {
  struct stat status {};
  if (!look(url, &status, error)) return false;
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  if (!S_ISREG(status.st_mode) || !provider || !provider->isDataless(url)) return true;
  if (error)
    *error = NSError(NSCocoaErrorDomain, NSFileReadNoSuchFileError,
                     {{NSLocalizedDescriptionKey, "the contents of " + url.path() + " aren't here"}});
  return false;
}

bool getResourceValue(const NSURL &url, bool *value, const std::string &key, NSError *error) {
  // A document that a promise stands for has no file of its own, and can be shared all the same.
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  if (key == NSURLUbiquitousItemIsSharedKey && provider) return provider->isShared(url, value, error);
  struct stat status {};
  if (!look(url, &status, error)) return false;
  const bool isDirectory = S_ISDIR(status.st_mode);
  if (key == NSURLIsDirectoryKey) {
    *value = isDirectory;
  } else if (key == NSURLIsPackageKey) {
    *value = isDirectory && (hasPackageAttribute(url.path()) || hasPackageName(url.lastPathComponent()));
  } else if (key == NSURLIsAliasFileKey) {
    *value = S_ISLNK(status.st_mode);
  } else if (key == NSURLUbiquitousItemIsSharedKey) {
    *value = false;
  } else {
    if (error) *error = NSError::errorWithPOSIXCode(EINVAL, "there is no resource value " + key);
    return false;
  }
  return true;
}

// Most dataless documents have their own file; what a promise stands for is a plain document.
bool getPromisedItemResourceValue(const NSURL &url, bool *value, const std::string &key, NSError *error) {
  NSError problem;
  if (getResourceValue(url, value, key, &problem)) return true;
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  const bool isKnown = key == NSURLIsDirectoryKey || key == NSURLIsPackageKey || key == NSURLIsAliasFileKey;
  struct stat status {};
  if (isKnown && provider && look(provider->physicalURLForURL(url), &status, nullptr)) {
    *value = false;
    return true;
  }
  if (error) *error = problem;
  return false;
}

void NSURLForgetPackageExtensions() {
  const Lock lock(cache().mutex);
  cache().extensions.reset();
}

}  // namespace droxa
