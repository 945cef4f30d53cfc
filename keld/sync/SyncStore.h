#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "keld/ItemRecord.h"
#include "keld/Sql.h"
#include "platform/cloudkit/CKRecordID.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// The key of the text that tells which cloud the drive is in; "" before it met one.
inline constexpr char kSyncCloudIdentifier[] = "cloudIdentifier";

// What a document's contents are, as the cloud tells them.
struct ContentVersion {
  std::uint64_t size = 0;
  std::int64_t modified = 0;  // nanoseconds since 1970
  std::string digest;         // SHA-256 in hexadecimal; "" for what has no contents
  std::uint32_t mode = 0;
  bool operator==(const ContentVersion &) const = default;
};

// The local file whose contents were last known to be those of the cloud. A file that differs was changed
// here.
struct LocalFile {
  std::uint64_t inode = 0;
  std::uint64_t size = 0;
  std::int64_t modified = 0;
  std::int64_t changed = 0;  // compared only where a mistake would lose something
  bool operator==(const LocalFile &) const = default;
};

// What is known of one record of the cloud: its state when this device last agreed with it, and the item that
// stands for it here.
struct SyncRow {
  std::string record;   // its name
  ItemNumber item = 0;  // 0: none yet, or it is gone
  std::string tag;      // the change tag
  std::string parent;   // the parent's record name, or that of a container's documents folder
  std::string name;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  ContentVersion content;
  LocalFile local;
  bool isDataless = false;
  ItemMetadata metadata;
  // A newer version that is to replace the local contents; digest "" when there is none.
  std::string newerTag;
  ContentVersion newer;

  bool hasNewer() const { return !newerTag.empty(); }
};

// One item whose local state isn't in the cloud (yet).
struct QueuedUpload {
  std::int64_t sequence = 0;
  ItemNumber item = 0;
  std::int64_t generation = 0;  // goes up whenever the item changes again
  std::int64_t attempts = 0;
  bool isDeletion = false;
  bool isHeld = false;     // a deletion that waits for a person's word
  bool isRefused = false;  // for good, as things stand: not tried again until something changes
  NSError error;           // of the last attempt
};

// A record that is about to be given a file or folder of its own here, and where that is to be.
struct UnfinishedRecord {
  std::string record, parent, name;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
};

// What this account may do in one share of another's zone.
struct ShareAccess {
  std::string share, root;  // their records
  bool isWritable = false;
  bool operator==(const ShareAccess &) const = default;
};

// A share that this account sees: the zone that it is in, and the record that it shares with all below it.
struct KnownShare {
  CKRecordID record;
  std::string root;   // its record's name
  std::string owner;  // the account's name; "" when the share didn't tell
  bool operator==(const KnownShare &) const = default;
};

// A document that is to have a thumbnail, once its record has exactly these contents.
struct WantedThumbnail {
  std::string record;
  std::string digest;
  // A file with these contents that isn't the item's own, whose document may be dataless here; "": none.
  std::string source;
  LocalFile sourceFile;  // as it was when its contents were sent
};

// The device's side of the sync, in a database of its own: what is known of the cloud's records, the uploads
// that wait, and how far both feeds were read. It survives kill -9 at any moment, and can be thrown away: the
// markers on the files and the cloud have everything again.
//
// Thread contract: any thread; each call is one transaction, several calls are one inside transaction(). All
// throw SqlError.
class SyncStore {
 public:
  explicit SyncStore(const std::string &path);

  // Runs `work` as one transaction; calls made by it on this thread belong to it.
  void transaction(const std::function<void()> &work);

  // Rows.
  std::optional<SyncRow> byRecord(const std::string &record);
  std::optional<SyncRow> byItem(ItemNumber item);
  std::optional<SyncRow> byName(const std::string &parent, const std::string &name);
  std::vector<SyncRow> childrenOf(const std::string &parent, std::uint64_t limit);
  std::optional<SyncRow> byNewerTag(const std::string &tag);
  std::vector<SyncRow> unbound(std::uint64_t limit);  // in the cloud, and no item stands for them yet
  std::vector<SyncRow> withNewerVersion(std::uint64_t limit);
  void put(const SyncRow &row);
  void erase(const std::string &record);
  std::uint64_t countRows();
  std::vector<std::string> recordsInCloud();
  // The item database is a new one: every item has another number. Rows find their items by the markers, and
  // pins follow them.
  void unbindAll();
  std::vector<std::string> unboundInCloud();  // records that no item stands for
  std::vector<SyncRow> datalessRows();

  // Records that came before their parents, and those that are to be asked for again: orphans whose parent
  // has come, and what couldn't be made here.
  void keepOrphan(const std::string &record, const std::string &parent);
  std::uint64_t countOrphans();
  std::uint64_t fetchOrphansOf(const std::string &parent);  // how many
  void dropOrphan(const std::string &record);
  void fetchAgain(const std::string &record);
  std::vector<std::string> toFetch(std::uint64_t limit);
  void fetched(const std::string &record);
  std::uint64_t countToFetch();

  // What is made before its row is committed is written down first, on the disk before this returns, so that
  // a file that was made by a transaction that never ended isn't taken for a person's. Not to be called
  // inside a transaction; finished() belongs to the one that has the row.
  void beginUnfinished(const std::vector<UnfinishedRecord> &records);
  void finished(const std::string &record);
  std::vector<UnfinishedRecord> unfinished();
  std::optional<UnfinishedRecord> unfinished(const std::string &record);
  void forgetUnfinished();  // all

