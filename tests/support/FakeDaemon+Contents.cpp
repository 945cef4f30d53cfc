// What is asked about contents.

#include <algorithm>
#include <gtest/gtest.h>
#include <utility>

#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVMoveCapability.h"
#include "tests/support/FakeDaemon.h"

namespace droxa {

namespace {

std::string yesOrNo(bool flag) {
  return flag ? "1" : "0";
}

}  // namespace

NSError FakeDaemon::findItem(const NSURL &url, std::uint64_t *number) const {
  if (const NSError error = loggedOut()) return error;
  *number = drive_.numberAtPath(url.path());
  if (url.path().empty() || *number == 0) return qvc_errorNoSuchItem(url.path());
  return NSError();
}

void FakeDaemon::startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) {
  NSError error = begin("startDownloadAtURL", url.path() + ", options " + std::to_string(options));
  std::shared_ptr<FakeTransfer> transfer;
  std::vector<std::pair<std::uint64_t, std::uint64_t>> begun;
  {
    const Lock lock(mutex_);
    std::uint64_t number = 0;
    if (!error) error = findItem(url, &number);
    if (!error) {
      std::set<std::uint64_t> documents;
      std::uint64_t bytes = 0;
      for (const std::uint64_t document : drive_.documentsAt(number)) {
        if (!drive_.contents(document).isDataless) continue;
        documents.insert(document);
        bytes += drive_.size(document);
        if (const std::uint64_t serial = beginDownload(document)) begun.emplace_back(document, serial);
      }
      transfer = std::make_shared<FakeTransfer>(++transfersMade_, weak_from_this(), log_, replies_, documents,
                                                bytes);
      for (const std::uint64_t document : documents)
        downloads_.at(document).interests[transfersMade_] = transfer;
    }
  }
  for (const auto &[document, serial] : begun) runDownload(document, serial);
  replies_->give("startDownloadAtURL", [transfer = std::move(transfer), error, reply = std::move(reply)] {
    reply(transfer, error);
  });
}

NSError FakeDaemon::refusalToEvict(std::uint64_t number) const {
  if (drive_.isPinned(number)) return qvc_error(QVErrorPinned, "the document is pinned");
  if (drive_.contents(number).isUnsent)
    return qvc_error(QVErrorUnsentChanges, "the cloud doesn't have the document's contents");
  if (drive_.contents(number).isInUse) return qvc_error(QVErrorDocumentInUse, "the document is in use");
  return NSError();
}

void FakeDaemon::evictItemAtURL(const NSURL &url, QVContentsResultReply reply) {
  NSError error = begin("evictItemAtURL", url.path());
  QVContentsResult result;
  std::vector<FakeDriveChange> changes;
  {
    const Lock lock(mutex_);
    std::uint64_t number = 0;
    if (!error) error = findItem(url, &number);
    const auto documents = error ? std::vector<std::uint64_t>() : drive_.documentsAt(number);
    for (const std::uint64_t document : documents) {
      if (drive_.contents(document).isDataless) continue;
      if (const NSError refusal = refusalToEvict(document)) {
        ++result.refused;
        if (result.failures.size() < 1'000) result.failures.push_back({drive_.url(document).path(), refusal});
        continue;
      }
      drive_.contents(document).isDataless = true;
      drive_.touch(document, changes);
      ++result.documents;
      result.bytes += drive_.size(document);
    }
    if (!error && !drive_.isFolder(number) && !result.failures.empty()) error = result.failures[0].error;
  }
  tellSenders(changes);
  replies_->give("evictItemAtURL", [=, reply = std::move(reply)] { reply(result, error); });
}

void FakeDaemon::setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) {
  NSError error = begin("setPinnedAtURL", url.path() + ", isPinned " + yesOrNo(isPinned));
  std::vector<std::pair<std::uint64_t, std::uint64_t>> begun;
  {
    const Lock lock(mutex_);
    std::uint64_t number = 0;
    if (!error) error = findItem(url, &number);
    if (!error) drive_.contents(number).isPinned = isPinned;
    const auto documents = error ? std::vector<std::uint64_t>() : drive_.documentsAt(number);
    for (const std::uint64_t document : documents) {
      if (!isPinned || !drive_.contents(document).isDataless) continue;
      if (const std::uint64_t serial = beginDownload(document)) begun.emplace_back(document, serial);
      downloads_.at(document).isPinned = true;
    }
  }
  for (const auto &[document, serial] : begun) runDownload(document, serial);
  replies_->give("setPinnedAtURL", [=, reply = std::move(reply)] { reply(error); });
}

QVContentsStatus FakeDaemon::documentStatus(std::uint64_t number) const {
  const FakeDrive::Contents &contents = drive_.contents(number);
  QVContentsStatus status;
  status.upload = contents.isUnsent ? QVUploadState::queued : QVUploadState::inCloud;
  status.isPinned = drive_.isPinned(number);
  status.size = drive_.size(number);
  status.error = contents.lastFailure;
  const auto download = downloads_.find(number);
  if (download != downloads_.end()) {
    status.contents = QVContentsState::downloading;
    status.transferred = download->second.bytes;
  } else if (contents.isDataless) {
    status.contents = QVContentsState::dataless;
  }
  return status;
}

