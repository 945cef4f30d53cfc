#include "fileproviderd/HostArguments.h"

namespace droxa {

std::optional<HostArguments> HostArguments::parse(const std::vector<std::string> &arguments,
                                                  std::string *problem) {
  HostArguments result;
  for (std::size_t index = 0; index < arguments.size(); ++index) {
    std::string name = arguments[index];
    std::optional<std::string> value;
    if (const std::size_t equals = name.find('='); name.starts_with("--") && equals != std::string::npos) {
      value = name.substr(equals + 1);
      name.resize(equals);
    }
    if ((name == "--help" || name == "-h") && !value) {
      result.wantsHelp = true;
      continue;
    }
    if (name != "--home" && name != "--extension") {
      *problem = "unknown argument " + arguments[index] + "; --help lists what there is";
      return std::nullopt;
    }
    if (!value && index + 1 < arguments.size()) value = arguments[++index];
    if (!value || value->empty()) {
      *problem = name + " needs a path";
      return std::nullopt;
    }
    (name == "--home" ? result.home : result.extension) = value;
  }
  return result;
}

}  // namespace droxa
