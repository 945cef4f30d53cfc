#pragma once

#include <climits>
#include <filesystem>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "platform/entitlements/EntitlementFiles.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {

// Entitlement files of the test's own, which are the process's while this lives; their owner is the test's
// user.
class EntitledScope {
 public:
  EntitledScope() : before_(EntitlementFiles::processFiles()) {
    chmod(folder_.path().c_str(), 0755);
    EntitlementFiles::setProcessFiles(EntitlementFiles(folder_.path(), getuid()));
  }
  ~EntitledScope() { EntitlementFiles::setProcessFiles(before_); }
  EntitledScope(const EntitledScope &) = delete;
  EntitledScope &operator=(const EntitledScope &) = delete;

  const std::string &folder() const { return folder_.path(); }
  // Grants the program at `path` the entitlements, and nothing else to anybody.
  void grant(const std::string &path, const std::vector<std::string> &entitlements) const {
    std::string list;
    for (const std::string &name : entitlements) list += (list.empty() ? "\"" : ", \"") + name + "\"";
    write("grants.json",
          R"({"applications": [{"executable": ")" + path + R"(", "entitlements": [)" + list + "]}]}");
  }
  void write(const std::string &name, const std::string &text) const {
    folder_.write(name, text);
    chmod((folder_.path() + "/" + name).c_str(), 0644);
  }
  static std::string ownProgram() { return std::filesystem::read_symlink("/proc/thread-self/exe").string(); }

 private:
  const TemporaryFolder folder_;
  const EntitlementFiles before_;
};

}  // namespace droxa
