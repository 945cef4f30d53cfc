#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "platform/cloudkit/CKCallContext.h"
#include "platform/cloudkit/CKError.h"
#include "platform/cloudkit/CKRecord.h"
#include "platform/cloudkit/CKShare.h"
#include "platform/foundation/UUID.h"

namespace droxa {

// How far a zone's changes were fetched. Opaque; a nil one means from the start. Keep the bytes as they are:
// they may be stored and used by a later process. Thread contract: a value.
struct CKServerChangeToken {
  NSData data;
  explicit operator bool() const { return static_cast<bool>(data); }
  bool operator==(const CKServerChangeToken &) const = default;
};

// Whose zones a database holds: the account's own, or those of others in which something is shared with it.
enum class CKDatabaseScope : std::uint8_t { privateDatabase, sharedDatabase };

enum class CKAccountStatus : std::uint8_t {
  couldNotDetermine,
  available,
  restricted,
  noAccount,
  temporarilyUnavailable
};

// What saving means for a record that the cloud has already.
enum class CKRecordSavePolicy : std::uint8_t {
  // Only if recordChangeTag is the cloud's ("": only if there is no such record); serverRecordChanged
  // otherwise, unknownItem if it is gone. Fields not named stay as they are, so that a record fetched with
  // desired keys can be changed and saved.
  ifServerRecordUnchanged,
  changedKeys,  // whatever the tag; fields not named stay as they are
  allKeys,      // whatever the tag; the fields become exactly those given
};

struct CKRecordDeletion {
  CKRecordID recordID;
  std::string recordChangeTag;  // "": whatever the cloud has; otherwise only that state, as for saving
  bool operator==(const CKRecordDeletion &) const = default;
};

struct CKModifyRequest {
  std::vector<CKRecord> recordsToSave;
  std::vector<CKRecordDeletion> recordsToDelete;
  CKRecordSavePolicy savePolicy = CKRecordSavePolicy::ifServerRecordUnchanged;
  bool isAtomic = true;  // all or nothing; then all records must be of one zone (invalidArguments otherwise)
};

// One record's outcome: an error, or nil and the record.
struct CKRecordResult {
  CKRecordID recordID;
  NSError error;
  CKRecord record;  // as the cloud has it now
};
struct CKDeleteResult {
  CKRecordID recordID;
  NSError error;
};

// `error` nil: all went well. partialFailure: look at each result. Anything else: the call as a whole failed,
// the results are empty, and after a networkFailure a modification may have been carried out all the same.
struct CKFetchReply {
  NSError error;
  std::vector<CKRecordResult> results;  // one a requested id, in that order
};
struct CKModifyReply {
  NSError error;
  std::vector<CKRecordResult> saved;    // one a record to save, in that order
  std::vector<CKDeleteResult> deleted;  // one a record to delete, in that order
};

struct CKDeletedRecord {
  CKRecordID recordID;
  std::string recordType;
  std::string modifiedByDevice;  // that deleted it
  bool operator==(const CKDeletedRecord &) const = default;
};
struct CKZoneChanges {
  NSError error;                                // nil, or nothing else is set
  std::vector<CKRecord> changedRecords;         // the latest state of each, the oldest change first
  std::vector<CKDeletedRecord> deletedRecords;  // the oldest first; never one of changedRecords
  CKServerChangeToken token;                    // what follows these changes
  bool moreComing = false;                      // there are more: ask again with the token
};

struct CKZoneList {
  NSError error;
  std::vector<CKRecordZoneID> zones;  // sorted
};
struct CKUploadReply {
  NSError error;
  CKAsset asset;  // a reference
};
struct CKAssetPresence {
  NSError error;
  bool isPresent = false;
};
struct CKAccountReply {
  NSError error;
  CKAccountStatus status = CKAccountStatus::couldNotDetermine;
};

struct CKUserIdentityReply {
  NSError error;
  CKUserIdentity identity;
};
struct CKShareParticipantResult {
  std::string lookup;  // as it was asked for
  NSError error;
  CKShareParticipant participant;  // a privateUser, readOnly and pending: to be put into a share
};
struct CKShareParticipantsReply {
  NSError error;
  std::vector<CKShareParticipantResult> results;  // one a name or handle, in that order
};
struct CKShareMetadataReply {
  NSError error;
  CKShareMetadata metadata;
};
// Both are opaque texts of printable characters.
struct CKShareTokens {
  NSError error;
  std::string shareToken;  // says that the account may read the record by the share it is in, if it is in one
  std::string baseToken;   // says that the account may read the record
};
enum class CKShareTokenKind : std::uint8_t { share, base };
struct CKShareTokenReply {
  NSError error;
  CKShareTokenKind kind = CKShareTokenKind::base;
  CKRecordID recordID;      // as the account that asks writes it
  std::string accountName;  // that the token was given to
};

// Called on the thread of the call, with bytes done and bytes in all; not after the call returned.
using CKProgressHandler = std::function<void(std::uint64_t done, std::uint64_t total)>;
// Takes the next bytes, at most 4 MiB at a time, on the thread of the call. An error that it returns ends the
// call, which answers that very error.
using CKAssetSink = std::function<NSError(std::span<const std::uint8_t> bytes)>;
// Told that these zones were changed, made or deleted through another CKCloud object (of this process,
// another one, or another device). Called any number of times on a thread of the cloud's own, one call at a
// time; may also come without a change. Fetch the changes elsewhere: the thread is to return soon.
using CKZonesChangedHandler = std::function<void(const std::vector<CKRecordZoneID> &zones)>;

// While it lives, the handler is called. Its destructor waits for a call in progress (unless it runs on the
// handler's own thread); none comes after it.
class CKSubscription {
 public:
  virtual ~CKSubscription() = default;
};

// The most records of one fetch or modify call; more are refused with limitExceeded.
inline constexpr std::size_t CKMostRecordsPerCall = 1000;
inline constexpr std::uint64_t CKLargestRecord = 1024 * 1024;  // bytes, assets not counted

// A cloud database as one account on one device sees it: its private one, with its own zones, or its shared
// one (sharedDatabase()), with those zones of others in which something is shared with it.
//
// Shares. A CKShare shares its root record and all that lies below it, by CKRecordParentKey, whenever it came
// there. Its owner, whose zone it is in, saves it through the private database; the root must be there, or be
// saved in the same call. The save makes a URL that can't be guessed, and stamps owner and participants:
// - participants are named by account name or, where that is "", by handle; new ones are pending until they
//   accept by the URL. Those left out have lost their access at once. Who came by the URL alone (publicUser)
//   stays only while the public permission isn't none, and has that permission.
// - unknownItem: no such account, or no root. alreadyShared: another share has the root. tooManyParticipants.
//   invalidArguments: no root in the share's zone, another root than before, or not the fields of a share.
// Deleting the share or its root withdraws the URL and everybody's access at once. Records may be in several
// shares, one inside the other; each account may what the most permissive of its shares allows.
//
// In the shared database a zone bears its owner's account name. There the account sees the records of the
// shares that it has accepted with a permission other than none, these shares themselves, and nothing else:
// - what it doesn't see is as if it weren't there, for every call. The zone is gone for it (zoneNotFound, and
//   not listed) as soon as nothing in it is shared with it.
// - a record that it may not see any more is told as deleted in the feed of changes, one that it now may see
//   as changed; tokens of the feed are good for this database and account alone.
// - permissionFailure: any change by one who may only read; saving a share; deleting a share's root; a new
//   record whose parent it can't write (give the parent first), or with a name that is taken, or that records
//   name as their parent; a record taken out of a share that it sees, or put where it can't write; making or
//   deleting the zone.
// - deleting a share there is leaving it: the account's part becomes `removed` (a publicUser's is gone).
//
// Assets can be read, and referred to by records, by accounts that see a record that refers to them, in
// either database, and by those that uploaded them. The bytes of all records of a zone count for its owner.
//
// Calls are synchronous; they return
// operationCancelled within about 50 ms after the context was cancelled and a timeout (CKErrorIsTimeout)
// after its deadline, and do not retry: CKOperation does. What a modification acknowledged has reached the
// disk. Every call can also answer any transient error (CKErrorIsTransient), notAuthenticated and
// internalError; all errors are of CKErrorDomain except a sink's own. Thread contract: every member may be
// called on any thread, concurrently.
class CKCloud {
 public:
  virtual ~CKCloud() = default;

