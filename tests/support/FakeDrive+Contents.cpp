// What the daemon knows of the documents' contents.

#include "tests/support/FakeDrive.h"

namespace droxa {

bool FakeDrive::isPinned(std::uint64_t number) const {
  for (std::uint64_t at = number; at != 0; at = nodes_.at(at).parent)
    if (nodes_.at(at).contents.isPinned) return true;
  return false;
}

std::vector<std::uint64_t> FakeDrive::documentsAt(std::uint64_t number) const {
  if (nodes_.at(number).kind == NSFileProviderItemKind::document) return {number};
  std::vector<std::uint64_t> documents;
  for (const std::uint64_t child : childNumbers(number)) {
    const std::vector<std::uint64_t> below = documentsAt(child);
    documents.insert(documents.end(), below.begin(), below.end());
  }
  return documents;
}

void FakeDrive::setMetadata(std::uint64_t number, const QVItemMetadataChange &change,
                            std::vector<FakeDriveChange> &changes) {
  Node &node = nodes_.at(number);
  const QVItemMetadata metadata = change.appliedTo(node.metadata);
  if (metadata == node.metadata) return;
  node.metadata = metadata;
  touch(number, changes);
}

void FakeDrive::touch(std::uint64_t number, std::vector<FakeDriveChange> &changes) {
  bump(nodes_.at(number));
  changes.push_back({item(number), foldersAbove(number), foldersAbove(number)});
}

}  // namespace droxa
