#pragma once

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "keld/sync/AssetUploads.h"
#include "keld/sync/ConflictCopies.h"
#include "keld/sync/DocumentRecord.h"
#include "keld/sync/LocalExaminer.h"
#include "keld/sync/SyncContext.h"

namespace droxa::keld {

// Sends what is in the queue of uploads: small contents and the records, many in one call, in the order of
// the changes; large contents through AssetUploads. Thread contract: the sync's thread.
class Uploader {
 public:
  struct Round {
    std::uint64_t sent = 0;
    bool moreIsDue = false;
    std::vector<CKRecord> newerRecords;  // that the cloud has instead of what was sent: to be applied first
    NSError cloudProblem;                // the cloud couldn't be reached at all
    bool needsFetch = false;             // what was undone here is to be fetched, or the feed knows more
  };

  Uploader(const SyncContext &context, AssetUploads &assets, ConflictCopies &conflicts,
           LocalExaminer &examiner);

  // Called for a document whose contents are in the cloud alone, and which is to leave it: they have to come
  // first.
  void setNeedsContents(std::function<void(const ItemRecord &item)> handler) {
    needsContents_ = std::move(handler);
  }

  // Asked why the newer version of a document that was written here, too, isn't here yet; nil: it is coming.
  void setProblemOfNewer(std::function<NSError(ItemNumber item)> ask) { problemOfNewer_ = std::move(ask); }

  // Asked whether a document of that name is to have a thumbnail.
  void setWantsThumbnail(std::function<bool(const std::string &name)> ask) {
    wantsThumbnail_ = std::move(ask);
  }
  // Has the cloud's state of what was deleted here come back.
  void setBringBack(std::function<void(const SyncRow &row)> handler) { bringBack_ = std::move(handler); }

  // Sends a batch of what is due.
  Round sendDue(const CKCallContext &call);

  struct Totals {
    std::uint64_t documents = 0, failed = 0, bytes = 0;
  };
  Totals totals() const;

 private:
  struct Plan {
    QueuedUpload entry;
    SyncRow row;
    DocumentRecord document;
    LocalFile file;                        // that is sent
    std::optional<DocumentMarker> marker;  // that it bore then
    bool isDeletion = false;
    bool hasContent = false;
    bool isDataless = false;
    bool changesMarker = false;
    bool changesTarget = false;
    std::string leaves;  // the share whose root this is: it is left, and nothing of the owner's is deleted
  };
  enum class Prepared { save, remove, later, nothing };

  Prepared prepare(const QueuedUpload &entry, Plan *plan, const CKCallContext &call);
  Prepared prepareDeletion(const std::optional<ItemRecord> &item, Plan *plan);
  void noteSent(const std::vector<Plan> &saves);
  static bool changesAnything(const Plan &plan);
  Prepared nothingToSend(const Plan &plan);
  Prepared prepareSave(const ItemRecord &item, Plan *plan, const CKCallContext &call);
  Prepared prepareDocument(const FileLocation &location, Plan *plan, const CKCallContext &call);
  Prepared prepareLink(const FileLocation &location, Plan *plan);
  Prepared sendContents(const FileLocation &location, Plan *plan, const CKCallContext &call);
  Prepared restorePartlyWritten(const FileLocation &location, const DocumentLook &look, Plan *plan);
  void saved(const Plan &plan, const CKRecord &record);
  void markFile(const Plan &plan, SyncRow *row);
  void removed(const Plan &plan);
  void saveFailed(const Plan &plan, const NSError &error, Round *round);
  void removeFailed(const Plan &plan, const NSError &error, Round *round);
  void failed(const Plan &plan, const NSError &error);
  Prepared laterWith(Plan *plan, const NSError &error);

  // What is particular to another account's zone (Uploader+Shared.cpp). The first two answer nothing where
  // the change goes the way of all others.
  std::optional<Prepared> prepareShared(const FileLocation &location, const std::string &parent, Plan *plan);
  std::optional<Prepared> prepareSharedDeletion(Plan *plan);
  std::optional<Prepared> keepMetadataHere(const FileLocation &location, Plan *plan);
  bool hasDatalessElsewhere(const SyncRow &row);
  bool hasChildrenThatLeave(const SyncRow &row);
  Prepared refuse(const Plan &plan, const NSError &error);
  Prepared undoChange(const FileLocation &location, const Plan &plan, const std::string &why);
  Prepared undoDeletion(const Plan &plan);
  bool putBack(const FileLocation &location, const SyncRow &row);
  bool isChangedInside(const FileLocation &location, const SyncRow &row) const;
  NSError readOnlyError(const FileLocation &location) const;
  // Whether it was answered; `round` is told what has to follow.
  bool saveRefused(const Plan &plan, const NSError &error, Round *round);
  CKRecord recordOf(const Plan &plan) const;

  const SyncContext &context_;
  AssetUploads &assets_;
  std::function<void(const ItemRecord &)> needsContents_;
  std::function<NSError(ItemNumber)> problemOfNewer_;
  std::function<bool(const std::string &)> wantsThumbnail_;
  std::function<void(const SyncRow &)> bringBack_;
  ConflictCopies &conflicts_;
  LocalExaminer &examiner_;
  std::uint64_t inlineBytes_ = 0;  // sent by this round on this thread
  NSError cloudProblem_;
  bool needsFetch_ = false;
  mutable Mutex mutex_;
  Totals totals_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
