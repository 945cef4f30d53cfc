#include "extension/ExtensionArguments.h"

#include <charconv>
#include <sys/stat.h>

namespace droxa {
namespace {

// "--name VALUE" and "--name=VALUE", one option after the other.
struct Option {
  std::string name;
  std::optional<std::string> value;
};

Option SplitOption(const std::string &argument) {
  const auto equals = argument.find('=');
  if (equals == std::string::npos) return {argument, std::nullopt};
  return {argument.substr(0, equals), argument.substr(equals + 1)};
}

std::optional<int> ParseDescriptor(const std::string &text, std::string *problem) {
  int descriptor = -1;
  const auto [end, code] = std::from_chars(text.data(), text.data() + text.size(), descriptor);
  if (code != std::errc() || end != text.data() + text.size() || descriptor < 0) {
    *problem = "--host-descriptor: \"" + text + "\" isn't a descriptor's number";
    return std::nullopt;
  }
  struct stat status {};
  if (fstat(descriptor, &status) != 0 || !S_ISSOCK(status.st_mode)) {
    *problem = "--host-descriptor: " + text + " isn't an open socket";
    return std::nullopt;
  }
  return descriptor;
}

}  // namespace

std::optional<ExtensionArguments> ExtensionArguments::parse(const std::vector<std::string> &arguments,
                                                            std::string *problem) {
  ExtensionArguments parsed;
  std::optional<std::string> descriptor;
  for (std::size_t i = 0; i < arguments.size(); ++i) {
    Option option = SplitOption(arguments[i]);
    if (option.name == "--help") {
      parsed.wantsHelp = true;
      return parsed;
    }
    if (option.name != "--home" && option.name != "--host-descriptor") {
      *problem = "unknown argument \"" + arguments[i] + "\"";
      return std::nullopt;
    }
    if (!option.value && i + 1 < arguments.size()) option.value = arguments[++i];
    if (!option.value || option.value->empty()) {
      *problem = option.name + " needs a value";
      return std::nullopt;
    }
    (option.name == "--home" ? parsed.home : descriptor) = option.value;
  }
  if (!descriptor) {
    *problem = "--host-descriptor is missing: this program is started by fileproviderd, not by hand";
    return std::nullopt;
  }
  const auto number = ParseDescriptor(*descriptor, problem);
  if (!number) return std::nullopt;
  parsed.hostDescriptor = *number;
  return parsed;
}

}  // namespace droxa
