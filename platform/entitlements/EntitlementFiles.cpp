#include "platform/entitlements/EntitlementFiles.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <iterator>
#include <nlohmann/json.hpp>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/foundation/ThreadSafety.h"
#include "platform/oslog/os_log.h"

namespace droxa {
namespace {

using Json = nlohmann::json;

constexpr char SystemFolder[] = "/etc/droxa/entitlements.d";
constexpr std::size_t LargestFile = 1U << 20;

os_log_t EntitlementsLog() {
  static const os_log_t log = os_log_create("com.quorva.droxa", "entitlements");
  return log;
}

struct ProcessFiles {
  Mutex mutex;
  EntitlementFiles files GUARDED_BY(mutex) = EntitlementFiles(SystemFolder, 0);
};

ProcessFiles &OfProcess() {
  static ProcessFiles &made = *new ProcessFiles;
  return made;
}

// A descriptor that is closed at the end of the scope.
class Opened {
 public:
  explicit Opened(int descriptor) : descriptor_(descriptor) {}
  Opened(const Opened &) = delete;
  Opened &operator=(const Opened &) = delete;
  ~Opened() {
    if (descriptor_ >= 0) close(descriptor_);
  }
  int get() const { return descriptor_; }

 private:
  const int descriptor_;
};

// Why what is open there may not be trusted; "" when it may.
std::string Distrust(int descriptor, uid_t owner, bool isFolder) {
  struct stat status {};
  if (fstat(descriptor, &status) != 0) return std::strerror(errno);
  if (isFolder ? !S_ISDIR(status.st_mode) : !S_ISREG(status.st_mode))
    return isFolder ? "it isn't a folder" : "it isn't a file";
  if (status.st_uid != owner)
    return "it belongs to user " + std::to_string(status.st_uid) + ", not to user " + std::to_string(owner);
  if (status.st_mode & (S_IWGRP | S_IWOTH)) return "others than its owner can write it";
  return isFolder || static_cast<std::size_t>(status.st_size) <= LargestFile ? "" : "it is larger than 1 MiB";
}

// "" and the problem in `why`, when it can't be read.
std::string ReadAll(int descriptor, std::string *why) {
  std::string bytes;
  char buffer[4096];
  while (bytes.size() <= LargestFile) {
    const ssize_t count = read(descriptor, buffer, sizeof buffer);
    if (count == 0) return bytes;
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) {
      *why = std::strerror(errno);
      return {};
    }
    bytes.append(buffer, static_cast<std::size_t>(count));
  }
  *why = "it is larger than 1 MiB";
  return {};
}

// nullptr unless the value is a text that isn't empty.
const std::string *TextOf(const Json &object, const char *key) {
  const auto found = object.find(key);
  const auto *text = found == object.end() ? nullptr : found->get_ptr<const std::string *>();
  return text && !text->empty() ? text : nullptr;
}

// Why the value isn't one; "" when it was read.
std::string ReadValue(const Json &value, const std::string &name, EntitlementValue *read) {
  if (value.is_boolean() && value.get<bool>()) {
    *read = true;
    return {};
  }
  if (const auto *text = value.get_ptr<const std::string *>(); text && !text->empty()) {
    *read = *text;
    return {};
  }
  std::vector<std::string> texts;
  if (value.is_array()) {
    for (const Json &element : value)
      if (const auto *text = element.get_ptr<const std::string *>(); text && !text->empty())
        texts.push_back(*text);
  }
  if (!value.is_array() || texts.size() != value.size())
    return "the value of \"" + name + "\" is neither true nor a text nor a list of texts";
  *read = std::move(texts);
  return {};
}

std::string ReadEntitlements(const Json &entry, EntitlementGrant *grant) {
  const auto list = entry.find("entitlements");
  const auto values = entry.find("values");
  if (list == entry.end() ? values == entry.end() : !list->is_array())
    return "an application needs \"entitlements\", a list";
  if (values != entry.end() && !values->is_object()) return "\"values\" of an application isn't an object";
  if (list != entry.end()) {
    for (const Json &name : *list) {
      const auto *text = name.get_ptr<const std::string *>();
      if (!text || text->empty()) return "an entitlement of " + grant->application + " isn't a text";
      grant->entitlements.push_back(*text);
    }
  }
  if (values == entry.end()) return {};
  for (const auto &[name, value] : values->items()) {
    const std::string why = ReadValue(value, name, &grant->values[name]);
    if (!why.empty()) return why;
  }
  return {};
}

// Why the entry makes no grant; "" when it made one.
std::string ReadEntry(const Json &entry, EntitlementGrant *grant) {
  if (!entry.is_object()) return "an application isn't an object";
  const std::string *flatpak = TextOf(entry, "flatpak");
  const std::string *executable = TextOf(entry, "executable");
  if ((flatpak != nullptr) == (executable != nullptr))
    return "an application needs either \"flatpak\" or \"executable\", a text";
  if (executable && executable->front() != '/')
    return "the executable \"" + *executable + "\" isn't an absolute path";
  grant->kind = flatpak ? EntitlementGrant::Kind::flatpak : EntitlementGrant::Kind::executable;
  grant->application = flatpak ? *flatpak : *executable;
  return ReadEntitlements(entry, grant);
}

std::string ReadGrants(const std::string &bytes, const std::string &file,
                       std::vector<EntitlementGrant> *grants) {
  const Json document = Json::parse(bytes, nullptr, false);
  if (document.is_discarded()) return "it isn't JSON";
  const auto list = document.is_object() ? document.find("applications") : document.end();
  if (!document.is_object() || list == document.end() || !list->is_array())
    return "it needs \"applications\", a list";
  for (const Json &entry : *list) {
    EntitlementGrant grant;
    grant.file = file;
    const std::string why = ReadEntry(entry, &grant);
    if (!why.empty()) return why;
    grants->push_back(std::move(grant));
  }
  return {};
}

std::string ReadFileAt(int folder, const std::string &name, const std::string &path, uid_t owner,
                       std::vector<EntitlementGrant> *grants) {
  const Opened file(openat(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (file.get() < 0) return errno == ELOOP ? "it is a symbolic link" : std::strerror(errno);
  std::string why = Distrust(file.get(), owner, false);
  if (!why.empty()) return why;
  const std::string bytes = ReadAll(file.get(), &why);
  if (!why.empty()) return why;
  return ReadGrants(bytes, path, grants);
}

// Those that end in ".json", sorted.
std::vector<std::string> NamesIn(int folder) {
  std::vector<std::string> names;
  DIR *const listing = fdopendir(fcntl(folder, F_DUPFD_CLOEXEC, 0));
  if (!listing) return names;
  constexpr std::string_view ending = ".json";
  while (const dirent *entry = readdir(listing)) {
    const std::string_view name = entry->d_name;
    if (name.size() > ending.size() && name[0] != '.' && name.ends_with(ending)) names.emplace_back(name);
  }
  closedir(listing);
  std::sort(names.begin(), names.end());
  return names;
}

}  // namespace

EntitlementFiles::EntitlementFiles(std::string folder, uid_t owner)
    : folder_(std::move(folder)), owner_(owner) {}

EntitlementFiles EntitlementFiles::processFiles() {
  const Lock lock(OfProcess().mutex);
  return OfProcess().files;
}

void EntitlementFiles::setProcessFiles(const EntitlementFiles &files) {
  const Lock lock(OfProcess().mutex);
  OfProcess().files = files;
}

EntitlementGrants EntitlementFiles::read() const {
  EntitlementGrants result;
  const auto ignore = [&result](const std::string &file, const std::string &why) {
    if (why.empty()) return;
    os_log_error(EntitlementsLog(), "[ERROR] ignoring %s: %s", file, why);
    result.problems.push_back({file, why});
  };
  const Opened folder(open(folder_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (folder.get() < 0) {
    if (errno != ENOENT) ignore(folder_, std::strerror(errno));
    return result;
  }
  const std::string why = Distrust(folder.get(), owner_, true);
  if (!why.empty()) {
    ignore(folder_, why);
    return result;
  }
  for (const std::string &name : NamesIn(folder.get())) {
    const std::string path = folder_ + "/" + name;
    std::vector<EntitlementGrant> grants;  // of a file that is wrong in one place, none counts
    const std::string problem = ReadFileAt(folder.get(), name, path, owner_, &grants);
    if (problem.empty()) std::move(grants.begin(), grants.end(), std::back_inserter(result.grants));
    ignore(path, problem);
  }
  return result;
}

}  // namespace droxa
