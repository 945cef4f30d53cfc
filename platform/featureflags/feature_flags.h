#pragma once

#include <string>
#include <string_view>

namespace droxa {

// Whether the feature `domain`/`name` is enabled: the file DOMAIN/NAME in the user's feature-flag folder,
// else in the system's. A file that is empty or says "1", "true", "yes" or "on" enables; "0", "false", "no",
// "off" disable; anything else counts as disabled. Any thread.
bool _os_feature_enabled_impl(std::string_view domain,
                              std::string_view name);  // NOLINT(bugprone-reserved-identifier)

// The folders that are looked into; "" stands for the default one: <configuration folder>/feature-flags and
// /etc/droxa/feature-flags.
void OSFeatureFlagsSetFolders(std::string userFolder, std::string systemFolder);

}  // namespace droxa