void FakeDaemon::getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) {
  NSError error = begin("getContentsStatusAtURL", url.path());
  QVContentsStatus status;
  {
    const Lock lock(mutex_);
    std::uint64_t number = 0;
    if (!error) error = findItem(url, &number);
    if (!error && !drive_.isFolder(number)) {
      status = documentStatus(number);
    } else if (!error) {
      status.upload = QVUploadState::inCloud;
      status.isPinned = drive_.isPinned(number);
      for (const std::uint64_t document : drive_.documentsAt(number)) {
        const QVContentsStatus one = documentStatus(document);
        ++status.documents;
        status.size += one.size;
        status.transferred += one.transferred;
        if (one.contents != QVContentsState::present) ++status.dataless;
        if (one.upload != QVUploadState::inCloud) ++status.unsent;
        if (one.upload != QVUploadState::inCloud) status.upload = one.upload;
      }
      if (status.dataless != 0) status.contents = QVContentsState::dataless;
    }
  }
  replies_->give("getContentsStatusAtURL", [=, reply = std::move(reply)] { reply(status, error); });
}

void FakeDaemon::getTransferStatus(QVTransferStatusReply reply) {
  const NSError error = begin("getTransferStatus", "");
  QVTransferStatus status;
  if (!error) {
    const Lock lock(mutex_);
    status.cloud = "memory";
    status.downloads = downloadCounts_;
    status.downloads.active = downloads_.size();
    for (const auto &[number, download] : downloads_)
      status.downloads.bytesLeft += drive_.size(number) - download.bytes;
  }
  replies_->give("getTransferStatus", [=, reply = std::move(reply)] { reply(status, error); });
}

void FakeDaemon::waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) {
  NSError error = begin("waitForUploadAtURL", url ? url.path() : "nil");
  {
    const Lock lock(mutex_);
    std::uint64_t number = drive_.rootNumber();
    if (!error) error = url ? findItem(url, &number) : loggedOut();
    UploadWaiter waiter;
    const auto documents = error ? std::vector<std::uint64_t>() : drive_.documentsAt(number);
    for (const std::uint64_t document : documents)
      if (drive_.contents(document).isUnsent) waiter.documents.insert(document);
    if (!waiter.documents.empty()) {
      waiter.reply = std::move(reply);
      uploadWaiters_.push_back(std::move(waiter));
      return;
    }
  }
  replies_->give("waitForUploadAtURL", [=, reply = std::move(reply)] { reply(error); });
}

std::uint64_t FakeDaemon::moveCapability(std::uint64_t source, const NSURL &destination) const {
  const NSURL from = drive_.url(source);
  QVMove move;
  move.isOfContainer = drive_.foldersAbove(source).empty();
  for (const QVContainerDescription &container : drive_.containers()) {
    move.isOfContainer |= from == container.documentsURL;
    if (from.isEqualToOrBelow(container.url))
      move.leavesContainer = !destination.isEqualToOrBelow(container.url);
    if (!destination.isEqualToOrBelow(container.url)) continue;
    move.isIntoTrash = container.containerID == QVUbiquitousTrashContainerID;
    move.isIntoLocalPlace = !destination.isEqualToOrBelow(container.documentsURL);
    move.leavesDrive = false;
  }
  const NSURL replica = drive_.containers()[0].url.URLByDeletingLastPathComponent();
  move.leavesDrive = !destination.isEqualToOrBelow(replica);
  if (move.leavesDrive) move.leavesContainer = false;
  move.isIntoItself = drive_.isFolder(source) && destination.isEqualToOrBelow(from);
  move.isIntoLocalPlace |= !move.leavesDrive && qv_wouldBeExcludedFromSync(destination);
  move.isOfFolder = drive_.isFolder(source);
  move.isOfAlias = drive_.item(source)->fields().kind == NSFileProviderItemKind::alias;
  for (const std::uint64_t document : drive_.documentsAt(source))
    move.isDataless |= drive_.contents(document).isDataless;
  return QVCapabilityOfMove(move);
}

void FakeDaemon::getMoveCapability(const NSURL &source, const NSURL &destination,
                                   QVMoveCapabilityReply reply) {
  NSError error = begin("getMoveCapability", source.path() + ", " + destination.path());
  std::uint64_t capability = 0;
  {
    const Lock lock(mutex_);
    std::uint64_t number = 0;
    if (!error && !moveCapability_) error = findItem(source, &number);
    if (!error) capability = moveCapability_ ? *moveCapability_ : moveCapability(number, destination);
  }
  replies_->give("getMoveCapability", [=, reply = std::move(reply)] { reply(capability, error); });
}

// Nothing is ever held back here, so there is nothing to confirm.
void FakeDaemon::allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) {
  NSError error = begin("allowDeletionAtURL", url.path());
  {
    const Lock lock(mutex_);
    std::uint64_t number = 0;
    if (!error) error = findItem(url, &number);
  }
  replies_->give("allowDeletionAtURL", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::confirmDeletions(bool carryOut, QVContentsErrorReply reply) {
  const NSError error = begin("confirmDeletions", "carryOut " + yesOrNo(carryOut));
  replies_->give("confirmDeletions", [=, reply = std::move(reply)] { reply(error); });
}

}  // namespace droxa
