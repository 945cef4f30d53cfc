#pragma once

#include <functional>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "keld/sync/ConflictCopies.h"
#include "keld/sync/DocumentRecord.h"
#include "keld/sync/KnownShares.h"
#include "keld/sync/SyncContext.h"

namespace droxa::keld {

// Makes the replica what the cloud says: new documents appear dataless, names and places follow, newer
// contents are put where older ones are, what was deleted goes. What was changed here and isn't in the cloud
// yet is never overwritten: it is kept under a name of its own. Thread contract: the sync's thread.
class CloudApplier {
 public:
  CloudApplier(const SyncContext &context, ConflictCopies &conflicts);

  // Fetches and applies what is new in the cloud, page by page; each page is durable before the next is asked
  // for. nil when all is applied.
  NSError fetchAndApply(const CKCallContext &call);
  // Applies states that came another way.
  void applyRecords(const std::vector<CKRecord> &records, const CKCallContext &call);
  // Brings back what was deleted here and not in the cloud, with the next fetch.
  void bringBack(const SyncRow &row);
  // The whole replica was looked at: records that no file stands for though the cloud has them are asked for
  // again, and what a process that ended in the middle had made is gone.
  void replicaWasSeen();
  // Everything that the cloud has was seen once. Before that, what is new here may be known there.
  bool hasFetchedAll();
  // Asked before much is believed to be deleted: whether the cloud is still the same one.
  void setCloudCheck(std::function<bool()> isSame) { isSameCloud_ = std::move(isSame); }
  std::uint64_t applied() const { return applied_; }
  // Whether the last fetch found that nothing of another's zone is shared any more. Its items are gone then,
  // and what was only here lies in the drive.
  bool isZoneGone() const { return isZoneGone_; }

 private:
  struct Place {
    OwnedDescriptor folder;
    std::string folderPath;
  };

  NSError fetchPages(const CKCallContext &call);
  NSError withoutZone(const CKCallContext &call);
  NSError applyPage(const CKZoneChanges &page, const CKCallContext &call);
  std::vector<DocumentRecord> documentsOf(const std::vector<CKRecord> &records);
  void noteShares(const CKZoneChanges &page);
  void applyAll(const std::vector<DocumentRecord> &documents);
  NSError fetchAgain(const CKCallContext &call);
  void applyFetched(const std::vector<CKRecordResult> &results);
  // Before a transaction that makes them.
  void beginUnfinished(const std::vector<DocumentRecord> &documents);
  void undoUnfinished();
  using UnfinishedRecords = std::map<std::string, UnfinishedRecord>;
  bool removeUnfinishedIn(const std::string &folderPath, const UnfinishedRecords &records, int depth);
  bool removeUnfinished(const FileLocation &location, const std::string &record);
  void bringBackWhatIsMissing();
  void syncReplica() const;
  void beginFetchOfAll();
  void removeUnseen();
  void sendAgain(const std::string &record);
  void apply(const DocumentRecord &document);
  void findLink(SyncRow *row);
  void waitForPlace(const DocumentRecord &document);
  bool isOwnSaveOfDead(const DocumentRecord &document, const SyncRow &row);
  bool isKnownOfDead(const DocumentRecord &document, const SyncRow &row);
  void followOwnSave(const DocumentRecord &document, SyncRow row);
  bool openPlace(const std::string &parentRecord, Place *place);

  void create(const DocumentRecord &document, const Place &place, SyncRow row);
  bool createFolder(const DocumentRecord &document, const Place &place, SyncRow *row);
  bool createLink(const DocumentRecord &document, const Place &place, SyncRow *row);
  bool createDocument(const DocumentRecord &document, const Place &place, SyncRow *row);
  // Something is in the trash under that name now.
  void noteTrash(const DocumentRecord &document, const std::string &name);
  // Writes what users note onto the file, unless it was changed here since the cloud was told of it. Whether
  // the cloud has to be told what is here. A link bears nothing.
  bool applyMetadata(const DocumentRecord &document, int folder, const std::string &name, ItemMetadata here,
                     SyncRow *row);
  void noteTrashAgain();
  void placed(const DocumentRecord &document, const Place &place, const std::string &name, SyncRow *row);
  bool putAtFreeName(const DocumentRecord &document, const Place &place, SyncRow *row,
                     const std::function<ContentsOutcome(const std::string &name)> &put);
  // Something has the name already: whether it is the document itself, or was moved out of the way.
  enum class Taken { isIt, freed, useOtherName };
  Taken resolveTaken(const DocumentRecord &document, const Place &place, const std::string &name,
                     SyncRow *row);
  Taken resolveTakenByDocument(const DocumentRecord &document, const FileLocation &there,
                               const std::optional<SyncRow> &other, SyncRow *row);
  Taken freeName(const FileLocation &there, const std::optional<SyncRow> &other, const std::string &record);

  void change(const DocumentRecord &document, const Place &place, SyncRow row, const ItemRecord &item);
  bool move(const DocumentRecord &document, const Place &place, FileLocation *location);
  void changeLink(const DocumentRecord &document, SyncRow *row, const FileLocation &location);
  bool isBasedOn(const DocumentRecord &document, const SyncRow &row, const DocumentLook &look);
  void changeContents(const DocumentRecord &document, SyncRow row, const FileLocation &location);
  void replacePlaceholder(const DocumentRecord &document, SyncRow row, const FileLocation &location,
                          const DocumentLook &look);

  void remove(const std::string &record);
  void removeDocument(const SyncRow &row, const FileLocation &location);
  void removeFolders();

  // What is particular to scopes (CloudApplier+Shared.cpp). place() finds where in this scope a record
  // belongs; false: in none.
  bool place(DocumentRecord *document);
  bool isAsApplied(const DocumentRecord &document, const SyncRow &row) const;
  void noteAccesses(const CKZoneChanges &page);
  void followAccess(const CKRecord &record);
  void applyAccessBelow(const std::string &root);
  void hangChildren(const std::string &folder, const std::set<std::string> &doomed);
  bool hangAtTop(SyncRow row);
  // Moves what was changed here, and isn't shared any more, into the drive's own folder.
  void keepAside(const std::string &path);
  void emptyZone();

  DocumentMarker markerOf(const DocumentRecord &document) const;
  void touch(const std::string &path) { touched_.push_back(path); }
  void finishBatch();

  const SyncContext &context_;
  ConflictCopies &conflicts_;
  KnownShares shares_;
  std::vector<std::string> touched_;          // paths that the keeper is to look at
  std::map<std::string, PutBack> early_;      // by the names in the trash, until the folder is known
  std::vector<std::string> foldersToRemove_;  // records
  std::uint64_t applied_ = 0;
  std::function<bool()> isSameCloud_;
  bool isReplicaSeen_ = false;
  bool isZoneGone_ = false;
  std::string account_;  // this one's name, once it was asked for
  bool fetchesAll_ = false;
  std::set<std::string> seen_, seenShares_;  // while everything is fetched anew
};

// SHA-256 of an open file, in hexadecimal; "" when it can't be read.
std::string DigestOfFile(int descriptor);

}  // namespace droxa::keld
