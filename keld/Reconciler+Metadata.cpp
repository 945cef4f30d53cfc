// What the user notes on items: read from their files, or kept in their rows.

#include <cerrno>

#include "keld/ItemAttributes.h"
#include "keld/Reconciler.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {

// Gives whether the file may bear a document's marker. A link can't bear attributes, nor can anything on some
// file systems: there the row's is all there is.
bool Reconciler::readMetadata(ItemRecord &record) {
  if (IsLink(record.facts.kind)) return false;
  int error = 0;
  const auto folder = opener_.open(record.parent, &error);
  return !folder || ReadMetadataOfFile(folder->get(), record.name, &record.metadata);
}

NSError Reconciler::applyMetadata(ItemNumber id, const QVItemMetadataChange &change) {
  auto record = queries_.byID(id);
  const std::string name = record ? record->name : "item " + std::to_string(id);
  if (!record || record->parent == kLimboFolder) return qvc_errorNoSuchItem(name);
  int error = 0;
  const auto folder = opener_.open(record->parent, &error);
  if (!folder) return NSError::errorWithPOSIXCode(error, name + ": can't open its folder");
  const ItemMetadata known = record->metadata;
  error = ApplyMetadataToFile(folder->get(), record->name, change);
  if (error == 0)
    readMetadata(*record);
  else if (error == ENOTSUP)
    record->metadata = change.appliedTo(known);
  else
    return NSError::errorWithPOSIXCode(error, name + ": can't write its extended attributes");
  if (record->metadata == known) return NSError();
  edits_.update(*record);
  changes_.push_back({record->id, record->facts.kind, record->parent, record->parent, false});
  return NSError();
}

}  // namespace droxa::keld
