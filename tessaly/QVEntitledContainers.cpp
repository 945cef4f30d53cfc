#include "tessaly/QVEntitledContainers.h"

#include <algorithm>
#include <variant>

namespace droxa {
namespace {

using Entitlements = std::map<std::string, EntitlementValue>;

// A text counts as a list of one; true names nothing.
std::vector<std::string> Texts(const Entitlements &entitlements, const char *key) {
  const auto found = entitlements.find(key);
  if (found == entitlements.end()) return {};
  if (const auto *text = std::get_if<std::string>(&found->second)) return {*text};
  const auto *texts = std::get_if<std::vector<std::string>>(&found->second);
  return texts ? *texts : std::vector<std::string>();
}

bool HasDocumentsService(const Entitlements &entitlements) {
  const std::vector<std::string> services = Texts(entitlements, QVDroxaServicesEntitlement);
  return std::find(services.begin(), services.end(), QVCloudDocumentsService) != services.end();
}

}  // namespace

std::vector<std::string> QVEntitledContainerIdentifiers(const Entitlements &entitlements) {
  std::vector<std::string> identifiers;
  const auto add = [&identifiers](const std::vector<std::string> &more) {
    for (const std::string &identifier : more)
      if (std::find(identifiers.begin(), identifiers.end(), identifier) == identifiers.end())
        identifiers.push_back(identifier);
  };
  if (HasDocumentsService(entitlements)) {
    const auto listed = Texts(entitlements, QVDroxaContainerIdentifiersEntitlement);
    add(listed.empty() ? Texts(entitlements, QVApplicationIdentifierEntitlement) : listed);
  }
  add(Texts(entitlements, QVUbiquityContainerIdentifiersEntitlement));
  return identifiers;
}

}  // namespace droxa
