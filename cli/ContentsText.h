#pragma once

#include <cstdint>
#include <string>

#include "cli/ContentsArgument.h"
#include "tessaly/QVContents.h"

namespace droxa {

// "132 bytes", "1.4 MB", "12 GB": decimal units.
std::string bytesText(std::uint64_t bytes);
// How much of a whole: "37%".
std::string shareText(std::uint64_t part, std::uint64_t whole);

// Lines for a person about one document or what is below one folder.
std::string contentsLines(const ContentsArgument &contents, const QVContentsStatus &status);
// One JSON object, with `state` as "state" where it isn't "".
std::string contentsJSON(const ContentsArgument &contents, const QVContentsStatus &status,
                         const std::string &state = {});

// Lines and a JSON object about all transfers.
std::string transferLines(const QVTransferStatus &status);
std::string transferJSON(const QVTransferStatus &status);

}  // namespace droxa
