#include "keld/contents/ExchangeNote.h"

#include <charconv>

namespace droxa::keld {

namespace {

constexpr std::string_view kFirstField = "droxa-note-1 ";

template <class Number>
bool takeNumber(std::string_view *rest, Number *number) {
  const std::size_t end = rest->find(' ');
  if (end == std::string_view::npos) return false;
  const auto [stop, error] = std::from_chars(rest->data(), rest->data() + end, *number);
  if (error != std::errc() || stop != rest->data() + end) return false;
  rest->remove_prefix(end + 1);
  return true;
}

bool takeFile(std::string_view *rest, ExchangeNote::File *file) {
  return takeNumber(rest, &file->inode) && takeNumber(rest, &file->size) && takeNumber(rest, &file->modified);
}

}  // namespace

// A name or path holds no null, so that two of them end the path and the whole.
std::string EncodeNote(const ExchangeNote &note) {
  std::string bytes(kFirstField);
  for (const auto &file : {note.incoming, note.outgoing})
    bytes += std::to_string(file.inode) + ' ' + std::to_string(file.size) + ' ' +
             std::to_string(file.modified) + ' ';
  bytes += std::to_string(note.wasDataless ? 1 : 0) + ' ' + std::to_string(note.folderInode) + ' ';
  return bytes + note.folderPath + '\0' + note.name + '\0';
}

std::optional<ExchangeNote> ParseNote(std::string_view bytes) {
  std::string_view rest = bytes;
  if (rest.substr(0, kFirstField.size()) != kFirstField) return std::nullopt;
  rest.remove_prefix(kFirstField.size());
  ExchangeNote note;
  int wasDataless = 0;
  if (!takeFile(&rest, &note.incoming) || !takeFile(&rest, &note.outgoing) ||
      !takeNumber(&rest, &wasDataless) || !takeNumber(&rest, &note.folderInode))
    return std::nullopt;
  note.wasDataless = wasDataless == 1;
  const std::size_t pathEnd = rest.find('\0');
  if (pathEnd == std::string_view::npos || rest.back() != '\0') return std::nullopt;
  note.folderPath = rest.substr(0, pathEnd);
  rest.remove_prefix(pathEnd + 1);
  if (rest.empty()) return std::nullopt;
  note.name = rest.substr(0, rest.size() - 1);
  if (note.name.empty() || EncodeNote(note) != bytes) return std::nullopt;
  return note;
}

}  // namespace droxa::keld
