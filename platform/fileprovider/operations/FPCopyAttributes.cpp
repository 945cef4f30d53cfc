#include <cerrno>
#include <optional>
#include <string_view>
#include <sys/xattr.h>
#include <vector>

#include "platform/fileprovider/operations/FPCopy.h"
#include "platform/oslog/os_log.h"

namespace droxa {
namespace {

bool IsCopied(std::string_view name, FPCopyPurpose purpose) {
  if (name.starts_with("user.droxa.")) return purpose == FPCopyPurpose::move;
  // The others are the system's own, and not ours to give.
  return name.starts_with("user.") || name.starts_with("system.posix_acl_");
}

std::vector<std::string> Names(int file) {
  std::vector<std::string> names;
  const ssize_t length = flistxattr(file, nullptr, 0);
  if (length <= 0) return names;
  std::string list(static_cast<std::size_t>(length) + 4096, '\0');
  const ssize_t got = flistxattr(file, list.data(), list.size());
  if (got <= 0) return names;
  list.resize(static_cast<std::size_t>(got));
  for (std::size_t start = 0; start < list.size(); start = list.find('\0', start) + 1) {
    names.emplace_back(list.c_str() + start);
  }
  return names;
}

// None when it has gone meanwhile.
std::optional<std::vector<char>> Value(int file, const std::string &name) {
  std::vector<char> value(65'536);
  const ssize_t length = fgetxattr(file, name.c_str(), value.data(), value.size());
  if (length < 0) return std::nullopt;
  value.resize(static_cast<std::size_t>(length));
  return value;
}

}  // namespace

int FPCopyAttributes(int source, int destination, FPCopyPurpose purpose, std::string *attribute) {
  static const os_log_t log = os_log_create("com.droxa.fileprovider", "operations");
  for (const std::string &name : Names(source)) {
    if (!IsCopied(name, purpose)) continue;
    const auto value = Value(source, name);
    if (!value || fsetxattr(destination, name.c_str(), value->data(), value->size(), 0) == 0) continue;
    if (errno == EOPNOTSUPP || !name.starts_with("user.")) {
      os_log_debug(log, "[DEBUG] the attribute %s can't be kept there", name.c_str());
      continue;
    }
    *attribute = name;
    return errno;
  }
  return 0;
}

}  // namespace droxa
