#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVProtocol.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {

// One change of the drive, as its watchers see it: the item as it is now (or dead), and the folders that it
// was in and is in, outermost last.
struct FakeDriveChange {
  std::shared_ptr<const QVQueryItem> item;
  std::vector<std::uint64_t> foldersBefore;  // empty for a new item
  std::vector<std::uint64_t> foldersAfter;   // empty for a dead one
};

// The items of a drive in memory, with the daemon's rules: identifiers, ranks, the root, listings, the
// working set. Items are named by paths: "a/b.txt" is below the default container's documents folder, "/…" is
// a path in the replica. Thread contract: none; its owner locks.
class FakeDrive {
 public:
  // Holds the default, documents, desktop and trash containers.
  explicit FakeDrive(std::string replica);

  struct Attributes {
    NSFileProviderItemKind kind = NSFileProviderItemKind::document;
    std::uint64_t size = 0;
    std::int64_t modifiedNanoseconds = 1'700'000'000'000'000'000;
    std::optional<std::uint64_t> number;  // of the identifier; the next one by default
    bool isDataless = false;
  };
  // What changed is appended to `changes`. False, changing nothing, for a path that doesn't fit: a missing
  // parent folder or item, a name that is taken.
  bool add(const std::string &path, const Attributes &attributes, std::vector<FakeDriveChange> &changes);
  bool setContents(const std::string &path, std::uint64_t size, std::int64_t modifiedNanoseconds,
                   std::vector<FakeDriveChange> &changes);
  bool rename(const std::string &from, const std::string &to, std::vector<FakeDriveChange> &changes);
  bool remove(const std::string &path, std::vector<FakeDriveChange> &changes);  // with all that is below
  bool addContainer(const std::string &containerID, std::vector<FakeDriveChange> &changes);
  bool removeContainer(const std::string &containerID, std::vector<FakeDriveChange> &changes);
  void setReadable(const std::string &path, bool readable);

  // What the daemon knows of a document's contents; of a folder, `isPinned` alone means something.
  struct Contents {
    bool isDataless = false;
    bool isPinned = false;
    bool isUnsent = false;  // the cloud doesn't have them
    bool isInUse = false;
    bool isShared = false;
    NSError lastFailure;
  };
  Contents &contents(std::uint64_t number) { return nodes_.at(number).contents; }
  const Contents &contents(std::uint64_t number) const { return nodes_.at(number).contents; }
  bool isPinned(std::uint64_t number) const;  // itself, or a folder above it
  std::uint64_t size(std::uint64_t number) const { return nodes_.at(number).size; }
  bool exists(std::uint64_t number) const { return nodes_.count(number) != 0; }
  // A document, or those below a folder.
  std::vector<std::uint64_t> documentsAt(std::uint64_t number) const;
  void setMetadata(std::uint64_t number, const QVItemMetadataChange &change,
                   std::vector<FakeDriveChange> &changes);
  // The item's properties changed, but not its contents.
  void touch(std::uint64_t number, std::vector<FakeDriveChange> &changes);

  // Questions. Zero or null: there is no such item.
  std::uint64_t numberAtPath(const std::string &path) const;
  std::uint64_t numberOf(const QVFileObjectID &fileObjectID) const;
  std::shared_ptr<const QVQueryItem> item(std::uint64_t number) const;
  NSURL url(std::uint64_t number) const;
  std::uint64_t rootNumber() const { return root_; }
  std::optional<std::uint64_t> containerNumber(const std::string &containerID) const;
  bool isReadable(std::uint64_t number) const { return nodes_.at(number).readable; }
  bool isFolder(std::uint64_t number) const;
  std::vector<std::uint64_t> foldersAbove(std::uint64_t number) const;
  std::uint64_t rank() const { return rank_; }
  std::vector<QVContainerDescription> containers() const;
  std::uint64_t count(NSFileProviderItemKind kind) const;

  // The children of a folder, or every folder, in their order.
  QVQueryItems children(std::uint64_t folder, std::int64_t sortOrder) const;
  QVQueryItems allFolders(std::int64_t sortOrder) const;

  struct WorkingSetBatch {
    QVQueryItems updated;
    std::vector<QVFileObjectID> deleted;
    NSData token;
  };
  // nullopt for a token of another drive.
  std::optional<WorkingSetBatch> workingSet(const NSData &token, std::uint64_t limit) const;

 private:
  struct Node {
    std::uint64_t number = 0;
    std::uint64_t parent = 0;  // the root's: 0
    std::string name;          // a container's documents folder: its identifier
    NSFileProviderItemKind kind = NSFileProviderItemKind::document;
    std::uint64_t size = 0;
    std::int64_t modified = 0;
    std::uint64_t rank = 0;
    bool isContainer = false;
    bool readable = true;
    Contents contents;
    QVItemMetadata metadata;
  };

  std::optional<std::pair<std::uint64_t, std::string>> parentAndName(const std::string &path) const;
  std::uint64_t childNamed(std::uint64_t parent, const std::string &name) const;
  std::vector<std::uint64_t> childNumbers(std::uint64_t folder) const;
  bool isListed(const Node &node) const;  // in its parent's listing
  std::string filename(const Node &node) const;
  bool isExcluded(const Node &node) const;
  std::string containerOf(const Node &node) const;
  std::shared_ptr<const QVQueryItem> itemOf(const Node &node) const;
  std::uint64_t insert(Node node);
  void kill(std::uint64_t number, std::vector<FakeDriveChange> &changes);
  void bump(Node &node);
  NSData tokenAtRank(std::uint64_t rank) const;

  const std::string replica_;
  const std::string identity_;  // of this drive's tokens
  std::map<std::uint64_t, Node> nodes_;
  std::map<std::string, std::uint64_t> containers_;
  std::map<std::uint64_t, QVFileObjectID> dead_;   // by the rank of the death
  std::map<std::uint64_t, std::uint64_t> byRank_;  // rank of the last change → number
  std::uint64_t root_ = 0;
  std::uint64_t nextNumber_ = 1;
  std::uint64_t rank_ = 0;
};

}  // namespace droxa
