#include "keld/sharing/SharingService.h"

#include <algorithm>
#include <utility>

#include "tessaly/QVErrors.h"
#include "tessaly/QVShareTypes.h"

namespace droxa::keld {

namespace {

constexpr int kMostTries = 4;  // of a change that others make at the same time

NSError noShareGiven() {
  return qvc_error(QVErrorInvalidArgument, "no share was given; name the share that is meant");
}

NSError noShareOf(const std::string &path) {
  return qvc_error(QVErrorNoShare, path + ": there is no share of this item");
}

bool isGone(const NSError &error) {
  return CKErrorIs(error, CKErrorCode::unknownItem) || CKErrorIs(error, CKErrorCode::zoneNotFound);
}

}  // namespace

SharingService::SharingService(SharingHost host, SharingPlaces places, SharingOptions options)
    : host_(std::move(host)),
      places_(std::move(places)),
      items_(host_),
      queue_(std::make_shared<SharingQueue>(options)) {}

void SharingService::start(const SharingCaller &caller, Perform perform,
                           std::function<void(const NSError &)> answer) {
  const auto checked = [self = shared_from_this(),
                        perform = std::move(perform)](SharingOperation &operation) {
    return self->host_.isSignedIn() ? perform(operation) : qvc_errorLoggedOut();
  };
  queue_->start(caller.owner, caller.client, {checked, std::move(answer)});
}

// --- What is known here follows.

void SharingService::noteSaved(const CKShare &share) {
  const auto engine = engineOf(share.recordID.zoneID);
  if (!engine) return;
  KnownShares(engine->store(), engine->states()).note(share);
  engine->states().flush();
  engine->cloudChanged();
}

void SharingService::noteGone(const CKRecordID &share) {
  const auto engine = engineOf(share.zoneID);
  if (!engine) return;
  KnownShares(engine->store(), engine->states()).forget(share);
  engine->states().flush();
  engine->cloudChanged();
}

std::shared_ptr<SyncEngine> SharingService::engineOf(const CKRecordZoneID &zone) const {
  return host_.engineOfZone(places_.ofZone(zone).zone);
}

std::optional<SyncRow> SharingService::rowOf(const CKRecordID &record) const {
  const auto engine = engineOf(record.zoneID);
  return engine ? engine->store().byRecord(record.recordName) : std::nullopt;
}

NSError SharingService::refresh(SharingOperation &operation, const std::shared_ptr<SyncEngine> &engine) {
  if (!engine) return NSError();
  return operation.await("asking the cloud for its changes",
                         [&engine](SharingOperation::Done done) { engine->fetchNow(std::move(done)); });
}

// --- Fetching.

NSError SharingService::fetch(SharingOperation &operation, const KnownShare &known, CKShare *share) {
  const SharingPlace place = places_.ofZone(known.record.zoneID);
  const CKRecordID id = place.recordID(known.record.recordName);
  const CKFetchReply reply = place.cloud->fetchRecords({id}, std::nullopt, operation.call());
  const NSError error = reply.results.empty() ? reply.error : reply.results.front().error;
  if (isGone(error)) noteGone(known.record);
  if (error) return error;
  const auto fetched = CKShare::shareWithRecord(reply.results.front().record);
  if (!fetched)
    return CKErrorMake(CKErrorCode::internalError, "the cloud's share " + id.description() + " isn't one");
  *share = *fetched;
  if (const auto engine = engineOf(fetched->recordID.zoneID)) {
    KnownShares(engine->store(), engine->states()).note(*fetched);
    engine->states().flush();
  }
  return NSError();
}

// One that went while it was asked for isn't the nearest.
NSError SharingService::fetchNearest(SharingOperation &operation, const ItemRecord &item, CKShare *share) {
  for (;;) {
    const auto known = items_.nearestShare(item);
    if (!known) return noShareOf(items_.described(item).path);
    const NSError error = fetch(operation, *known, share);
    if (!isGone(error)) return error;
  }
}

NSError SharingService::fetchOwn(SharingOperation &operation, const NSURL &url, CKShare *share) {
  SharingItem item;
  if (const NSError error = items_.find(operation, url, &item)) return error;
  if (const NSError error = refresh(operation, item.engine)) return error;
  const auto known = items_.shareOf(item.item);
  if (!known) return noShareOf(item.path);
  const NSError error = fetch(operation, *known, share);
  return isGone(error) ? noShareOf(item.path) : error;
}

void SharingService::copySharingInfo(const SharingCaller &caller, const NSURL &url,
                                     QVShareAndURLReply reply) {
  const auto share = std::make_shared<std::optional<CKShare>>();
  const auto perform = [this, url, share](SharingOperation &operation) {
    SharingItem item;
    if (const NSError error = items_.find(operation, url, &item)) return error;
    if (const NSError error = refresh(operation, item.engine)) return error;
    CKShare fetched;
    const NSError error = fetchNearest(operation, item.item, &fetched);
    if (!error) *share = fetched;
    return error;
  };
  start(caller, perform,
        [share, reply = std::move(reply)](const NSError &error) { reply(*share, {}, error); });
}

// --- Saving.

NSError SharingService::save(SharingOperation &operation, const CKShare &share, CKShare *saved,
                             const std::string &appName) {
  if (!share.rootRecordID)
    return qvc_error(QVErrorInvalidArgument,
                     "the share " + share.recordID.description() +
                         " has no root record; make one with createSharingInfoForURL");
  const SharingPlace place = places_.ofZone(share.recordID.zoneID);
  CKModifyRequest request;
  request.recordsToSave.push_back(SharingPlaces::shareInPlace(place, share).record());
  CKCallContext call = operation.call();
  call.sourceApplicationBundleIdentifier = appName;
  const CKModifyReply reply = place.cloud->modifyRecords(request, call);
  CKRecord record = request.recordsToSave.front();
  NSError error = reply.saved.empty() ? reply.error : reply.saved.front().error;
  if (!error) record = reply.saved.front().record;
  // A save whose reply was lost, asked for again.
  if (const auto server = CKErrorServerRecord(error);
      server && CKServerRecordIsOwnSave(record, *server, place.cloud->deviceName())) {
    record = *server;
    error = NSError();
  }
  if (error) return error;
  const auto now = CKShare::shareWithRecord(record);
  if (!now) return CKErrorMake(CKErrorCode::internalError, "the cloud answered no share");
  *saved = *now;
  noteSaved(*now);
  return NSError();
}

void SharingService::saveSharingInfo(const SharingCaller &caller, const std::optional<CKShare> &share,
                                     QVShareReply reply) {
  const auto saved = std::make_shared<std::optional<CKShare>>();
  const auto perform = [this, share, saved](SharingOperation &operation) {
    if (!share) return noShareGiven();
    CKShare now;
    const NSError error = save(operation, *share, &now);
    if (!error) *saved = now;
    return error;
  };
  start(caller, perform, [saved, reply = std::move(reply)](const NSError &error) { reply(*saved, error); });
}

void SharingService::copyShareURL(const SharingCaller &caller, const std::optional<CKShare> &share,
                                  const std::optional<std::string> &appName, QVShareAndURLReply reply) {
  const auto known = std::make_shared<std::optional<CKShare>>();
  const auto perform = [this, share, appName, known](SharingOperation &operation) {
    if (!share) return noShareGiven();
    CKShare now = *share;
    NSError error;
    if (!share->isKnownToServer())
      error = save(operation, *share, &now, appName.value_or(""));
    else if (!share->URL)
      error = fetch(operation, {share->recordID, "", ""}, &now);
    if (!error) *known = now;
    return error;
  };
  start(caller, perform, [known, reply = std::move(reply)](const NSError &error) {
    reply(*known, *known ? (*known)->URL : NSURL(), error);
  });
}

NSError SharingService::makeShare(SharingOperation &operation, const NSURL &url, CKShare *share) {
  SharingItem item;
  if (const NSError error = items_.findInCloud(operation, url, &item)) return error;
  const SharingPlace place = placeOf(item);
  if (!place.isOwn)
    return qvc_error(QVErrorNotShareable,
                     item.path + ": belongs to " + place.zone.ownerName + ", who alone can share it");
  *share = CKShare::shareWithRootRecordID(place.recordID(item.row->record));
  share->fields[CKShareTitleKey] = item.item.name;
  share->fields[CKShareTypeKey] = std::string(item.item.isFolder() ? QVFolderShareType : QVDocumentShareType);
  return NSError();
}

void SharingService::createSharingInfo(const SharingCaller &caller, const NSURL &url, QVShareReply reply) {
  const auto made = std::make_shared<std::optional<CKShare>>();
  const auto perform = [this, url, made](SharingOperation &operation) {
    CKShare share;
    const NSError error = makeShare(operation, url, &share);
    if (!error) *made = share;
    return error;
  };
  start(caller, perform, [made, reply = std::move(reply)](const NSError &error) { reply(*made, error); });
}

// --- Withdrawing.

NSError SharingService::withdraw(SharingOperation &operation, const CKShare &share, bool forceDelete) {
  if (!share.isKnownToServer() && !forceDelete) return NSError();  // nothing was ever shared
  const SharingPlace place = places_.ofZone(share.recordID.zoneID);
  CKModifyRequest request;
  request.recordsToDelete.push_back(
      {place.recordID(share.recordID.recordName), forceDelete ? "" : share.recordChangeTag});
  const CKModifyReply reply = place.cloud->modifyRecords(request, operation.call());
  NSError error = reply.deleted.empty() ? reply.error : reply.deleted.front().error;
  const bool isGoneAlready = isGone(error);
  if (!error || isGoneAlready) noteGone(request.recordsToDelete.front().recordID);
  return isGoneAlready && forceDelete ? NSError() : error;
}

void SharingService::unshare(const SharingCaller &caller, const std::optional<CKShare> &share,
                             bool forceDelete, QVShareOutcomeReply reply) {
  const auto perform = [this, share, forceDelete](SharingOperation &operation) {
    return share ? withdraw(operation, *share, forceDelete) : noShareGiven();
  };
  start(caller, perform, std::move(reply));
}

// --- Access by the URL alone.

NSError SharingService::setPublicAccess(SharingOperation &operation, const NSURL &url, bool allowAccess,
                                        CKShare *share) {
  NSError error;
  for (int tries = 0; tries < kMostTries; ++tries) {
    error = fetchOwn(operation, url, share);
    const bool isAllowed = share->publicPermission != CKShareParticipantPermission::none;
    if (error || isAllowed == allowAccess) return error;
    share->publicPermission =
        allowAccess ? CKShareParticipantPermission::readOnly : CKShareParticipantPermission::none;
    error = save(operation, *share, share);
    if (!CKErrorIs(error, CKErrorCode::serverRecordChanged)) return error;
  }
  return error;
}

void SharingService::modifyRecordAccess(const SharingCaller &caller, const NSURL &url, bool allowAccess,
                                        QVRecordAccessReply reply) {
  const auto link = std::make_shared<std::optional<std::string>>();
  const auto perform = [this, url, allowAccess, link](SharingOperation &operation) {
    CKShare share;
    const NSError error = setPublicAccess(operation, url, allowAccess, &share);
    if (!error) *link = share.URL.absoluteString();
    return error;
  };
  start(caller, perform, [link, reply = std::move(reply)](const NSError &error) {
    reply(*link ? NSData::dataWithString(**link) : NSData(), *link, error);
  });
}

}  // namespace droxa::keld
