#pragma once

#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>

#include "platform/entitlements/EntitlementFiles.h"

namespace droxa {

// Values by key. Thread contract: a value.
class LSPropertyList {
 public:
  LSPropertyList() = default;
  explicit LSPropertyList(std::map<std::string, EntitlementValue> values) : values_(std::move(values)) {}
  // nullptr: there is none.
  const EntitlementValue *objectForKey(const std::string &key) const {
    const auto found = values_.find(key);
    return found == values_.end() ? nullptr : &found->second;
  }

 private:
  std::map<std::string, EntitlementValue> values_;
};

// An installed application, as its desktop entry describes it. Its identifier is that of the entry
// ("org.example.Writer" of org.example.Writer.desktop), which for a Flatpak application is the application's
// own. Thread contract: immutable; made and asked on any thread, reads files.
class LSBundleProxy {
 public:
  // Null when no application of that identifier is installed.
  static std::shared_ptr<const LSBundleProxy> bundleProxyForIdentifier(const std::string &identifier);

  const std::string &bundleIdentifier() const { return identifier_; }
  const std::string &localizedName() const { return name_; }
  // The icon's name in the icon themes, or its file's absolute path; "": it has none.
  const std::string &iconName() const { return icon_; }
  const std::optional<std::string> &flatpak() const { return flatpak_; }
  const std::string &executable() const { return executable_; }  // its absolute path; "" when not found

  // What the entitlement files (platform/entitlements/) say of these keys for this application. A key without
  // a value isn't among them; an entitlement that is granted without a value is true.
  LSPropertyList entitlementValuesForKeys(const std::set<std::string> &keys) const;

 private:
  struct Passkey {};

 public:
  explicit LSBundleProxy(Passkey) {}

 private:
  bool isGranted(const EntitlementGrant &grant) const;

  std::string identifier_;
  std::string name_;
  std::string icon_;
  std::optional<std::string> flatpak_;
  std::string executable_;
};

}  // namespace droxa
