#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace droxa::keld {

// What a storage writes down, durably, before a document of the user's may come into it: whose file it will
// be, and where it belongs. Thread contract: a value.
struct ExchangeNote {
  // What is known of a file: enough to tell whether somebody wrote into it.
  struct File {
    std::uint64_t inode = 0;
    std::uint64_t size = 0;
    std::int64_t modified = 0;
    bool operator==(const File &) const = default;
  };
  File incoming;             // what goes to the name; inode 0 when nothing goes there
  File outgoing;             // what is expected to come out
  bool wasDataless = false;  // the outgoing one
  std::uint64_t folderInode = 0;
  std::string folderPath;  // relative to the replica
  std::string name;

  bool operator==(const ExchangeNote &) const = default;
};

inline constexpr std::size_t kMostNoteBytes = 16 * 1024;

std::string EncodeNote(const ExchangeNote &note);
// nullopt for anything that EncodeNote doesn't write, half of a note included.
std::optional<ExchangeNote> ParseNote(std::string_view bytes);

}  // namespace droxa::keld
