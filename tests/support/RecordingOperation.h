#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVOperationClient.h"
#include "tests/support/CallLog.h"

namespace droxa {

// Something to cancel that counts how often it was. Thread contract: any thread.
class RecordingCancellable final : public QVCancellable {
 public:
  void invalidate() override { log.add("invalidate"); }
  CallLog log;
};

// A client's operation that records what it is told: "progress TOPIC (key value)", "remote", "invalidate".
// Thread contract: any thread.
class RecordingOperation final : public QVOperationClient {
 public:
  std::string description() const override { return "<recording operation>"; }
  void progressCallbackWithTopic(const std::string &topic, const NSUserInfo &userInfo) override {
    log.add("progress " + topic + text(userInfo));
  }
  void setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy, const NSUserInfo &userInfo) override {
    {
      const Lock lock(mutex_);
      remote_ = std::move(proxy);
    }
    log.add("remote" + text(userInfo));
  }
  void invalidate() override { log.add("invalidate"); }

  std::shared_ptr<QVCancellable> remote() const {
    const Lock lock(mutex_);
    return remote_;
  }
  void forgetRemote() {
    const Lock lock(mutex_);
    remote_ = nullptr;
  }

  CallLog log;

 private:
  static std::string text(const NSUserInfo &userInfo) {
    std::string text;
    for (const auto &[key, value] : userInfo) {
      const auto *string = std::get_if<std::string>(&value);
      const auto *integer = std::get_if<std::int64_t>(&value);
      text += " " + key + "=" + (string ? *string : integer ? std::to_string(*integer) : "?");
    }
    return text;
  }
  mutable Mutex mutex_;
  std::shared_ptr<QVCancellable> remote_ GUARDED_BY(mutex_);
};

}  // namespace droxa
