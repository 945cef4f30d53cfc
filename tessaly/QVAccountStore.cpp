#include <nlohmann/json.hpp>
#include <utility>

#include "tessaly/QVAccount.h"
#include "tessaly/QVConfigurationFile.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

std::string accountFile(const std::string &configurationFolder) {
  return configurationFolder + "/account.json";
}

constexpr char kName[] = "name";
constexpr char kIdentifier[] = "perAppAccountIdentifier";

// What is wrong with the object; "" when it is an account.
std::string problemWith(const nlohmann::json &object) {
  const auto name = object.find(kName);
  if (name == object.end() || !name->is_string() || name->get_ref<const std::string &>().empty())
    return std::string(kName) + " must be a text that isn't empty";
  const auto identifier = object.find(kIdentifier);
  if (identifier != object.end() && !identifier->is_null() && !identifier->is_string())
    return std::string(kIdentifier) + " must be a text or null";
  return {};
}

}  // namespace

std::shared_ptr<const QVAccount> QVAccountStoreRead(const std::string &configurationFolder, NSError *error) {
  const std::string path = accountFile(configurationFolder);
  NSError problem;
  const std::optional<std::string> text = QVConfigurationFileRead(path, &problem);
  if (!problem && !text) return nullptr;
  const nlohmann::json object = nlohmann::json::parse(text.value_or("{}"));
  if (!problem) {
    const std::string wrong = problemWith(object);
    if (!wrong.empty()) problem = qvc_error(QVErrorInvalidArgument, path + ": " + wrong);
  }
  if (problem) {
    if (error) *error = problem;
    return nullptr;
  }
  std::optional<std::string> identifier;
  const auto found = object.find(kIdentifier);
  if (found != object.end() && found->is_string()) identifier = found->get<std::string>();
  return std::make_shared<const QVAccount>(object[kName].get<std::string>(), std::move(identifier));
}

NSError QVAccountStoreWrite(const std::string &configurationFolder, const QVAccount &account) {
  nlohmann::json object = {{kName, account.name()}};
  if (account.perAppAccountIdentifier()) object[kIdentifier] = *account.perAppAccountIdentifier();
  const std::string path = accountFile(configurationFolder);
  try {
    return QVConfigurationFileWrite(path, object.dump(2) + "\n");
  } catch (const nlohmann::json::exception &) {
    return qvc_error(QVErrorInvalidArgument, path + ": a value isn't valid UTF-8");
  }
}

NSError QVAccountStoreRemove(const std::string &configurationFolder) {
  return QVConfigurationFileRemove(accountFile(configurationFolder));
}

}  // namespace droxa
