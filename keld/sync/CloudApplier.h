#pragma once

#include <functional>
#include <set>
#include <string>
#include <vector>

#include "keld/sync/ConflictCopies.h"
#include "keld/sync/DocumentRecord.h"
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
  // Brings back what was deleted here and not in the cloud.
  void bringBack(const SyncRow &row);
  std::uint64_t applied() const { return applied_; }

 private:
  struct Place {
    OwnedDescriptor folder;
    std::string folderPath;
  };

  void applyPage(const CKZoneChanges &page, const CKCallContext &call);
  bool putOff(ItemNumber item);
  void applyAll(const std::vector<DocumentRecord> &documents, const CKCallContext &call);
  void apply(const DocumentRecord &document);
  void adoptOrphans(const CKCallContext &call);
  bool openPlace(const std::string &parentRecord, Place *place);

  void create(const DocumentRecord &document, const Place &place, SyncRow row);
  bool createFolder(const DocumentRecord &document, const Place &place, SyncRow *row);
  bool createLink(const DocumentRecord &document, const Place &place, SyncRow *row);
  bool createDocument(const DocumentRecord &document, const Place &place, SyncRow *row);
  // Something has the name already: whether it is the document itself, or was moved out of the way.
  enum class Taken { isIt, freed, useOtherName };
  Taken resolveTaken(const DocumentRecord &document, const Place &place, const std::string &name,
                     SyncRow *row);
  Taken resolveTakenByDocument(const DocumentRecord &document, const FileLocation &there,
                               const std::optional<SyncRow> &other, SyncRow *row);
  Taken freeName(const FileLocation &there, const std::optional<SyncRow> &other, const std::string &record);

  void change(const DocumentRecord &document, const Place &place, SyncRow row, const ItemRecord &item);
  bool move(const DocumentRecord &document, const Place &place, FileLocation *location);
  void changeContents(const DocumentRecord &document, const Place &place, SyncRow row,
                      const FileLocation &location);
  void replacePlaceholder(const DocumentRecord &document, SyncRow row, const FileLocation &location,
                          const DocumentLook &look);

  void remove(const std::string &record);
  void removeDocument(const SyncRow &row, const FileLocation &location);
  void removeFolders();

  DocumentMarker markerOf(const DocumentRecord &document) const;
  void touch(const std::string &path) { touched_.push_back(path); }
  void finishBatch();

  const SyncContext &context_;
  ConflictCopies &conflicts_;
  std::vector<std::string> touched_;          // paths that the keeper is to look at
  std::vector<std::string> parentsMade_;      // records that orphans may wait for
  std::vector<std::string> foldersToRemove_;  // records
  std::uint64_t applied_ = 0;
  bool fetchesAll_ = false;
  bool mayWait_ = false;       // whether what can't be found now may be put off
  bool isIncomplete_ = false;  // something of the page was
  std::set<std::string> seen_;  // while everything is fetched anew
};

// SHA-256 of an open file, in hexadecimal; "" when it can't be read.
std::string DigestOfFile(int descriptor);

}  // namespace droxa::keld
