#pragma once

#include <map>
#include <string>
#include <sys/types.h>
#include <variant>
#include <vector>

#include "platform/foundation/NSError.h"

namespace droxa {

// What an entitlement may say beyond being granted: true, a text, or texts.
using EntitlementValue = std::variant<bool, std::string, std::vector<std::string>>;

// What one file grants one application.
struct EntitlementGrant {
  enum class Kind : bool { flatpak, executable };
  Kind kind = Kind::flatpak;
  std::string application;  // a Flatpak identifier, or an executable's absolute path
  std::vector<std::string> entitlements;
  std::map<std::string, EntitlementValue> values;
  std::string file;  // that says so
};

// A file that grants nothing, and why.
struct EntitlementProblem {
  std::string file;
  std::string why;
};

struct EntitlementGrants {
  std::vector<EntitlementGrant> grants;  // in the order of the files' names
  std::vector<EntitlementProblem> problems;
};

// Where the entitlements of applications are written down: files "*.json" of one folder,
//
//   {"applications": [
//     {"flatpak": "org.example.Writer", "entitlements": ["com.quorva.Tessaly.sharing-proxy"]},
//     {"executable": "/usr/bin/writer", "entitlements": ["com.quorva.Tessaly.sharing-proxy"],
//      "values": {"com.quorva.developer.droxa-container-identifiers": ["org.example.Writer"]}}]}
//
// An application has "entitlements", or "values" (each true, a text or texts), or both.
// Only what nobody but the owner can write counts: the folder, and each file in it, has to belong to `owner`
// and to be writable by it alone. Anything else, and a file that doesn't read as above, grants nothing; each
// is an error in the log. Files are read anew for every question, so a change holds from the next connection.
// Thread contract: immutable.
class EntitlementFiles {
 public:
  // The system's, /etc/droxa/entitlements.d of root's, unless a test has set others.
  static EntitlementFiles processFiles();
  static void setProcessFiles(const EntitlementFiles &files);

  EntitlementFiles(std::string folder, uid_t owner);
  const std::string &folder() const { return folder_; }
  uid_t owner() const { return owner_; }

  // What all files grant. A folder that doesn't exist grants nothing, and is no problem.
  EntitlementGrants read() const;

 private:
  std::string folder_;
  uid_t owner_;
};

}  // namespace droxa
