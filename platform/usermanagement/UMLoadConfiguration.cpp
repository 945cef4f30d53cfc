#include <cerrno>
#include <cstring>
#include <nlohmann/json.hpp>
#include <stdexcept>

#include "platform/foundation/ReadFile.h"
#include "platform/usermanagement/UMUserManager.h"

namespace droxa {
namespace {

using Json = nlohmann::json;

constexpr std::size_t kLargestFile = 1024 * 1024;

// What is wrong in the file, for its reader.
struct Problem : std::runtime_error {
  using std::runtime_error::runtime_error;
};

std::optional<std::string> text(const Json &value, const std::string &name) {
  if (value.is_null()) return std::nullopt;
  if (!value.is_string() || value.get<std::string>().empty())
    throw Problem(name + " must be a text that isn't empty");
  return value.get<std::string>();
}

bool truth(const Json &value, const std::string &name) {
  if (!value.is_boolean()) throw Problem(name + " must be true or false");
  return value.get<bool>();
}

UMPersonaDescription persona(const Json &value, const std::string &name) {
  if (!value.is_object()) throw Problem(name + " must be an object");
  UMPersonaDescription description;
  for (const auto &[key, field] : value.items()) {
    if (key == "uniqueString") {
      description.uniqueString = text(field, name + ".uniqueString").value_or("");
    } else if (key == "isDataSeparated") {
      description.isDataSeparated = truth(field, name + ".isDataSeparated");
    } else {
      throw Problem(name + " has an unknown field \"" + key + "\"");
    }
  }
  if (description.uniqueString.empty()) throw Problem(name + ".uniqueString is missing");
  return description;
}

bool isListed(const UMConfiguration &configuration, const std::string &uniqueString) {
  for (const UMPersonaDescription &known : configuration.personas) {
    if (known.uniqueString == uniqueString) return true;
  }
  return false;
}

std::vector<UMPersonaDescription> personas(const Json &value) {
  if (!value.is_array()) throw Problem("personas must be a list");
  UMConfiguration found;
  for (std::size_t i = 0; i < value.size(); ++i) {
    UMPersonaDescription next = persona(value[i], "personas[" + std::to_string(i) + "]");
    if (isListed(found, next.uniqueString))
      throw Problem("persona \"" + next.uniqueString + "\" is listed twice");
    found.personas.push_back(std::move(next));
  }
  return found.personas;
}

UMConfiguration configurationFrom(const Json &document) {
  if (!document.is_object()) throw Problem("the file must hold an object");
  UMConfiguration configuration;
  for (const auto &[key, value] : document.items()) {
    if (key == "personas") {
      configuration.personas = personas(value);
    } else if (key == "processPersona") {
      configuration.processPersona = text(value, key);
    } else if (key == "personalUniqueString") {
      configuration.personalUniqueString = text(value, key);
    } else if (key == "mayUseArbitraryPersonas") {
      configuration.mayUseArbitraryPersonas = truth(value, key);
    } else {
      throw Problem("unknown field \"" + key + "\"");
    }
  }
  if (configuration.processPersona && !isListed(configuration, *configuration.processPersona)) {
    throw Problem("processPersona \"" + *configuration.processPersona + "\" is not among the personas");
  }
  return configuration;
}

}  // namespace

NSError UMLoadConfiguration(const std::string &configurationFolder) {
  const std::string path = configurationFolder + "/personas.json";
  const FileContents contents = ReadFile(path, kLargestFile);
  if (contents.code == ENOENT) return {};
  if (contents.code != 0) {
    return NSError::errorWithPOSIXCode(contents.code, path + ": " + std::strerror(contents.code));
  }
  try {
    UMSetConfiguration(configurationFrom(Json::parse(contents.bytes)));
    return {};
  } catch (const std::exception &problem) {
    return NSError::errorWithPOSIXCode(EINVAL, path + ": " + problem.what());
  }
}

}  // namespace droxa
