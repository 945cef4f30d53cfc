// Who people are, and what is known of shares without asking for anything else.

#include <algorithm>
#include <utility>

#include "keld/sharing/SharingService.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {

namespace {

// The last word is taken for the family's name.
std::optional<NSPersonNameComponents> nameOf(const std::string &displayName) {
  const std::size_t begin = displayName.find_first_not_of(' ');
  if (begin == std::string::npos) return std::nullopt;
  const std::string text = displayName.substr(begin, displayName.find_last_not_of(' ') + 1 - begin);
  NSPersonNameComponents name;
  const std::size_t space = text.rfind(' ');
  name.givenName = text.substr(0, text.find_last_not_of(' ', space) + 1);
  if (space == std::string::npos)
    name.givenName = text;
  else
    name.familyName = text.substr(space + 1);
  return name;
}

std::optional<std::string> orNil(const std::string &text) {
  return text.empty() ? std::nullopt : std::optional<std::string>(text);
}

const std::string &lookupName(const CKShareParticipant &participant) {
  const CKUserIdentity &who = participant.userIdentity;
  return who.accountName.empty() ? who.handle : who.accountName;
}

}  // namespace

void SharingService::copyCurrentUser(const SharingCaller &caller, QVCurrentUserReply reply) {
  const auto user = std::make_shared<CKUserIdentity>();
  const auto perform = [this, user](SharingOperation &operation) {
    const CKUserIdentityReply answer =
        places_.ofZone({"", CKCurrentUserDefaultName}).cloud->currentUserIdentity(operation.call());
    *user = answer.identity;
    return answer.error;
  };
  start(caller, perform, [user, reply = std::move(reply)](const NSError &error) {
    if (error) return reply(std::nullopt, std::nullopt, std::nullopt, std::nullopt, error);
    reply(nameOf(user->displayName), orNil(user->accountName), orNil(user->handle), orNil(user->displayName),
          error);
  });
}

// Leaves those in `participants` that were found.
NSError SharingService::lookUp(SharingOperation &operation, std::vector<CKShareParticipant> *participants) {
  const std::vector<CKShareParticipant> asked = std::exchange(*participants, {});
  if (asked.empty()) return NSError();
  std::vector<std::string> names;
  names.reserve(asked.size());
  for (const CKShareParticipant &each : asked) names.push_back(lookupName(each));
  const CKShareParticipantsReply reply =
      places_.ofZone({"", CKCurrentUserDefaultName}).cloud->lookUpShareParticipants(names, operation.call());
  if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) return reply.error;
  std::string missing;
  NSError why;
  for (std::size_t index = 0; index < reply.results.size() && index < asked.size(); ++index) {
    const CKShareParticipantResult &result = reply.results[index];
    if (!result.error) {
      participants->push_back(result.participant);
      participants->back().permission = asked[index].permission;
      continue;
    }
    missing += (missing.empty() ? "\"" : ", \"") + names[index] + "\"";
    if (!why) why = result.error;
  }
  if (!why) return NSError();
  return CKErrorMake(CKErrorCode::partialFailure, "the cloud knows nobody called " + missing, why);
}

void SharingService::lookUpParticipants(const SharingCaller &caller, const QVShareParticipants &participants,
                                        QVParticipantsReply reply) {
  const auto found = std::make_shared<QVShareParticipants>();
  const auto perform = [this, participants, found](SharingOperation &operation) {
    if (!participants)
      return qvc_error(QVErrorInvalidArgument, "no participants were given; name those to be looked up");
    std::vector<CKShareParticipant> people = *participants;
    const NSError error = lookUp(operation, &people);
    if (!error || CKErrorIs(error, CKErrorCode::partialFailure)) *found = people;
    return error;
  };
  start(caller, perform, [found, reply = std::move(reply)](const NSError &error) { reply(*found, error); });
}

// --- What is known here.

NSError SharingService::checkShareable(ItemNumber number) const {
  const std::string name = QVFileObjectID::folderOrAliasID(number).asString();
  const auto record = items_.item(number);
  const bool isThere = record && record->parent != kLimboFolder &&
                       (record->isFolder() || record->facts.kind == NSFileProviderItemKind::alias);
  if (!isThere) return qvc_errorNoSuchItem(name);
  const SharingItem item = items_.described(*record);
  if (const NSError error = items_.checkShareable(item.item, item.path)) return error;
  if (!item.isInCloud())
    return qvc_error(QVErrorNotShareable, item.path + ": the cloud doesn't have it yet; ask again later");
  const SharingPlace place = placeOf(item);
  if (!place.isOwn)
    return qvc_error(QVErrorNotShareable,
                     item.path + ": belongs to " + place.zone.ownerName + ", who alone can share it");
  return NSError();
}

ShareOptions SharingService::shareOptions(const ItemRecord &item) const {
  ShareOptions options;
  options.isSharedByItself = items_.shareOf(item).has_value();
  items_.forEachUpwards(item, [&](const ItemRecord &each) {
    const auto known = items_.shareOf(each);
    if (!known) return true;
    options.isShared = true;
    if (!places_.ofZone(known->record.zoneID).isOwn) options.isSharedByOthers = true;
    if (each.isFolder()) options.sharedFolderName = each.name;
    return true;
  });
  return options;
}

NSError SharingService::sharesOf(SharingOperation &operation, ItemNumber number) {
  auto item = items_.item(number);
  if (!item) return qvc_errorNoSuchItem(std::to_string(number));
  if (const NSError error = refresh(operation, host_.engineOf(*item))) return error;
  item = items_.item(number);
  if (!item) return qvc_errorNoSuchItem(std::to_string(number));
  CKShare share;
  const NSError error = fetchNearest(operation, *item, &share);
  return error.is(QVTessalyErrorDomain, QVErrorNoShare) ? NSError() : error;
}

void SharingService::refreshSharingState(const SharingCaller &caller, ItemNumber number, QVErrorReply reply) {
  const auto perform = [this, number](SharingOperation &operation) { return sharesOf(operation, number); };
  start(caller, perform, std::move(reply));
}

std::map<QVFileObjectID, CKRecordID> SharingService::contentRecords(
    const std::vector<QVFileObjectID> &identifiers) const {
  std::map<QVFileObjectID, CKRecordID> records;
  for (const QVFileObjectID &identifier : identifiers) {
    if (!identifier.isDocumentID()) continue;
    const auto record = items_.item(identifier.number());
    const auto engine = record ? host_.engineOf(*record) : nullptr;
    const auto row = engine ? engine->store().byItem(record->id) : std::nullopt;
    const bool isDocument = row && row->kind == NSFileProviderItemKind::document;
    if (isDocument && !row->tag.empty())
      records.emplace(identifier, places_.ofZone(engine->scope().zone).recordID(row->record));
  }
  return records;
}

}  // namespace droxa::keld
