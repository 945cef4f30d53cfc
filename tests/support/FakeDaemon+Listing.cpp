// What is asked about folders and changes. Each operation writes the call down, works out the answer as
// of now, and gives it.

#include <algorithm>
#include <utility>

#include "tests/support/FakeDaemon.h"

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

}  // namespace droxa
