#include "tessaly/QVItemActions.h"

#include <utility>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

struct Shared {
  Mutex mutex;
  std::shared_ptr<QVItemActions> actions GUARDED_BY(mutex);
};

Shared &SharedActions() {
  static Shared shared;
  return shared;
}

}  // namespace

std::shared_ptr<QVItemActions> QVItemActions::shared() {
  Shared &shared = SharedActions();
  const Lock lock(shared.mutex);
  if (!shared.actions) shared.actions = QVMakeItemActions();
  return shared.actions;
}

void QVItemActions::setSharedForTesting(std::shared_ptr<QVItemActions> actions) {
  Shared &shared = SharedActions();
  const Lock lock(shared.mutex);
  shared.actions.swap(actions);
}

bool qv_trashItemAtURL(const NSFileManager *manager, const NSURL &url, NSURL *resultingURL, NSError *error) {
  return manager && QVItemActions::shared()->trashItemAtURL(url, resultingURL, error);
}

NSURL qv_putBackURLForTrashedItemAtURL(const NSFileManager *manager, const NSURL &url, NSError *error) {
  if (!manager) return {};
  return QVItemActions::shared()->putBackURLForTrashedItemAtURL(url, error);
}

std::shared_ptr<const QVContainer> qv_tessalyContainer(const NSURL &url) {
  if (!url) return nullptr;
  for (const auto &container : QVContainer::allContainers()) {
    if (url.isEqualToOrBelow(container->url())) return container;
  }
  return nullptr;
}

NSURL qv_physicalURL(const NSURL &url) {
  if (!url) return {};
  return QVItemActions::shared()->physicalURL(url);
}

void qv_setLastOpenDate(const NSFileManager *manager, const NSDate &date, const NSURL &url) {
  if (manager) QVItemActions::shared()->setLastOpenDate(date, url);
}

void qv_setFavoriteRank(const NSFileManager *manager, const std::optional<std::uint64_t> &rank,
                        const NSURL &url) {
  if (manager) QVItemActions::shared()->setFavoriteRank(rank, url);
}

// A nil receiver answers false, without an error.
bool qv_setTagNames(const NSURL &url, const std::vector<std::string> &names, NSError *error) {
  return url && QVItemActions::shared()->setTagNames(url, names, error);
}

}  // namespace droxa
