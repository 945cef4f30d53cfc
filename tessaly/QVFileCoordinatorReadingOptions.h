#pragma once

#include <cstdint>
#include <string>

namespace droxa {

// How a reader wants to read.
inline constexpr std::uint64_t NSFileCoordinatorReadingWithoutChanges = 1U << 0;
inline constexpr std::uint64_t NSFileCoordinatorReadingResolvesSymbolicLink = 1U << 1;
inline constexpr std::uint64_t NSFileCoordinatorReadingImmediatelyAvailableMetadataOnly = 1U << 2;
inline constexpr std::uint64_t NSFileCoordinatorReadingForUploading = 1U << 3;
inline constexpr std::uint64_t QVFileCoordinatorReadingForcedDownload = 1U << 17;

// "0x20001 (without changes | forced download)", "0 (none)"; bits without a name follow the others in
// hexadecimal: "0x41 (without changes | 0x40)". For log lines.
std::string QVFileCoordinatorReadingOptionsPrettyPrint(std::uint64_t options);

}  // namespace droxa
