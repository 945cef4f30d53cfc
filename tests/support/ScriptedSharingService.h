#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVSharingService.h"
#include "tests/support/CallLog.h"

namespace droxa {

// A sharing service that writes down what it is asked, returns the progress that the test gave it (null:
// none) and answers with what the test put there; held answers are given by release(). Thread contract: any
// thread, but for what the test sets before it is called.
class ScriptedSharingService final : public QVSharingService {
 public:
  void fetchSharingInfo(QVSharingInfoReply reply) override {
    log.add("info");
    answer([this, reply] { reply(isShared, item, error); });
  }
  Progress preflightCheckIfCurrentlyShareableWithCompletion(QVSharingPreflightReply completion) override {
    log.add("preflight");
    answer([this, completion] { completion(isShared, item, first, second, error); });
    return nullptr;
  }
  Progress fetchParticipantListAndPublicPermission(QVSharingParticipantsReply completion) override {
    log.add("participants");
    answer([this, completion] { completion(participants, publicPermission, error); });
    return progress;
  }
  void startPreparingForShareWhenForcing(bool force) override {
    log.add(force ? "prepare, forced" : "prepare");
  }
  Progress fetchShareWithCompletion(QVShareReply completion) override {
    log.add("fetch");
    answer([this, completion] { completion(share, error); });
    return progress;
  }
  Progress fetchShareURLWithCompletion(QVSharingURLReply completion) override {
    log.add("URL");
    answer([this, completion] { completion(url, error); });
    return progress;
  }
  Progress saveShare(const std::optional<CKShare> &saved, QVShareReply completion) override {
    log.add("save " + (saved ? saved->description() : "(null)"));
    answer([this, saved, completion] {
      if (savesShare) share = saved;
      completion(share, error);
    });
    return progress;
  }
  Progress unshareWithCompletion(QVShareOutcomeReply completion) override {
    log.add("unshare");
    answer([this, completion] { completion(error); });
    return progress;
  }

  void hold() {
    const Lock lock(mutex_);
    isHolding_ = true;
  }
  void release() {
    std::vector<std::function<void()>> answers;
    {
      const Lock lock(mutex_);
      isHolding_ = false;
      answers.swap(held_);
    }
    for (const auto &one : answers) one();
  }

  CallLog log;
  Progress progress;
  bool isShared = false;
  std::shared_ptr<const NSFileProviderItem> item;
  QVSharingStrings first, second;
  QVShareParticipants participants;
  std::int64_t publicPermission = 0;
  std::optional<CKShare> share;
  bool savesShare = false;  // what is saved is the share from then on
  NSURL url;
  NSError error;

 private:
  void answer(std::function<void()> give) {
    {
      const Lock lock(mutex_);
      if (isHolding_) return held_.push_back(std::move(give));
    }
    give();
  }

  Mutex mutex_;
  bool isHolding_ GUARDED_BY(mutex_) = false;
  std::vector<std::function<void()>> held_ GUARDED_BY(mutex_);
};

}  // namespace droxa
