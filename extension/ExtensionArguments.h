#pragma once

#include <optional>
#include <string>
#include <vector>

namespace droxa {

// What the host starts the extension's program with.
struct ExtensionArguments {
  std::optional<std::string> home;
  int hostDescriptor = -1;  // a connected socket to the host
  bool wantsHelp = false;

  // nullopt, with `problem` naming the argument and what is wrong with it. The descriptor is checked to be a
  // socket.
  static std::optional<ExtensionArguments> parse(const std::vector<std::string> &arguments,
                                                 std::string *problem);
};

}  // namespace droxa
