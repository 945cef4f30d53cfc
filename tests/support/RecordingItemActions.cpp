#include "tests/support/RecordingItemActions.h"

namespace droxa {

class RecordingItemActions::Actions final : public QVItemActions {
 public:
  bool trashItemAtURL(const NSURL &url, NSURL *resultingURL, NSError *error) override {
    note("trash(" + url.path() + ")", url);
    if (error && trashError) *error = trashError;
    if (resultingURL) *resultingURL = trashed;
    return static_cast<bool>(trashed);
  }
  NSURL putBackURLForTrashedItemAtURL(const NSURL &url, NSError *error) override {
    note("putBack(" + url.path() + (error ? ", error)" : ")"), url);
    return putBack;
  }
  NSURL physicalURL(const NSURL &url) override {
    note("physical(" + url.path() + ")", url);
    return physical ? physical : url;
  }
  void setLastOpenDate(const NSDate &date, const NSURL &url) override {
    note("setLastOpenDate(" + (date ? date.description() : "nil") + ", " + url.description() + ")", url);
  }
  void setFavoriteRank(const std::optional<std::uint64_t> &rank, const NSURL &url) override {
    note("setFavoriteRank(" + (rank ? std::to_string(*rank) : "nil") + ", " + url.description() + ")", url);
  }
  bool setTagNames(const NSURL &url, const std::vector<std::string> &names, NSError *error) override {
    std::string joined;
    for (const std::string &name : names) joined += "[" + name + "]";
    note("setTagNames(" + url.path() + ", " + joined + ")", url);
    if (!areTagsSet && error) *error = tagError;
    return areTagsSet;
  }

  void note(const std::string &call, const NSURL &url) {
    log.add(call);
    const Lock lock(mutex);
    urls.push_back(url);
  }

  CallLog log;
  mutable Mutex mutex;
  std::vector<NSURL> urls GUARDED_BY(mutex);
  NSURL trashed, putBack, physical;
  NSError trashError, tagError;
  bool areTagsSet = true;
};

RecordingItemActions::RecordingItemActions() : actions_(std::make_shared<Actions>()) {
  QVItemActions::setSharedForTesting(actions_);
}

RecordingItemActions::~RecordingItemActions() {
  QVItemActions::setSharedForTesting(nullptr);
}

NSURL &RecordingItemActions::trashed() {
  return actions_->trashed;
}

NSError &RecordingItemActions::trashError() {
  return actions_->trashError;
}

NSURL &RecordingItemActions::putBack() {
  return actions_->putBack;
}

NSURL &RecordingItemActions::physical() {
  return actions_->physical;
}

NSError &RecordingItemActions::tagError() {
  return actions_->tagError;
}

bool &RecordingItemActions::areTagsSet() {
  return actions_->areTagsSet;
}

std::vector<std::string> RecordingItemActions::calls() const {
  return actions_->log.calls();
}

std::vector<NSURL> RecordingItemActions::urls() const {
  const Lock lock(actions_->mutex);
  return actions_->urls;
}

}  // namespace droxa
