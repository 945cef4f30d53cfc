#pragma once

#include <algorithm>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "tessaly/QVProtocol.h"
#include "tests/support/Eventually.h"

namespace droxa {

// Keeps what the daemon pushes into it, and replies at once or, while it holds, when the test says so.
// Thread contract: pushes on any thread, questions on the test's.
class RecordingReceiver final : public QVItemNotificationReceiving {
 public:
  void receiveUpdates(const QVQueryItems &items, const std::vector<std::string> & /*logicalExtensions*/,
                      const std::vector<std::string> & /*physicalExtensions*/, QVReply reply) override {
    {
      const std::lock_guard<std::mutex> lock(mutex_);
      ++batches_;
      items_.insert(items_.end(), items.begin(), items.end());
      if (holding_) held_.push_back(std::exchange(reply, nullptr));
      condition_.notify_all();
    }
    if (reply) reply();
  }
  void receiveProgressUpdates(const std::vector<std::string> & /*updates*/, QVReply reply) override {
    reply();
  }

  void holdReplies() {
    const std::lock_guard<std::mutex> lock(mutex_);
    holding_ = true;
  }
  void releaseReplies() {
    std::vector<QVReply> replies;
    {
      const std::lock_guard<std::mutex> lock(mutex_);
      holding_ = false;
      replies.swap(held_);
    }
    for (const QVReply &reply : replies) reply();
  }

  QVQueryItems items() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return items_;
  }
  std::size_t batches() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return batches_;
  }
  // Whether, before the deadline, an item was pushed of which `wanted` is true.
  bool waitForItem(const std::function<bool(const QVQueryItem &)> &wanted) const {
    std::unique_lock<std::mutex> lock(mutex_);
    return condition_.wait_for(lock, kTestDeadline, [&] {
      for (const auto &item : items_)
        if (wanted(*item)) return true;
      return false;
    });
  }
  bool waitForUpdate(const QVFileObjectID &fileObjectID) const {
    return waitForItem(
        [&](const QVQueryItem &item) { return !item.isDead() && item.fileObjectID() == fileObjectID; });
  }
  bool waitForUpdateOfName(const std::string &name) const {
    return waitForItem(
        [&](const QVQueryItem &item) { return !item.isDead() && item.fields().filename == name; });
  }
  bool waitForDeath(const QVFileObjectID &fileObjectID) const {
    return waitForItem(
        [&](const QVQueryItem &item) { return item.isDead() && item.fileObjectID() == fileObjectID; });
  }

 private:
  mutable std::mutex mutex_;
  mutable std::condition_variable condition_;
  QVQueryItems items_;
  std::vector<QVReply> held_;
  std::size_t batches_ = 0;
  bool holding_ = false;
};

// Keeps the names of the daemon's notifications.
// Thread contract: as above.
class RecordingSubscriber final : public QVDaemonNotificationReceiving {
 public:
  void receiveNotification(const std::string &name, QVReply reply) override {
    {
      const std::lock_guard<std::mutex> lock(mutex_);
      names_.push_back(name);
      condition_.notify_all();
    }
    reply();
  }
  std::vector<std::string> names() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return names_;
  }
  bool waitFor(const std::string &name) const {
    std::unique_lock<std::mutex> lock(mutex_);
    return condition_.wait_for(lock, kTestDeadline,
                               [&] { return std::find(names_.begin(), names_.end(), name) != names_.end(); });
  }

 private:
  mutable std::mutex mutex_;
  mutable std::condition_variable condition_;
  std::vector<std::string> names_;
};

}  // namespace droxa
