#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSDate.h"
#include "platform/foundation/NSObject.h"

namespace droxa {

inline constexpr char NSFileProviderRootContainerItemIdentifier[] =
    "NSFileProviderRootContainerItemIdentifier";
inline constexpr char NSFileProviderWorkingSetContainerItemIdentifier[] =
    "NSFileProviderWorkingSetContainerItemIdentifier";
inline constexpr char NSFileProviderAllDirectoriesContainerItemIdentifier[] =
    "NSFileProviderAllDirectoriesContainerItemIdentifier";

// The pages with which a listing starts.
extern const NSData &NSFileProviderInitialPageSortedByName();
extern const NSData &NSFileProviderInitialPageSortedByDate();

enum class NSFileProviderItemKind : std::uint8_t { document = 0, folder = 1, alias = 2, symbolicLink = 3 };

// What the framework is told of an item, in a form that crosses processes.
struct NSFileProviderItemFields {
  std::string itemIdentifier;
  std::string parentItemIdentifier;  // the root's: NSFileProviderRootContainerItemIdentifier
  std::string filename;              // raw bytes; any but '/' and NUL
  std::string typeIdentifier;        // a MIME type; "inode/directory", "inode/symlink"
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  std::uint64_t documentSize = 0;  // bytes; 0 for a folder
  NSDate creationDate;
  NSDate contentModificationDate;
  NSDate lastUsedDate;            // nil: never
  std::uint32_t permissions = 0;  // the low 12 bits of st_mode
  std::uint64_t changeRank = 0;   // keld's rank of its last change
  std::uint64_t favoriteRank = 0;
  NSData tagData;
  bool isTrashed = false;
  bool isExcludedFromSync = false;
  bool isDownloaded = true;
  bool isUploaded = false;
  bool isShared = false;
  bool operator==(const NSFileProviderItemFields &) const = default;
};

// An item that the framework may be handed.
// Thread contract: immutable.
class NSFileProviderItem : public NSObject {
 public:
  virtual const NSFileProviderItemFields &fields() const = 0;
  const std::string &itemIdentifier() const { return fields().itemIdentifier; }
};

using NSFileProviderItems = std::vector<std::shared_ptr<const NSFileProviderItem>>;

// An item that is nothing but its fields: what the host receives.
class NSFileProviderPlainItem final : public NSFileProviderItem {
 public:
  explicit NSFileProviderPlainItem(NSFileProviderItemFields fields) : fields_(std::move(fields)) {}
  const NSFileProviderItemFields &fields() const override { return fields_; }
  std::string description() const override;

 private:
  const NSFileProviderItemFields fields_;
};

}  // namespace droxa
