#pragma once

#include <compare>
#include <cstdint>
#include <optional>
#include <string>

namespace droxa::crash {

// One version of one of the workload's documents. Thread contract: a value.
struct VersionName {
  std::uint64_t document = 0;
  std::uint64_t version = 0;
  std::string description() const;
  auto operator<=>(const VersionName &) const = default;
};

// The text of a version: a first line that names it with its length, and that many bytes which only this
// version has. Nothing shorter, longer or mixed reads as a version.
std::string DocumentText(const VersionName &name, std::uint64_t length);
// nullopt for anything that isn't the whole text of one version.
std::optional<VersionName> ReadDocumentText(const std::string &text);

// SHA-256 in small hexadecimal digits, by a library of its own.
std::string TextDigest(const std::string &text);

}  // namespace droxa::crash
