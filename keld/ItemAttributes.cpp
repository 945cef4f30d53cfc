#include "keld/ItemAttributes.h"

namespace droxa::keld {

namespace {

// Through the descriptor's link: it works for a folder that is open as a path alone.
std::string pathIn(int folder, const std::string &name) {
  return "/proc/self/fd/" + std::to_string(folder) + "/" + name;
}

}  // namespace

void ReadMetadataOfFile(int folder, const std::string &name, ItemMetadata *metadata) {
  const std::string path = pathIn(folder, name);
  ItemMetadata found;
  if (QVReadItemAttributes(path, &found) != 0) return;
  // A file system without attributes lists none, like a file that bears none.
  if (found.isEmpty() && !metadata->isEmpty() && !QVKeepsItemAttributes(path)) return;
  *metadata = std::move(found);
}

int ApplyMetadataToFile(int folder, const std::string &name, const QVItemMetadataChange &change) {
  return QVWriteItemAttributes(pathIn(folder, name), change);
}

}  // namespace droxa::keld