  // Which cloud this is: another one answers another UUID, so that a device notices when its cloud was
  // replaced. Null when it can't be told now.
  virtual UUID cloudIdentifier() = 0;
  virtual CKAccountReply accountStatus(const CKCallContext &context) = 0;
  virtual const std::string &deviceName() const = 0;
  virtual std::string description() const = 0;  // for people

  // The same account's and device's shared database; of a shared database, one like itself.
  virtual std::shared_ptr<CKCloud> sharedDatabase() = 0;

  // Makes the zone; nil also when there is one. invalidArguments for a name or an owner that can't be.
  virtual NSError saveZone(const CKRecordZoneID &zone, const CKCallContext &context) = 0;
  // Deletes the zone and its records for good; zoneNotFound when there is none.
  virtual NSError deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) = 0;
  virtual CKZoneList listZones(const CKCallContext &context) = 0;

  // Per record: unknownItem, zoneNotFound, invalidArguments. Of the call: limitExceeded.
  virtual CKFetchReply fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                                    const CKCallContext &context) = 0;

  // Saves and deletes. File assets are uploaded first, outside of the transaction; the saved records hold
  // references to them. A saved record answers all its fields and its new change tag. Deleting what isn't
  // there succeeds. Records with no error of one call become visible to others at once.
  // An atomic call that fails has looked at the other records all the same: every conflict is told at once.
  // Per record: serverRecordChanged, unknownItem (a tag was given and the record is gone), zoneNotFound,
  // invalidArguments, limitExceeded (too large), quotaExceeded, assetFileNotFound, assetFileModified; in an
  // atomic call that failed batchRequestFailed for the others. Of the call: limitExceeded, invalidArguments
  // (an id twice; an atomic call over several zones).
  virtual CKModifyReply modifyRecords(const CKModifyRequest &request, const CKCallContext &context) = 0;

  // What changed since the token (nil: all records that there are, no deletions), at most `limit` records and
  // deletions (1 to CKMostRecordsPerCall; fewer where records are large). The caller's own changes are among
  // them. changeTokenExpired: the token is of another cloud, of an earlier zone of that name, or unreadable.
  // zoneNotFound. A record that changes while pages are fetched comes (again) on a later page.
  virtual CKZoneChanges fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &token,
                                         const CKDesiredKeys &desiredKeys, std::size_t limit,
                                         const CKCallContext &context) = 0;

  // Reads `size` bytes from offset 0 with pread(2) and stores them; parts that the cloud has are not stored
  // again. Contents that no record refers to within a day may be collected.
  // assetFileModified: the file isn't of that size, or changed meanwhile. quotaExceeded. assetFileNotFound:
  // it can't be read (the underlying error says why).
  virtual CKUploadReply uploadAsset(int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                                    const CKCallContext &context) = 0;

  // Gives the bytes from `offset` to the end to the sink, in order. nil: all were given. Otherwise the bytes
  // given so far are good to be kept, and another call may continue after them.
  // unknownItem: the cloud has no such contents. assetNotAvailable: they are damaged or parts are missing;
  // the text names the asset. invalidArguments: an offset beyond the end. The whole digest is for the caller
  // to verify (CKDigest; CKFetchAssetOperation does).
  virtual NSError readAsset(const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                            const CKProgressHandler &progress, const CKCallContext &context) = 0;

  virtual CKAssetPresence hasAsset(const CKAssetReference &asset, const CKCallContext &context) = 0;

  // Who the account is.
  virtual CKUserIdentityReply currentUserIdentity(const CKCallContext &context) = 0;
  // Finds accounts, each by its name or its handle, exactly as written. Per result: unknownItem. Of the call:
  // limitExceeded (more than CKMostShareParticipants), partialFailure.
  virtual CKShareParticipantsReply lookUpShareParticipants(const std::vector<std::string> &namesOrHandles,
                                                           const CKCallContext &context) = 0;
  // Of the share with that URL. unknownItem: there is none, or not any more. participantMayNeedVerification:
  // the account isn't among the participants, and the public permission is none.
  virtual CKShareMetadataReply fetchShareMetadata(const NSURL &url, const CKCallContext &context) = 0;
  // Makes the account one of those who see what is shared, by the URL; what was accepted before stays so, and
  // the owner's own share is answered as it is. Errors as fetchShareMetadata's, and permissionFailure (the
  // participant's permission is none), tooManyParticipants.
  virtual CKShareMetadataReply acceptShare(const NSURL &url, const CKCallContext &context) = 0;

  // Tokens by which the account can show to others that it may read a record. unknownItem, zoneNotFound and
  // invalidArguments as for fetching it.
  virtual CKShareTokens shareTokens(const CKRecordID &record, const CKCallContext &context) = 0;
  // What a token says, now: unknownItem unless the asking account itself sees the record (in its private
  // database or its shared one); permissionFailure when the token's account doesn't any more, or not by that
  // share; invalidArguments when this cloud never gave it.
  virtual CKShareTokenReply verifyShareToken(const std::string &token, const CKCallContext &context) = 0;

  // Null, with an error, when changes can't be watched. Changes made before it returned aren't told. Keeps
  // itself going when the cloud object is released first.
  virtual std::unique_ptr<CKSubscription> subscribe(CKZonesChangedHandler handler, NSError *error) = 0;
};

}  // namespace droxa
