#include <gtest/gtest.h>

#include "sharing/_QVFileProviderShareOperationWrapper.h"
#include "tests/support/RecordingOperation.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;

TEST(_QVFileProviderShareOperationWrapper, cancellingItCancelsTheClientsOperation) {
  const auto operation = std::make_shared<RecordingOperation>();
  _QVFileProviderShareOperationWrapper wrapper(operation);
  wrapper.invalidate();
  EXPECT_EQ(operation->log.calls(), Lines{"invalidate"});
}

TEST(_QVFileProviderShareOperationWrapper, isDescribedAsTheClientsOperation) {
  EXPECT_EQ(_QVFileProviderShareOperationWrapper(std::make_shared<RecordingOperation>()).description(),
            "<recording operation>");
}

TEST(_QVFileProviderShareOperationWrapper, progressGoesOnUnchanged) {
  const auto operation = std::make_shared<RecordingOperation>();
  _QVFileProviderShareOperationWrapper wrapper(operation);
  wrapper.progressCallbackWithTopic("topic", {{"n", std::int64_t{1}}});
  wrapper.progressCallbackWithTopic("", {});
  EXPECT_EQ(operation->log.calls(), (Lines{"progress topic n=1", "progress "}));
}

TEST(_QVFileProviderShareOperationWrapper, aLaterRemoteOperationReplacesTheEarlierOne) {
  const auto operation = std::make_shared<RecordingOperation>();
  _QVFileProviderShareOperationWrapper wrapper(operation);
  auto first = std::make_shared<RecordingCancellable>();
  const std::weak_ptr<RecordingCancellable> released = first;
  wrapper.setRemoteOperationProxy(first, {});
  EXPECT_NE(operation->remote(), first);
  first = nullptr;
  const auto second = std::make_shared<RecordingCancellable>();
  wrapper.setRemoteOperationProxy(second, {{"again", std::string("yes")}});
  EXPECT_TRUE(released.expired());
  operation->remote()->invalidate();
  EXPECT_EQ(second->log.calls(), Lines{"invalidate"});
  EXPECT_EQ(operation->log.calls(), (Lines{"remote", "remote again=yes"}));
}

TEST(_QVFileProviderShareOperationWrapper, nothingHappensWithoutAnOperationOrARemoteOne) {
  _QVFileProviderShareOperationWrapper nobody(nullptr);
  nobody.progressCallbackWithTopic("topic", {});
  nobody.setRemoteOperationProxy(std::make_shared<RecordingCancellable>(), {});
  nobody.invalidate();
  EXPECT_EQ(nobody.description(), "(null)");

  const auto operation = std::make_shared<RecordingOperation>();
  _QVFileProviderShareOperationWrapper wrapper(operation);
  wrapper.setRemoteOperationProxy(nullptr, {});
  operation->remote()->invalidate();
  EXPECT_EQ(operation->log.calls(), Lines{"remote"});
}

TEST(_QVFileProviderShareOperationWrapper, abandonedItCancelsWhatTheDaemonHandsOverNowAndLater) {
  const auto operation = std::make_shared<RecordingOperation>();
  _QVFileProviderShareOperationWrapper wrapper(operation);
  const auto first = std::make_shared<RecordingCancellable>();
  wrapper.setRemoteOperationProxy(first, {});
  wrapper.abandon();
  EXPECT_EQ(first->log.calls(), Lines{"invalidate"});
  const auto second = std::make_shared<RecordingCancellable>();
  wrapper.setRemoteOperationProxy(second, {});
  EXPECT_EQ(second->log.calls(), Lines{"invalidate"});
  EXPECT_EQ(operation->log.calls(), (Lines{"remote", "remote"})) << "the client is told as ever";
}

}  // namespace
}  // namespace droxa