  // Shares, as the feeds of changes tell them.
  void putShare(const KnownShare &share);
  void eraseShare(const CKRecordID &record);
  std::optional<KnownShare> share(const CKRecordID &record);
  std::optional<KnownShare> shareOfRoot(const std::string &root);
  std::vector<KnownShare> shares();  // all

  // Contents whose save was begun, and may have been carried out without this device being told.
  void noteSent(const std::string &record, const std::string &digest);
  void forgetSent(const std::string &record);
  bool wasSent(const std::string &record, const std::string &digest);

  // The queue of uploads, in the order of the changes.
  void enqueue(ItemNumber item, bool isDeletion, bool isHeld, std::int64_t notBeforeMilliseconds = 0);
  std::optional<QueuedUpload> queued(ItemNumber item);
  // Those that are due, oldest first.
  std::vector<QueuedUpload> due(std::int64_t nowMilliseconds, std::uint64_t limit);
  std::vector<QueuedUpload> allQueued(std::uint64_t limit);
  std::optional<std::int64_t> nextRetry();    // when the next one that failed is due
  void uploaded(const QueuedUpload &upload);  // unless it changed again meanwhile
  void dropQueued(ItemNumber item);
  // Not before that time again. A nil error: it wasn't tried, something else comes first.
  void uploadFailed(const QueuedUpload &upload, const NSError &error, std::int64_t retryMilliseconds);
  // Not before the item changes again, or retryRefused().
  void uploadRefused(const QueuedUpload &upload, const NSError &error);
  void retryRefused();
  void retryNow(ItemNumber item);
  void retryAllNow();
  std::uint64_t countQueued();
  std::uint64_t countFailed();
  std::uint64_t countHeld();
  // Deletions that nobody is known to have asked for.
  std::uint64_t countDeletions(std::int64_t nowMilliseconds);
  void holdDeletions(std::int64_t nowMilliseconds);  // all of them that wait
  void releaseHeld();
  std::vector<QueuedUpload> held(std::uint64_t limit);

  // Deletions that a person asked for, before the items died; they are never held. What wasn't deleted by
  // that time is an item like any other again; what was is kept allowed until the deletion is sent.
  void allowDeletions(const std::vector<ItemNumber> &items, std::int64_t nowMilliseconds,
                      std::int64_t untilMilliseconds);
  bool isDeletionAllowed(ItemNumber item, std::int64_t nowMilliseconds);
  void keepAllowedDeletion(ItemNumber item);
  void forgetAllowedDeletion(ItemNumber item);

  // Thumbnails that are wanted; the last want of a record counts.
  void wantThumbnail(const WantedThumbnail &wanted);
  // Those whose contents are known to be in the cloud, with an item that stands for them.
  std::vector<WantedThumbnail> dueThumbnails(std::uint64_t limit);
  void thumbnailSettled(const std::string &record,
                        const std::string &digest);  // saved, or there will be none
  void dropStaleThumbnails();                        // of contents that a record doesn't have any more
  std::uint64_t countThumbnails();
  std::uint64_t thumbnailNews();  // goes up with every want of this process

  // Of a shared zone alone: the shares, and the records that hang at its top because their own parents aren't
  // to be seen by this account; these are asked for again when that changes.
  std::optional<ShareAccess> accessByShare(const std::string &share);
  std::optional<ShareAccess> accessByRoot(const std::string &root);
  void putAccess(const ShareAccess &access);
  void dropAccess(const std::string &share);
  void forgetAccesses();  // all
  void setTop(const std::string &record, const std::string &parent);
  void dropTop(const std::string &record);
  bool isTop(const std::string &record);
  void fetchTopsOf(const std::string &parent);
  void hangOrphans();  // whose parents aren't among the rows

  // Pins, by item.
  void setPinned(ItemNumber item, bool isPinned);
  bool isPinned(ItemNumber item);
  std::vector<ItemNumber> pins();

  std::uint64_t number(const char *key);
  void setNumber(const char *key, std::uint64_t value);
  std::string text(const char *key);
  void setText(const char *key, std::string_view value);

 private:
  SyncRow read(const SqlStatement &row);
  std::optional<SyncRow> one(SqlStatement &statement);
  std::vector<SyncRow> all(SqlStatement &statement);
  static std::vector<UnfinishedRecord> readUnfinished(SqlStatement &asked);
  static std::vector<KnownShare> readShares(SqlStatement &asked);
  QueuedUpload readQueued(const SqlStatement &row);
  std::vector<QueuedUpload> queuedOf(SqlStatement &statement);
  SqlStatement &statement(const char *sql) REQUIRES(mutex_);
  std::uint64_t count(const char *sql);

  RecursiveMutex mutex_;
  SqlDatabase database_ GUARDED_BY(mutex_);
  std::map<const char *, std::unique_ptr<SqlStatement>> statements_ GUARDED_BY(mutex_);  // by the literal
  int depth_ GUARDED_BY(mutex_) = 0;
  std::uint64_t thumbnailNews_ GUARDED_BY(mutex_) = 0;
};

}  // namespace droxa::keld
