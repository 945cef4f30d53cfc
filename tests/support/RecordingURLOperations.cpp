#include "tests/support/RecordingURLOperations.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <utility>

namespace droxa {

class RecordingURLOperations::Operations final : public FPURLOperations {
 public:
  void importUnderFolder(const NSURL &source, const NSURL &folder, FPURLCompletion completion) override {
    take("importUnderFolder(" + source.path() + ", " + folder.path() + ")", source, std::move(completion));
  }
  void createSubFolder(const NSURL &parent, const std::string &name, FPURLCompletion completion) override {
    take("createSubFolder(" + parent.path() + ", " + name + ")", parent, std::move(completion));
  }
  void renameWithNewName(const NSURL &url, const std::string &name, FPURLCompletion completion) override {
    take("renameWithNewName(" + url.path() + ", " + name + ")", url, std::move(completion));
  }
  void reparentUnderFolder_withNewName(const NSURL &url, const NSURL &folder,
                                       const std::optional<std::string> &newName,
                                       FPURLCompletion completion) override {
    take("reparentUnderFolder(" + url.path() + ", " + folder.path() + ", withNewName " +
             newName.value_or("nil") + ")",
         url, std::move(completion));
  }
  void reparentUnderFolder_allowBouncing(const NSURL &url, const NSURL &folder, bool allowBouncing,
                                         FPURLCompletion completion) override {
    take("reparentUnderFolder(" + url.path() + ", " + folder.path() + ", allowBouncing " +
             (allowBouncing ? "1" : "0") + ")",
         url, std::move(completion));
  }
  void deleteWithCompletionHandler(const NSURL &url, FPErrorCompletion completion) override {
    take("delete(" + url.path() + ")", url,
         [completion](const NSURL &, const NSError &error) { completion(error); });
  }
  void coordinatedDeleteWithHandler(const NSURL &url, const FPURLCompletion &handler) override {
    take("coordinatedDelete(" + url.path() + ")", url, handler);
  }

  // It is in the log when everything else about it is known.
  void take(const std::string &call, const NSURL &url, FPURLCompletion completion) {
    const std::function<void()> give = note(call, url, std::move(completion));
    log.add(call);
    if (give) give();
  }
  // What gives the answer; null when that is held.
  std::function<void()> note(const std::string &call, const NSURL &url, FPURLCompletion completion) {
    const Lock lock(mutex);
    urls.push_back(url);
    progress = NSProgress::currentProgress();
    if (answers.empty()) {
      ADD_FAILURE() << call << ": the test has no answer for it";
      answers.emplace_back(NSURL(), NSError::errorWithPOSIXCode(ENOSYS));
    }
    std::function<void()> give = [completion = std::move(completion), answer = answers.front()] {
      completion(answer.first, answer.second);
    };
    answers.pop_front();
    if (!holds) return give;
    held.push_back(std::move(give));
    return nullptr;
  }

  CallLog log;
  mutable Mutex mutex;
  std::deque<std::pair<NSURL, NSError>> answers GUARDED_BY(mutex);
  std::vector<std::function<void()>> held GUARDED_BY(mutex);
  std::vector<NSURL> urls GUARDED_BY(mutex);
  std::shared_ptr<NSProgress> progress GUARDED_BY(mutex);
  bool holds GUARDED_BY(mutex) = false;
};

RecordingURLOperations::RecordingURLOperations() : operations_(std::make_shared<Operations>()) {
  FPURLOperations::setSharedForTesting(operations_);
}

RecordingURLOperations::~RecordingURLOperations() {
  FPURLOperations::setSharedForTesting(nullptr);
  const Lock lock(operations_->mutex);
  if (!operations_->answers.empty()) ADD_FAILURE() << "operations on files: an answer that nobody asked for";
  if (!operations_->held.empty()) ADD_FAILURE() << "operations on files: a call that was never answered";
}

void RecordingURLOperations::answer(const NSURL &newURL, const NSError &error) {
  const Lock lock(operations_->mutex);
  operations_->answers.emplace_back(newURL, error);
}

void RecordingURLOperations::hold() {
  const Lock lock(operations_->mutex);
  operations_->holds = true;
}

void RecordingURLOperations::release() {
  std::vector<std::function<void()>> held;
  {
    const Lock lock(operations_->mutex);
    operations_->holds = false;
    held.swap(operations_->held);
  }
  for (const auto &give : held) give();
}

std::vector<std::string> RecordingURLOperations::calls() const {
  return operations_->log.calls();
}

CallLog &RecordingURLOperations::log() {
  return operations_->log;
}

std::vector<NSURL> RecordingURLOperations::urls() const {
  const Lock lock(operations_->mutex);
  return operations_->urls;
}

std::shared_ptr<NSProgress> RecordingURLOperations::progress() const {
  const Lock lock(operations_->mutex);
  return operations_->progress;
}

}  // namespace droxa
