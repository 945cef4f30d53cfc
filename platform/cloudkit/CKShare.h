#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/CKRecord.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// The type of the records that hold shares; see CKShare.
inline constexpr char CKRecordTypeShare[] = "share";
// The key of a record that names the record above it, of the same zone, as a string.
inline constexpr char CKRecordParentKey[] = "parent";
// Keys of a share's own fields: what people call it, and what it is of (any string; tells a folder's share
// from a document's).
inline constexpr char CKShareTitleKey[] = "title";
inline constexpr char CKShareTypeKey[] = "type";

// The most participants of a share, its owner counted.
inline constexpr std::size_t CKMostShareParticipants = 100;

// Who an account is, for programs and for people. Thread contract: a value.
struct CKUserIdentity {
  std::string accountName;  // names the account in the cloud; the owner name of its zones for others
  std::string displayName;  // "" when it has none
  std::string handle;       // by which others find it, an address for example; "" when it has none

  std::string description() const;  // "accountName (displayName, handle)"
  bool operator==(const CKUserIdentity &) const = default;
};

enum class CKShareParticipantRole : std::uint8_t {
  owner,
  privateUser,  // named by the owner
  publicUser,   // came by the URL; may what the public permission says
};
// In rising order: what may write may read.
enum class CKShareParticipantPermission : std::uint8_t { none, readOnly, readWrite };
enum class CKShareParticipantAcceptanceStatus : std::uint8_t {
  pending,
  accepted,
  removed,  // left by itself; may accept again as long as the owner leaves it among the participants
};

// One account's part in a share. Thread contract: a value.
struct CKShareParticipant {
  CKUserIdentity userIdentity;
  CKShareParticipantRole role = CKShareParticipantRole::privateUser;
  CKShareParticipantPermission permission = CKShareParticipantPermission::readOnly;
  // The cloud's: what a save says of it doesn't count.
  CKShareParticipantAcceptanceStatus acceptanceStatus = CKShareParticipantAcceptanceStatus::pending;

  std::string description() const;
  bool operator==(const CKShareParticipant &) const = default;
};

// A record and everything below it, by CKRecordParentKey, shared with others. A share is a record of the
// root's zone, of type CKRecordTypeShare: it is saved, fetched, deleted and told in the feed of changes as
// one; record() and shareWithRecord() go from one form to the other.
// Saving makes the URL and stamps the owner and the participants; CKCloud.h says who may do what.
// Thread contract: a value.
struct CKShare {
  CKRecordID recordID;
  std::string recordChangeTag;             // as CKRecord's
  NSDate modificationDate;                 // as CKRecord's
  std::string modifiedByDevice;            // as CKRecord's
  std::optional<CKRecordID> rootRecordID;  // of the share's own zone; absent: shares nothing, can't be saved
  std::vector<CKShareParticipant> participants;  // the owner first, once it was saved
  // What everybody may do who has the URL.
  CKShareParticipantPermission publicPermission = CKShareParticipantPermission::none;
  NSURL URL;  // nil before it was saved; the cloud's
  // CKShareTitleKey, CKShareTypeKey and whatever else programs note.
  std::map<std::string, CKRecordValue> fields;

  // A new share of the record, in its zone and with a name that no other has.
  static CKShare shareWithRootRecordID(const CKRecordID &root);
  // Absent when the record is of another type, or isn't one that a share can be read from.
  static std::optional<CKShare> shareWithRecord(const CKRecord &record);
  CKRecord record() const;

  bool isKnownToServer() const { return !recordChangeTag.empty(); }
  const CKShareParticipant *owner() const;  // null before it was saved
  const CKShareParticipant *participantWithAccountName(const std::string &accountName) const;

  // The value of a key, or null when the share has none or one of another kind.
  template <class T>
  const T *get(const std::string &key) const {
    const auto found = fields.find(key);
    return found == fields.end() ? nullptr : std::get_if<T>(&found->second);
  }

  std::string description() const;
  bool operator==(const CKShare &) const = default;
};

// What somebody who has a share's URL is told of it. Until the account has accepted it, the share's
// participants are the owner and the account itself alone, and its permission is what it would get.
// Thread contract: a value.
struct CKShareMetadata {
  CKShare share;             // its ids as the asking account writes them: the zone bears the owner's name
  CKShareParticipant owner;  // of the share
  CKShareParticipant participant;  // the asking account

  std::string description() const;
  bool operator==(const CKShareMetadata &) const = default;
};

// CKServerRecordIsOwnSave for the records of shares: whether `server` is what the cloud would hold right
// after `client` was saved, whatever the cloud itself filled in.
bool CKServerShareIsOwnSave(const CKShare &client, const CKShare &server);

}  // namespace droxa
