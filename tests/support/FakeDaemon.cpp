#include "tests/support/FakeDaemon.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <utility>

#include "tessaly/QVNotifications.h"
#include "tests/support/Once.h"

namespace droxa {

namespace {

std::string listingArguments(std::int64_t sortOrder, std::uint64_t offset, std::uint64_t limit) {
  return "sort " + std::to_string(sortOrder) + ", offset " + std::to_string(offset) + ", limit " +
         std::to_string(limit);
}

NSError checkLimit(std::uint64_t limit) {
  if (limit >= 1 && limit <= 1000) return NSError();
  return qvc_error(QVErrorInvalidArgument, "limit " + std::to_string(limit) + " isn't between 1 and 1000");
}

// Cuts one page out of a listing; the next offset is 0 at its end.
QVQueryItems page(const QVQueryItems &items, std::uint64_t offset, std::uint64_t limit,
                  std::uint64_t *nextOffset) {
  const std::uint64_t first = std::min<std::uint64_t>(offset, items.size());
  const std::uint64_t last = std::min<std::uint64_t>(first + limit, items.size());
  *nextOffset = last < items.size() ? last : 0;
  return QVQueryItems(items.begin() + static_cast<std::ptrdiff_t>(first),
                      items.begin() + static_cast<std::ptrdiff_t>(last));
}

}  // namespace

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

// --- The protocol. Each operation writes the call down, works out the answer as of now, and gives it.

void FakeDaemon::enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder, std::int64_t sortOrder,
                                        std::uint64_t offset, std::uint64_t limit,
                                        QVItemsCompletion completion) {
  const std::string name = folder ? folder->asString() : "root";
  NSError error = begin("enumerateItemsInFolder", name + ", " + listingArguments(sortOrder, offset, limit));
  QVQueryItems items;
  std::uint64_t nextOffset = 0;
  {
    const Lock lock(mutex_);
    const std::uint64_t number = folder ? drive_.numberOf(*folder) : drive_.rootNumber();
    if (!error) error = loggedOut();
    if (!error) error = checkLimit(limit);
    if (!error && !drive_.isFolder(number)) error = qvc_errorNoSuchItem(name);
    if (!error && !drive_.isReadable(number)) error = qvc_error(QVErrorUnreadable, name + " can't be read");
    if (!error) items = page(drive_.children(number, sortOrder), offset, limit, &nextOffset);
  }
  replies_->give("enumerateItemsInFolder",
                 [=, completion = std::move(completion)] { completion(items, nextOffset, error); });
}

void FakeDaemon::enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset,
                                                  std::uint64_t limit, QVItemsCompletion completion) {
  NSError error = begin("enumerateAllFoldersWithSortOrder", listingArguments(sortOrder, offset, limit));
  QVQueryItems items;
  std::uint64_t nextOffset = 0;
  {
    const Lock lock(mutex_);
    if (!error) error = loggedOut();
    if (!error) error = checkLimit(limit);
    if (!error) items = page(drive_.allFolders(sortOrder), offset, limit, &nextOffset);
  }
  replies_->give("enumerateAllFoldersWithSortOrder",
                 [=, completion = std::move(completion)] { completion(items, nextOffset, error); });
}

void FakeDaemon::currentNotifRankWithReply(QVRankReply reply) {
  NSError error = begin("currentNotifRankWithReply", "");
  std::uint64_t newest = 0;
  {
    const Lock lock(mutex_);
    if (!error) error = loggedOut();
    if (!error) newest = drive_.rank();
  }
  replies_->give("currentNotifRankWithReply", [=, reply = std::move(reply)] { reply(newest, error); });
}

void FakeDaemon::enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                           QVWorkingSetCompletion completion) {
  const std::string text = token ? token.description() : "nil";
  NSError error = begin("enumerateWorkingSetChangesFromChangeToken",
                        "token " + text + ", limit " + std::to_string(limit));
  FakeDrive::WorkingSetBatch batch;
  {
    const Lock lock(mutex_);
    if (!error) error = loggedOut();
    if (!error) error = checkLimit(limit);
    if (!error) {
      auto known = drive_.workingSet(token, limit);
      if (known)
        batch = std::move(*known);
      else
        error = qvc_error(QVErrorChangeTokenExpired, "change token " + text + " isn't of this drive");
    }
  }
  replies_->give("enumerateWorkingSetChangesFromChangeToken", [=, completion = std::move(completion)] {
    completion(batch.updated, batch.deleted, batch.token, error);
  });
}

void FakeDaemon::getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                                 QVSenderReply reply) {
  const NSError error = begin("getItemUpdateSenderWithReceiver", "");
  std::shared_ptr<FakeItemNotificationSender> sender;
  if (!error) {
    const Lock lock(mutex_);
    sender = std::make_shared<FakeItemNotificationSender>(senders_.size() + 1, weak_from_this(), log_,
                                                          replies_, std::move(receiver));
    senders_.push_back(sender);
  }
  replies_->give("getItemUpdateSenderWithReceiver",
                 [=, reply = std::move(reply)] { reply(sender, {}, error); });
}

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

void FakeDaemon::getContainers(QVContainersReply reply) {
  const NSError error = begin("getContainers", "");
  std::vector<QVContainerDescription> containers;
  if (!error) {
    const Lock lock(mutex_);
    containers = drive_.containers();
  }
  replies_->give("getContainers", [=, reply = std::move(reply)] { reply(containers, error); });
}

void FakeDaemon::subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                          QVErrorReply reply) {
  const NSError error = begin("subscribeToNotifications", "");
  if (!error) {
    const Lock lock(mutex_);
    subscribers_.push_back(std::move(receiver));
  }
  replies_->give("subscribeToNotifications", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::getAccount(QVAccountReply reply) {
  const NSError error = begin("getAccount", "");
  std::optional<QVAccountDescription> account;
  if (!error) {
    const Lock lock(mutex_);
    account = account_;
  }
  replies_->give("getAccount", [=, reply = std::move(reply)] { reply(account, error); });
}

void FakeDaemon::signIn(const std::string &name, QVAccountReply reply) {
  NSError error = begin("signIn", name);
  const bool hasControl = std::any_of(
      name.begin(), name.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; });
  if (!error && (name.empty() || hasControl))
    error = qvc_error(QVErrorInvalidArgument, "\"" + name + "\" isn't an account's name");
  std::optional<QVAccountDescription> account;
  if (!error) {
    account = QVAccountDescription{name, "account-" + name};
    setAccount(account);
    notify(QVAccountTokenDidChangeNotification);
  }
  replies_->give("signIn", [=, reply = std::move(reply)] { reply(account, error); });
}

void FakeDaemon::signOut(QVErrorReply reply) {
  const NSError error = begin("signOut", "");
  if (!error) {
    setAccount(std::nullopt);
    notify(QVAccountTokenDidChangeNotification);
  }
  replies_->give("signOut", [=, reply = std::move(reply)] { reply(error); });
}

void FakeDaemon::getStatus(QVStatusReply reply) {
  const NSError error = begin("getStatus", "");
  QVDaemonStatus status;
  if (!error) {
    status.senders = liveSenders();
    const Lock lock(mutex_);
    status.rank = drive_.rank();
    status.documents = drive_.count(NSFileProviderItemKind::document);
    status.folders = drive_.count(NSFileProviderItemKind::folder);
    status.aliases = drive_.count(NSFileProviderItemKind::alias);
    status.watcher = "none";
    status.firstScanDone = true;
  }
  replies_->give("getStatus", [=, reply = std::move(reply)] { reply(status, error); });
}

}  // namespace droxa
