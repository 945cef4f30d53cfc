// What is done to the items themselves: getting folders ready, withdrawing what is shared below them, and
// finding documents by their records.

#include <utility>

#include "keld/sharing/SharingService.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVSharingTopics.h"

namespace droxa::keld {

namespace {

constexpr int kMostTries = 4;  // of opening what is let go of at the same time

NSError unknownRecord(const CKRecordID &record) {
  return CKErrorMake(CKErrorCode::unknownItem, "no document of this drive is the record " +
                                                   record.description() +
                                                   "; fetch its changes, and ask again");
}

}  // namespace

// --- Folders.

void SharingService::prepFolder(const SharingCaller &caller, const NSURL &url, QVShareOutcomeReply reply) {
  const auto perform = [this, url](SharingOperation &operation) {
    SharingItem item;
    const NSError error = items_.find(operation, url, &item);
    return error ? error : items_.upload(operation, item);
  };
  start(caller, perform, std::move(reply));
}

NSError SharingService::withdrawOne(SharingOperation &operation, const KnownShare &known, bool onlyChecks) {
  const SharingPlace place = places_.ofZone(known.record.zoneID);
  if (!place.isOwn)
    return CKErrorMake(CKErrorCode::permissionFailure,
                       "it is " + known.record.zoneID.ownerName + "'s share, who alone can withdraw it");
  if (onlyChecks) return NSError();
  CKShare share;
  share.recordID = known.record;
  return withdraw(operation, share, true);
}

NSError SharingService::withdrawBelow(SharingOperation &operation, const NSURL &folder,
                                      std::uint64_t mostFailures, bool onlyChecks) {
  SharingItem item;
  if (const NSError error = items_.find(operation, folder, &item)) return error;
  if (!item.item.isFolder())
    return qvc_error(QVErrorInvalidArgument, item.path + ": isn't a folder, and has nothing below it");
  if (const NSError error = refresh(operation, item.engine)) return error;
  std::vector<std::pair<KnownShare, SharingItem>> below;
  for (const KnownShare &known : item.engine->store().shares()) {
    const auto row = rowOf({known.root, known.record.zoneID});
    const auto root = row ? items_.item(row->item) : std::nullopt;
    if (root && items_.isBelow(root->id, item.item.id)) below.emplace_back(known, items_.described(*root));
  }
  std::uint64_t failures = 0, done = 0;
  std::string first;
  NSError why;
  operation.progress(QVSharingTopicSubshares, 0, below.size());
  for (const auto &[known, root] : below) {
    if (const NSError stopped = operation.stopped()) return stopped;
    const NSError error = withdrawOne(operation, known, onlyChecks);
    if (error && failures++ == 0) {
      first = root.path;
      why = error;
    }
    operation.progress(QVSharingTopicSubshares, ++done, below.size());
  }
  if (failures <= mostFailures) return NSError();
  return CKErrorMake(CKErrorCode::partialFailure,
                     std::to_string(failures) + " of the " + std::to_string(below.size()) + " shares below " +
                         item.path + " can't be withdrawn, first that of " + first + ": " +
                         why.localizedDescription(),
                     why);
}

void SharingService::processSubitems(const SharingCaller &caller, const NSURL &url,
                                     std::uint64_t maxSubsharesFailures, std::uint64_t processType,
                                     QVShareOutcomeReply reply) {
  const auto perform = [this, url, maxSubsharesFailures, processType](SharingOperation &operation) {
    if (processType != QVProcessCheckSubshares && processType != QVProcessWithdrawSubshares)
      return qvc_error(QVErrorInvalidArgument, "the process type " + std::to_string(processType) +
                                                   " isn't known; 0 checks shares, 1 withdraws them");
    return withdrawBelow(operation, url, maxSubsharesFailures, processType == QVProcessCheckSubshares);
  };
  start(caller, perform, std::move(reply));
}

// --- Documents by their records.

NSError SharingService::materialise(SharingOperation &operation, const SharingItem &item) {
  if (item.item.isFolder()) return NSError();
  const std::uint64_t size = item.item.facts.size;
  const std::shared_ptr<Downloads::Interest> interest =
      item.engine->downloads()->want(item.item.id, size, DownloadPriority::reader);
  std::uint64_t told = UINT64_MAX;
  const auto position = [&] {
    std::uint64_t done = 0, total = size;
    interest->progress(&done, &total);
    if (done != std::exchange(told, done)) operation.progress(QVSharingTopicDownload, done, total);
    return done;
  };
  const NSError error = operation.await(
      "fetching " + item.path, [&](SharingOperation::Done done) { interest->whenEnded(std::move(done)); },
      position);
  if (error) interest->cancel();
  return error;
}

NSError SharingService::openDocument(SharingOperation &operation, const CKRecordID &record, bool syncIfNeeded,
                                     std::shared_ptr<const FPSandboxingURLWrapper> *opened) {
  if (syncIfNeeded) {
    const NSError error = refresh(operation, engineOf(record.zoneID));
    if (error) return error;
  }
  const auto row = rowOf(record);
  const auto found = row ? items_.item(row->item) : std::nullopt;
  if (!found) return unknownRecord(record);
  SharingItem item = items_.described(*found);
  if (const NSError error = items_.checkShareable(item.item, item.path)) return error;
  // It may be moved, or let go of again, before it is open; once it is open it isn't.
  for (int tries = 0; tries < kMostTries; ++tries) {
    if (const NSError error = materialise(operation, item)) return error;
    const auto now = items_.item(row->item);
    if (!now) return unknownRecord(record);
    item = items_.described(*now);
    NSError error;
    *opened = FPSandboxingURLWrapper::wrapperWithURL(NSURL::fileURLWithPath(item.path), true, &error);
    if (*opened && item.item.isFolder()) return NSError();
    const auto location = *opened ? item.engine->files().locate(item.item.id, nullptr) : std::nullopt;
    if (location && item.engine->storage().classify(location->folder.get(), location->name).kind !=
                        DocumentClass::dataless)
      return NSError();
    opened->reset();
    if (error && !error.is(NSPOSIXErrorDomain, ENOENT)) return error;
  }
  return qvc_error(QVErrorDocumentInUse, item.path + ": is let go of at the same time; ask again");
}

void SharingService::copyDocumentURL(const SharingCaller &caller, const std::optional<CKRecordID> &recordID,
                                     bool syncIfNeeded, QVSandboxingURLReply reply) {
  const auto opened = std::make_shared<std::shared_ptr<const FPSandboxingURLWrapper>>();
  const auto perform = [this, recordID, syncIfNeeded, opened](SharingOperation &operation) {
    if (!recordID)
      return qvc_error(QVErrorInvalidArgument, "no record was given; name the document's record");
    return openDocument(operation, *recordID, syncIfNeeded, opened.get());
  };
  start(caller, perform, [opened, reply = std::move(reply)](const NSError &error) {
    reply(error ? nullptr : *opened, error);
  });
}

void SharingService::copyParticipantToken(const SharingCaller &caller, const NSURL &url,
                                          QVParticipantTokenReply reply) {
  const auto tokens = std::make_shared<CKShareTokens>();
  const auto perform = [this, url, tokens](SharingOperation &operation) {
    SharingItem item;
    if (const NSError error = items_.findInCloud(operation, url, &item)) return error;
    const SharingPlace place = placeOf(item);
    *tokens = place.cloud->shareTokens(place.recordID(item.row->record), operation.call());
    return tokens->error;
  };
  start(caller, perform, [tokens, reply = std::move(reply)](const NSError &error) {
    const auto orNil = [&error](const std::string &token) {
      return error || token.empty() ? std::nullopt : std::optional<std::string>(token);
    };
    reply(orNil(tokens->shareToken), orNil(tokens->baseToken), error);
  });
}

}  // namespace droxa::keld
