#include <atomic>
#include <functional>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>

#include "enumeration/QVFileEnumerator.h"
#include "tessaly/QVNotifications.h"
#include "tests/enumeration/EnumerationFixture.h"

namespace droxa {
namespace {

// Everything that may happen to an enumerator, on threads of their own, with a daemon that answers on yet
// another. The observers check that each is answered exactly once; the sanitizers check the rest.
class FileEnumeratorStress : public EnumerationTest {
 protected:
  FileEnumeratorStress() { daemon.replies().answerOnAnotherThread(true); }
  ~FileEnumeratorStress() override { daemon.replies().answerOnAnotherThread(false); }

  void start(std::function<void(int round)> work) {
    threads_.emplace_back([work = std::move(work)] {
      for (int round = 0; round < kRounds; ++round) work(round);
    });
  }
  void join() {
    for (std::thread &thread : threads_) thread.join();
    threads_.clear();
  }
  // Lists, and follows the changes from there on.
  void startListing(const std::shared_ptr<OpenFileEnumerator> &enumerator) {
    start([=](int) { listPage(*enumerator, NSData()); });
  }
  void startFollowing(const std::shared_ptr<OpenFileEnumerator> &enumerator) {
    start([=](int) {
      const auto observer = changesSince(*enumerator, currentAnchor(*enumerator));
      if (!observer->error()) changesSince(*enumerator, observer->token());
    });
  }

  static constexpr int kRounds = 200;

 private:
  std::vector<std::thread> threads_;
};

TEST_F(FileEnumeratorStress, answersEachObserverOnce) {
  const auto enumerator = makeForRoot();
  startListing(enumerator);
  startListing(enumerator);
  startFollowing(enumerator);
  startFollowing(enumerator);
  start([&](int round) {
    const auto number = static_cast<std::uint64_t>(round % 7 + 1);
    push(*enumerator, {live(number), dead(number + 1)});
  });
  start([&](int round) {
    if (round % 20 == 0) enumerator->invalidateChangeToken();
  });
  start([&](int round) {
    const bool ofAccount = round % 2 == 0;
    NSNotificationCenter::defaultCenter().postNotificationName(
        ofAccount ? QVAccountTokenDidChangeNotification : QVContainerListDidChangeNotification);
  });
  start([&](int round) {
    if (round % 10 == 0)
      enumerator->_handleNotificationError(NSError(QVTessalyErrorDomain, QVErrorShuttingDown));
  });
  join();
}

TEST_F(FileEnumeratorStress, answersEachObserverOnceAroundAnInvalidation) {
  const auto enumerator = makeForFolder();
  startListing(enumerator);
  startFollowing(enumerator);
  start([&](int round) { daemon.addDocument("Folder/" + std::to_string(round)); });
  start([&](int round) {
    if (round == kRounds / 2) enumerator->invalidate();
  });
  join();
  enumerator->drain();
  EXPECT_FALSE(enumerator->hasSender());
  EXPECT_EQ(enumerator->registrations(), 0u);
}

TEST_F(FileEnumeratorStress, losesNoUpdateBetweenBatches) {
  const auto enumerator = makeForFolder();
  std::atomic<bool> done{false};
  std::size_t reported = 0;
  std::thread follower([&] {
    NSData anchor = currentAnchor(*enumerator);
    for (bool last = false; !last;) {
      last = done;
      const auto observer = changesSince(*enumerator, anchor);
      EXPECT_EQ(observer->error(), NSError());
      reported += observer->items().size();
      anchor = observer->token();
    }
  });
  std::atomic<std::uint64_t> next{1};
  for (int i = 0; i < 3; ++i) start([&](int) { push(*enumerator, {live(next++)}); });
  join();
  done = true;
  follower.join();
  EXPECT_EQ(reported, static_cast<std::size_t>(3 * kRounds));
}

}  // namespace
}  // namespace droxa
