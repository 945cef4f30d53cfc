// What is asked about single items and containers.

#include <utility>

#include "tests/support/FakeDaemon.h"

namespace droxa {

void FakeDaemon::getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) {
  NSError error = begin("getURLForItemIdentifier", identifier);
  NSURL found;
  {
    const Lock lock(mutex_);
    const auto fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
    const bool isRoot = identifier == NSFileProviderRootContainerItemIdentifier;
    const std::uint64_t number = isRoot         ? drive_.rootNumber()
                                 : fileObjectID ? drive_.numberOf(*fileObjectID)
                                                : 0;
    if (!error && !fileObjectID && !isRoot)
      error = qvc_error(QVErrorInvalidArgument, identifier + " isn't an identifier");
    if (!error && number == 0) error = qvc_errorNoSuchItem(identifier);
    if (!error) found = drive_.url(number);
  }
  replies_->give("getURLForItemIdentifier", [=, reply = std::move(reply)] { reply(found, error); });
}

void FakeDaemon::getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) {
  NSError error = begin("getURLForFileObjectID", fileObjectID.asString());
  NSURL found;
  {
    const Lock lock(mutex_);
    const std::uint64_t number = drive_.numberOf(fileObjectID);
    if (!error && number == 0) error = qvc_errorNoSuchItem(fileObjectID.asString());
    if (!error) found = drive_.url(number);
  }
  replies_->give("getURLForFileObjectID", [=, reply = std::move(reply)] { reply(found, error); });
}

void FakeDaemon::getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) {
  NSError error = begin("getQueryItemForURL", url.path() + ", fakeFSEvent " + (fakeFSEvent ? "1" : "0"));
  std::shared_ptr<const QVQueryItem> found;
  {
    const Lock lock(mutex_);
    const std::uint64_t number = drive_.numberAtPath(url.path());
    if (!error && (number == 0 || url.path().empty())) error = qvc_errorNoSuchItem(url.path());
    if (!error) found = drive_.item(number);
  }
  replies_->give("getQueryItemForURL", [=, reply = std::move(reply)] { reply(found, error); });
}

void FakeDaemon::getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) {
  NSError error = begin("getContainerItem", containerID + ", forceScan " + (forceScan ? "1" : "0"));
  std::shared_ptr<const QVQueryItem> found;
  {
    const Lock lock(mutex_);
    const auto number = drive_.containerNumber(containerID);
    if (!error && !number) error = qvc_errorNoSuchItem(containerID);
    if (!error) found = drive_.item(*number);
  }
  replies_->give("getContainerItem", [=, reply = std::move(reply)] { reply(found, error); });
}

void FakeDaemon::setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change, QVErrorReply reply) {
  NSError error = begin("setMetadataAtURL", url.path());
  std::vector<FakeDriveChange> changes;
  QVItemMetadataChange kept = change;
  if (!error && kept.tags) error = QVNormalizeTagNames(&*kept.tags);
  if (!error) {
    const Lock lock(mutex_);
    const std::uint64_t number = url.path().empty() ? 0 : drive_.numberAtPath(url.path());
    if (number == 0)
      error = qvc_errorNoSuchItem(url.path());
    else
      drive_.setMetadata(number, kept, changes);
  }
  tellSenders(changes);
  replies_->give("setMetadataAtURL", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::getContainers(QVContainersReply reply) {
  const NSError error = begin("getContainers", "");
  std::vector<QVContainerDescription> containers;
  if (!error) {
    const Lock lock(mutex_);
    containers = drive_.containers();
  }
  replies_->give("getContainers", [=, reply = std::move(reply)] { reply(containers, error); });
}

}  // namespace droxa
