// The downloads of the fake daemon: who waits for which, and how the test ends them.

#include <gtest/gtest.h>
#include <utility>

#include "tests/support/FakeDaemon.h"

namespace droxa {

QVFileObjectID FakeDaemon::addDatalessDocument(const std::string &path, std::uint64_t size) {
  FakeDrive::Attributes attributes;
  attributes.size = size;
  attributes.isDataless = true;
  return add(path, attributes);
}

void FakeDaemon::setUnsent(const std::string &path, bool unsent) {
  std::vector<QVContentsErrorReply> safe;
  {
    const Lock lock(mutex_);
    const std::uint64_t number = drive_.numberAtPath(path);
    ASSERT_NE(number, 0U) << "nothing at " << path;
    drive_.contents(number).isUnsent = unsent;
    if (unsent) return;
    std::erase_if(uploadWaiters_, [&](UploadWaiter &waiter) {
      waiter.documents.erase(number);
      if (!waiter.documents.empty()) return false;
      safe.push_back(std::move(waiter.reply));
      return true;
    });
  }
  for (QVContentsErrorReply &reply : safe)
    replies_->give("waitForUploadAtURL", [reply = std::move(reply)] { reply(NSError()); });
}

void FakeDaemon::setInUse(const std::string &path, bool inUse) {
  const Lock lock(mutex_);
  const std::uint64_t number = drive_.numberAtPath(path);
  ASSERT_NE(number, 0U) << "nothing at " << path;
  drive_.contents(number).isInUse = inUse;
}

void FakeDaemon::setMoveCapability(std::optional<std::uint64_t> capability) {
  const Lock lock(mutex_);
  moveCapability_ = capability;
}

// The serial of a new download; 0 when the document is on its way already.
std::uint64_t FakeDaemon::beginDownload(std::uint64_t number) {
  Download &download = downloads_[number];
  if (download.serial != 0) return 0;
  return download.serial = ++downloadsStarted_;
}

void FakeDaemon::runDownload(std::uint64_t number, std::uint64_t serial) {
  replies_->give("download", [weak = weak_from_this(), number, serial] {
    const auto daemon = weak.lock();
    // A failure that the test asked for isn't spent on a download that has ended.
    if (daemon && daemon->isCurrentDownload(number, serial))
      daemon->endDownload(number, serial, daemon->replies_->takeFailure("download"));
  });
}

bool FakeDaemon::isCurrentDownload(std::uint64_t number, std::uint64_t serial) const {
  const Lock lock(mutex_);
  const auto found = downloads_.find(number);
  return found != downloads_.end() && found->second.serial == serial;
}

void FakeDaemon::endDownload(std::uint64_t number, std::uint64_t serial, const NSError &error) {
  std::vector<std::shared_ptr<FakeTransfer>> transfers;
  std::vector<FakeDriveChange> changes;
  {
    const Lock lock(mutex_);
    const auto found = downloads_.find(number);
    if (found == downloads_.end() || found->second.serial != serial) return;
    for (const auto &interest : found->second.interests)
      if (auto transfer = interest.second.lock()) transfers.push_back(std::move(transfer));
    downloads_.erase(found);
    ++(error ? downloadCounts_.failed : downloadCounts_.done);
    if (drive_.exists(number)) {
      drive_.contents(number).lastFailure = error;
      if (!error) {
        downloadCounts_.bytesDone += drive_.size(number);
        drive_.contents(number).isDataless = false;
        drive_.touch(number, changes);
      }
    }
  }
  tellSenders(changes);
  for (const auto &transfer : transfers) transfer->documentEnded(number, error);
}

void FakeDaemon::releaseInterest(std::uint64_t transfer, const std::set<std::uint64_t> &documents) {
  const Lock lock(mutex_);
  for (const std::uint64_t document : documents) {
    const auto found = downloads_.find(document);
    if (found == downloads_.end() || found->second.interests.erase(transfer) == 0) continue;
    if (found->second.interests.empty() && !found->second.isPinned) downloads_.erase(found);
  }
}

std::uint64_t FakeDaemon::bytesLeft(const std::set<std::uint64_t> &documents) const {
  const Lock lock(mutex_);
  std::uint64_t left = 0;
  for (const std::uint64_t document : documents) {
    if (!drive_.exists(document)) continue;
    const auto found = downloads_.find(document);
    left += drive_.size(document) - (found == downloads_.end() ? 0 : found->second.bytes);
  }
  return left;
}

// --- The test's.

std::pair<std::uint64_t, std::uint64_t> FakeDaemon::downloadAt(const std::string &path) const {
  const Lock lock(mutex_);
  const std::uint64_t number = drive_.numberAtPath(path);
  const auto found = downloads_.find(number);
  if (found == downloads_.end()) {
    ADD_FAILURE() << path << " isn't being downloaded";
    return {0, 0};
  }
  return {number, found->second.serial};
}

void FakeDaemon::progressDownload(const std::string &path, std::uint64_t bytes) {
  const auto [number, serial] = downloadAt(path);
  const Lock lock(mutex_);
  const auto found = downloads_.find(number);
  if (found != downloads_.end()) found->second.bytes = bytes;
}

void FakeDaemon::finishDownload(const std::string &path) {
  const auto [number, serial] = downloadAt(path);
  endDownload(number, serial, NSError());
}

void FakeDaemon::failDownload(const std::string &path, const NSError &error) {
  const auto [number, serial] = downloadAt(path);
  endDownload(number, serial, error);
}

bool FakeDaemon::isDownloading(const std::string &path) const {
  const Lock lock(mutex_);
  return downloads_.count(drive_.numberAtPath(path)) != 0;
}

std::size_t FakeDaemon::interests(const std::string &path) const {
  const Lock lock(mutex_);
  const auto found = downloads_.find(drive_.numberAtPath(path));
  return found == downloads_.end() ? 0 : found->second.interests.size();
}

std::size_t FakeDaemon::downloadsStarted() const {
  const Lock lock(mutex_);
  return downloadsStarted_;
}

}  // namespace droxa
