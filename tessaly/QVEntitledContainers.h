#pragma once

#include <map>
#include <string>
#include <vector>

#include "platform/entitlements/EntitlementFiles.h"

namespace droxa {

// What applications are entitled to of the drive's containers.
inline constexpr char QVApplicationIdentifierEntitlement[] = "application-identifier";
inline constexpr char QVDroxaServicesEntitlement[] = "com.quorva.developer.droxa-services";
inline constexpr char QVDroxaContainerIdentifiersEntitlement[] =
    "com.quorva.developer.droxa-container-identifiers";
inline constexpr char QVUbiquityContainerIdentifiersEntitlement[] =
    "com.quorva.developer.ubiquity-container-identifiers";

// The service by which an application keeps documents in containers.
inline constexpr char QVCloudDocumentsService[] = "CloudDocuments";

// The container identifiers that these values of entitlements grant, in order and each once: with the service
// "CloudDocuments" the container identifiers, or, where there are none listed, the application's own; and the
// ubiquity container identifiers, which need no service. Any thread.
std::vector<std::string> QVEntitledContainerIdentifiers(
    const std::map<std::string, EntitlementValue> &entitlements);

}  // namespace droxa
