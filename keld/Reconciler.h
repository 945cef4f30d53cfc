#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "keld/FolderOpener.h"
#include "keld/ItemEdits.h"
#include "keld/ItemQueries.h"
#include "keld/ItemRecord.h"
#include "keld/Placement.h"
#include "keld/RecentFiles.h"
#include "platform/foundation/NSError.h"

namespace droxa::keld {

// Brings the item table in line with what is in the replica, and keeps every item's identity through that:
// - a file that is found under another name, or in another folder, is the same item (by inode, device and
// birth);
// - a new file over or instead of an old one of the same name is the item of that name: that is how editors
// save;
// - so is a new file whose predecessor was renamed to a backup of it ("notes.txt~");
// - folders always go by their inode, because what is in them goes with them;
// - two names of one file are two items.
//
// What is missing at its name is put aside (into the limbo folder) until bury(), so that it can turn up
// elsewhere. Thread contract: the keeper's thread, inside a transaction. Everything throws SqlError.
class Reconciler {
 public:
  Reconciler(ItemQueries &queries, ItemEdits &edits, FolderOpener &opener);

  // Without identity search, while the table is filled for the first time.
  void setBulkLoading(bool bulkLoading) { bulkLoading_ = bulkLoading; }
  // In a replica without extended attributes, promises stand for documents (keld/contents/PromiseFile.h).
  void setShowsPromises(bool showsPromises) { showsPromises_ = showsPromises; }
  // Called with each folder that is about to be read, and with each that died.
  void setFolderCallbacks(std::function<void(ItemNumber, int)> appeared,
                          std::function<void(ItemNumber)> vanished);

  // Looks at one name. What was looked at is settled together: see settle().
  void look(ItemNumber folder, const std::string &name);
  // Compares all of a folder with the table, and settles it.
  void scan(ItemNumber folder);
  void settle();
  // What is still missing dies. With `onlyThose` found missing since the last bury or keep.
  void bury(bool onlyRecent);
  // What is missing now isn't recent any more: the walk may yet find it elsewhere.
  void keepMissing() { recentLimbo_.clear(); }

  // The places that trashed items have left since the last call.
  struct Place {
    ItemNumber folder = 0;
    std::string name;
  };
  std::vector<Place> takePlacesLeftInTrash() { return std::exchange(leftInTrash_, {}); }
  // What happened since the last call, in order.
  std::vector<ItemChange> takeChanges();
  std::size_t changeCount() const { return changes_.size(); }
  // Folders of old that have to be scanned again, because they came back or became readable.
  std::vector<ItemNumber> takeFoldersToScan();

  // Gives the item the next rank and tells its watchers: what it shows has changed although its file hasn't.
  void touch(ItemNumber id);
  // Shows what the sync has found out of the item: kSyncFlags.
  void setSyncFlags(ItemNumber id, std::uint32_t flags);
  // Shows whether the item is the root of a share.
  void setShared(ItemNumber id, bool isShared);
  // Notes it on the item's file, or in its row where the file can't bear it. nil, QVErrorNoSuchItem or a
  // POSIX error.
  NSError applyMetadata(ItemNumber id, const QVItemMetadataChange &change);

 private:
  struct Observation {
    ItemNumber folder = 0;
    std::string name;
    std::optional<FileFacts> facts;
    bool settled = false;
  };

  // Where an item was before it was put into limbo.
  struct Origin {
    ItemNumber parent = 0;
    std::string name;
  };

  std::optional<FileFacts> readFileOrPromise(int folder, const std::string &name) const;
  std::optional<std::string> documentName(ItemNumber folder, int descriptor, const std::string &name);
  NameList documentNames(ItemNumber folder, int descriptor, const NameList &names);
  std::optional<FileFacts> readFacts(ItemNumber folder, const OwnedDescriptor &descriptor,
                                     const std::string &name, const std::optional<ItemRecord> &known);
  bool isAlias(ItemNumber folder, const std::string &name);
  void observe(ItemNumber folder, const std::string &name, std::optional<FileFacts> facts);
  void settleOne(Observation &observation);
  bool keepsIdentity(const Observation &observation, const ItemRecord &record);
  void adopt(Observation &observation);
  std::optional<ItemRecord> findMoved(const Observation &observation);
  bool isStillThere(const ItemRecord &record);
  bool leavesItsName(const ItemRecord &record, const Observation &observation);
  bool takeBackFromBackup(const Observation &observation, std::uint32_t flags);
  void insertNew(const Observation &observation, std::uint32_t flags, ItemNumber id,
                 const ItemMetadata &metadata = {});
  bool readMetadata(ItemRecord &record);
  bool isDataless(ItemNumber folder, const std::string &name, const FileFacts &facts, bool mayBeMarked);
  void move(ItemRecord record, const Observation &observation, std::uint32_t flags);
  void refresh(ItemRecord record, const FileFacts &facts);
  void reflagChildren(const ItemRecord &folder);
  bool changesOwner(const ItemRecord &folder, ItemNumber from, ItemNumber to);
  void putIntoLimbo(ItemRecord record);
  void die(const ItemRecord &record, ItemNumber lastParent);
  void dieAlone(const ItemRecord &record, ItemNumber lastParent);
  void touchedFolders();
  bool isUnlistedStructure(const ItemRecord &record);
  void readUnknownFolder(ItemNumber folder, const OwnedDescriptor &descriptor, const NameList &names);
  void compareFolder(ItemNumber folder, const OwnedDescriptor &descriptor, const NameList &names);
  void setUnreadable(ItemNumber folder, bool unreadable);
  Origin originOf(const ItemRecord &record) const;

  ItemQueries &queries_;
  ItemEdits &edits_;
  FolderOpener &opener_;
  Placement placement_;
  std::function<void(ItemNumber, int)> folderAppeared_;
  std::function<void(ItemNumber)> folderVanished_;

  bool bulkLoading_ = false;
  bool showsPromises_ = false;
  std::deque<Observation> observations_;
  std::multimap<std::uint64_t, Observation *>
      newcomers_;  // seen under a name that the table doesn't have, by inode
  std::unordered_map<ItemNumber, Origin> limboOrigins_;  // of the items in limbo
  std::vector<ItemNumber> recentLimbo_;
  std::vector<ItemNumber> touched_;  // folders whose own dates may have changed
  RecentFiles recent_;
  std::vector<ItemChange> changes_;
  std::vector<ItemNumber> foldersToScan_;
  std::vector<Place> leftInTrash_;
};

}  // namespace droxa::keld
