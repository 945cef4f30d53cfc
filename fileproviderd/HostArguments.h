#pragma once

#include <optional>
#include <string>
#include <vector>

namespace droxa {

// What the host's program is started with.
struct HostArguments {
  std::optional<std::string> home;
  std::optional<std::string> extension;
  bool wantsHelp = false;

  // nullopt, with `problem` naming the argument, for what makes no sense.
  static std::optional<HostArguments> parse(const std::vector<std::string> &arguments, std::string *problem);
};

}  // namespace droxa
