#include "keld/ItemAttributes.h"

#include "keld/contents/DocumentMarker.h"

namespace droxa::keld {

namespace {

// Through the descriptor's link: it works for a folder that is open as a path alone.
std::string pathIn(int folder, const std::string &name) {
  return "/proc/self/fd/" + std::to_string(folder) + "/" + name;
}

}  // namespace

bool ReadMetadataOfFile(int folder, const std::string &name, ItemMetadata *metadata) {
  const std::string path = pathIn(folder, name);
  ItemMetadata found;
  bool hasMarker = false;
  if (QVReadItemAttributes(path, &found, kMarkerAttribute, &hasMarker) != 0) return true;
  // A file system without attributes lists none, like a file that bears none.
  if (found.isEmpty() && !metadata->isEmpty() && !QVKeepsItemAttributes(path)) return hasMarker;
  *metadata = std::move(found);
  return hasMarker;
}

int ApplyMetadataToFile(int folder, const std::string &name, const QVItemMetadataChange &change) {
  return QVWriteItemAttributes(pathIn(folder, name), change);
}

}  // namespace droxa::keld
