#include <future>
#include <gtest/gtest.h>

#include "enumeration/QVBaseFileEnumerator.h"
#include "platform/usermanagement/UMUserManager.h"
#include "tessaly/QVPersona.h"
#include "tests/enumeration/EnumerationFixture.h"

namespace droxa {
namespace {

class BaseFileEnumerator : public EnumerationTest {
 protected:
  const std::shared_ptr<OpenBaseEnumerator> enumerator = OpenBaseEnumerator::make(folder, folder.asString());
};
using BaseFileEnumeratorDeathTest = BaseFileEnumerator;

TEST_F(BaseFileEnumerator, hasASerialQueueOfItsOwn) {
  EXPECT_EQ(dispatch_queue_get_label(enumerator->_queue), "file-enumerator");
  EXPECT_EQ(dispatch_queue_get_attr(enumerator->_queue).autoreleaseFrequency,
            DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM);
  EXPECT_NE(OpenBaseEnumerator::make(folder, folder.asString())->_queue, enumerator->_queue);
}

TEST_F(BaseFileEnumerator, remembersNoPersonaWithoutTheHook) {
  EXPECT_EQ(enumerator->_personaID, std::nullopt);
}

TEST_F(BaseFileEnumerator, remembersThePersonaOfItsCreationWithTheHook) {
  UMConfiguration configuration;
  configuration.personas = {{"work", true}};
  configuration.processPersona = "work";
  UMSetConfiguration(configuration);
  qvc_block_remember_persona = [](QVBlock block) { return block; };
  const auto underPersona = OpenBaseEnumerator::make(folder, folder.asString());
  UMSetConfiguration({});
  const auto underDefault = OpenBaseEnumerator::make(folder, folder.asString());
  qvc_block_remember_persona = nullptr;
  EXPECT_EQ(underPersona->_personaID, "work");
  EXPECT_EQ(underDefault->_personaID, QVDefaultPersonaID);
}

TEST_F(BaseFileEnumerator, invalidatesLaterOnItsQueue) {
  std::promise<void> mayGoOn;
  dispatch_async(enumerator->_queue, [&, gate = mayGoOn.get_future().share()] { gate.wait(); });
  enumerator->invalidate();  // returns while the queue is busy
  mayGoOn.set_value();
  dispatch_sync(enumerator->_queue, [] {});
}

TEST_F(BaseFileEnumerator, livesUntilItsInvalidationHasRun) {
  auto other = OpenBaseEnumerator::make(folder, folder.asString());
  const dispatch_queue_t queue = other->_queue;
  const std::weak_ptr<OpenBaseEnumerator> weak = other;
  std::promise<void> mayGoOn;
  dispatch_async(queue, [gate = mayGoOn.get_future().share()] { gate.wait(); });
  other->invalidate();
  other.reset();
  EXPECT_FALSE(weak.expired());
  mayGoOn.set_value();
  EXPECT_TRUE(eventually([&] { return weak.expired(); }));
}

TEST_F(BaseFileEnumerator, mayBeInvalidatedTwice) {
  enumerator->invalidate();
  enumerator->invalidate();
  dispatch_sync(enumerator->_queue, [] {});
}

TEST_F(BaseFileEnumerator, invalidationLeavesTheChangeTokenValid) {
  const NSData anchor = currentAnchor(*enumerator);
  dispatch_sync(enumerator->_queue, [&] { enumerator->_invalidate(); });
  EXPECT_EQ(currentAnchor(*enumerator), anchor);
  EXPECT_EQ(changesSince(*enumerator, anchor)->error(), NSError());
}

TEST_F(BaseFileEnumerator, invalidatingTheChangeTokenSaysSo) {
  enumerator->invalidateChangeToken();
  EXPECT_EQ(logLines(), std::vector<std::string>{"debug: [DEBUG] invalidating change token"});
}

TEST_F(BaseFileEnumeratorDeathTest, invalidationBelongsOnTheQueue) {
  EXPECT_DEATH(enumerator->_invalidate(), "file-enumerator");
}

TEST_F(BaseFileEnumeratorDeathTest, endingTheObservationBelongsOnTheQueue) {
  EXPECT_DEATH(enumerator->_stopObservingAccountChanges(), "file-enumerator");
}

}  // namespace
}  // namespace droxa
