#pragma once

#include <string>

namespace droxa {

// The folders of the replica that a home begins with.
inline constexpr char kDefaultContainer[] = "com.quorva.Tessaly.default";
std::string documentsFolder(const std::string &replica, const std::string &container);

// Makes the documents folders of the containers that every drive has. False with `problem`.
bool makeContainers(const std::string &replica, std::string *problem);

// Fills a new replica with a few folders and documents, an alias into another container, an application's
// container with something private beside its documents, and a document that is kept from sync. False with
// `problem`.
bool makeSampleDrive(const std::string &replica, std::string *problem);

}  // namespace droxa
