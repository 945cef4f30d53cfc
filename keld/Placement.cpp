#include "keld/Placement.h"

#include "keld/SharedContainer.h"
#include "keld/contents/PromiseFile.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"

namespace droxa::keld {

bool IsContainerName(std::string_view name) {
  return !name.empty() && name.front() != '.' && name.back() != '.' &&
         name.find('.') != std::string_view::npos && name.find("..") == std::string_view::npos &&
         name.find('\n') == std::string_view::npos;
}

void Placement::load(ItemNumber parent) {
  if (known_ && parent_ == parent) return;
  known_ = true;
  parent_ = parent;
  record_ = parent == kReplicaFolder ? std::nullopt : queries_.byID(parent);
  isContainer_ = record_ && record_->parent == kReplicaFolder;
  isTrashDocuments_ = false;
  if (record_ && !isContainer_ && record_->zone() == Zone::structure) {
    const auto container = queries_.byID(record_->parent);
    isTrashDocuments_ = container && container->name == QVUbiquitousTrashContainerID;
  }
}

std::optional<std::uint32_t> Placement::flags(ItemNumber parent, std::string_view name,
                                              NSFileProviderItemKind kind) {
  load(parent);
  const bool isFolder = kind == NSFileProviderItemKind::folder;
  Zone zone = Zone::structure;
  if (parent == kReplicaFolder) {
    if (!isFolder || !IsContainerName(name)) return std::nullopt;
    return static_cast<std::uint32_t>(zone) | (IsSharedContainer(name) ? kOthersFlag : 0);
  }
  if (!record_) return std::nullopt;
  if (!isFolder && IsPromiseName(name)) return std::nullopt;  // stands for a document, and is none
  if (isContainer_) {
    if (!isFolder || name != QVDocumentsFolderName(record_->name)) zone = Zone::privateStorage;
  } else if (record_->zone() == Zone::structure) {
    zone = isTrashDocuments_ ? Zone::trashed : Zone::shown;
  } else {
    zone = record_->zone();
  }
  const bool isExcluded =
      (record_->flags & kExcludedFlag) != 0 || (zone != Zone::structure && qv_isNameExcludedFromSync(name));
  return static_cast<std::uint32_t>(zone) | (isExcluded ? kExcludedFlag : 0) | (record_->flags & kOthersFlag);
}

}  // namespace droxa::keld
