#include "tests/support/FakeDaemon.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <utility>

#include "tessaly/QVNotifications.h"
#include "tests/support/Once.h"

namespace droxa {

FakeDaemon::FakeDaemon(std::string replica)
    : drive_(std::move(replica)), account_(QVAccountDescription{"vera", "account-1"}) {}

std::shared_ptr<FakeDaemon> FakeDaemon::make(std::string replica) {
  return std::shared_ptr<FakeDaemon>(new FakeDaemon(std::move(replica)));
}

// Receivers hold the senders that hold them; the daemon's end cuts that.
FakeDaemon::~FakeDaemon() {
  replies_->dropHeld();
  for (const auto &sender : senders()) sender->drop();
}

NSError FakeDaemon::begin(const char *operation, const std::string &arguments) {
  log_->add(std::string(operation) + "(" + arguments + ")");
  return replies_->takeFailure(operation);
}

NSError FakeDaemon::loggedOut() const {
  return account_ ? NSError() : qvc_errorLoggedOut();
}

// --- Changes.

template <class Change>
void FakeDaemon::change(const std::string &what, const Change &change) {
  std::vector<FakeDriveChange> changes;
  {
    const Lock lock(mutex_);
    if (!change(drive_, changes)) ADD_FAILURE() << "the drive can't " << what;
  }
  tellSenders(changes);
}

void FakeDaemon::tellSenders(const std::vector<FakeDriveChange> &changes) {
  for (const auto &sender : senders()) {
    if (sender->keepIfNotWatching(changes)) continue;
    QVQueryItems seen;
    for (const FakeDriveChange &one : changes) {
      const auto watched = sender->watchedNumber();
      if (!watched || !FakeWatchSees(one, *watched, sender->watchOptions().value_or(0))) continue;
      seen.push_back(one.item);
      if (one.item->isDead() && one.item->fileObjectID().number() == *watched) sender->stopWatching();
    }
    if (!seen.empty()) sender->push(seen);
  }
}

QVFileObjectID FakeDaemon::add(const std::string &path, const FakeDrive::Attributes &attributes) {
  change("add " + path,
         [&](FakeDrive &drive, auto &changes) { return drive.add(path, attributes, changes); });
  return identifier(path);
}

QVFileObjectID FakeDaemon::addDocument(const std::string &path, std::uint64_t size) {
  FakeDrive::Attributes attributes;
  attributes.size = size;
  return add(path, attributes);
}

QVFileObjectID FakeDaemon::addFolder(const std::string &path) {
  FakeDrive::Attributes attributes;
  attributes.kind = NSFileProviderItemKind::folder;
  return add(path, attributes);
}

QVFileObjectID FakeDaemon::addAlias(const std::string &path) {
  FakeDrive::Attributes attributes;
  attributes.kind = NSFileProviderItemKind::alias;
  return add(path, attributes);
}

QVFileObjectID FakeDaemon::addSymbolicLink(const std::string &path) {
  FakeDrive::Attributes attributes;
  attributes.kind = NSFileProviderItemKind::symbolicLink;
  return add(path, attributes);
}

void FakeDaemon::setContents(const std::string &path, std::uint64_t size, std::int64_t modifiedNanoseconds) {
  change("change " + path, [&](FakeDrive &drive, auto &changes) {
    return drive.setContents(path, size, modifiedNanoseconds, changes);
  });
}

void FakeDaemon::rename(const std::string &from, const std::string &to) {
  change("rename " + from + " to " + to,
         [&](FakeDrive &drive, auto &changes) { return drive.rename(from, to, changes); });
}

void FakeDaemon::remove(const std::string &path) {
  change("remove " + path, [&](FakeDrive &drive, auto &changes) { return drive.remove(path, changes); });
}

void FakeDaemon::addContainer(const std::string &containerID) {
  change("add container " + containerID,
         [&](FakeDrive &drive, auto &changes) { return drive.addContainer(containerID, changes); });
  notify(QVContainerListDidChangeNotification);
}

void FakeDaemon::removeContainer(const std::string &containerID) {
  change("remove container " + containerID,
         [&](FakeDrive &drive, auto &changes) { return drive.removeContainer(containerID, changes); });
  notify(QVContainerListDidChangeNotification);
}

void FakeDaemon::setReadable(const std::string &path, bool readable) {
  const Lock lock(mutex_);
  drive_.setReadable(path, readable);
}

void FakeDaemon::setAccount(std::optional<QVAccountDescription> account) {
  const Lock lock(mutex_);
  account_ = std::move(account);
}

// --- Questions of the tests.

std::uint64_t FakeDaemon::numberAtPath(const std::string &path) const {
  const Lock lock(mutex_);
  return drive_.numberAtPath(path);
}

std::shared_ptr<const QVQueryItem> FakeDaemon::item(const std::string &path) const {
  const Lock lock(mutex_);
  const std::uint64_t number = drive_.numberAtPath(path);
  return number == 0 ? nullptr : drive_.item(number);
}

QVFileObjectID FakeDaemon::identifier(const std::string &path) const {
  const auto found = item(path);
  if (!found) ADD_FAILURE() << "nothing at " << path;
  return found ? found->fileObjectID() : QVFileObjectID::documentID(UINT64_MAX);
}

NSURL FakeDaemon::url(const std::string &path) const {
  const Lock lock(mutex_);
  const std::uint64_t number = drive_.numberAtPath(path);
  return number == 0 ? NSURL() : drive_.url(number);
}

std::uint64_t FakeDaemon::rank() const {
  const Lock lock(mutex_);
  return drive_.rank();
}

std::vector<std::shared_ptr<FakeItemNotificationSender>> FakeDaemon::senders() const {
  const Lock lock(mutex_);
  return senders_;
}

std::shared_ptr<FakeItemNotificationSender> FakeDaemon::lastSender() const {
  const Lock lock(mutex_);
  return senders_.empty() ? nullptr : senders_.back();
}

std::size_t FakeDaemon::liveSenders() const {
  std::size_t live = 0;
  for (const auto &sender : senders())
    if (!sender->isInvalidated()) ++live;
  return live;
}

void FakeDaemon::notify(const std::string &name) {
  std::vector<std::shared_ptr<QVDaemonNotificationReceiving>> subscribers;
  {
    const Lock lock(mutex_);
    subscribers = subscribers_;
  }
  for (const auto &subscriber : subscribers) {
    replies_->run([subscriber, name, replied = notificationsReplied_] {
      const std::function<void()> count = [replied] { ++*replied; };
      subscriber->receiveNotification(name, exactlyOnce("reply to " + name, count));
    });
  }
}

std::size_t FakeDaemon::notificationsReplied() const {
  return *notificationsReplied_;
}

std::size_t FakeDaemon::subscribers() const {
  const Lock lock(mutex_);
  return subscribers_.size();
}

void FakeDaemon::forgetSubscribers() {
  const Lock lock(mutex_);
  subscribers_.clear();
}

}  // namespace droxa
