#include "tests/thumbnails/ThumbnailsFixture.h"

namespace droxa {
namespace {

class CancelThumbnails : public ThumbnailsTest {
 protected:
  // Three batches of one; the first one hangs until it is let go.
  void start() {
    setLimit(1);
    for (int i = 0; i < 3; ++i) identifiers.push_back(addDocument("d" + std::to_string(i), 10, "thumbnail"));
    FaultyCloud::Fault slow;
    slow.delay = std::chrono::milliseconds(300);
    cloud->onNextCall(Call::fetchRecords, slow);
    progress = extension->fetchThumbnailsForItemIdentifiers(identifiers, {64, 64}, answers.handler(),
                                                            answers.done.completion());
  }

  std::vector<std::string> identifiers;
  ThumbnailAnswers answers;
};

TEST_F(CancelThumbnails, whatWaitsForItsTurnIsCancelledAndTheBatchUnderWayIsSeenToItsEnd) {
  start();
  ASSERT_TRUE(progress->isCancellable());
  progress->cancel();
  EXPECT_TRUE(CKErrorIs(answers.done.value<0>(), CKErrorCode::operationCancelled));
  EXPECT_EQ(answers.all().size(), 1U);
  EXPECT_EQ(cloud->count(Call::fetchRecords), 1);
  EXPECT_EQ(count("completed fetching thumbnail batch"), 3U);
}

TEST_F(CancelThumbnails, cancellingWhatHasEndedDoesNothing) {
  start();
  EXPECT_EQ(answers.done.value<0>(), NSError());
  progress->cancel();
  EXPECT_EQ(answers.all().size(), 3U);
}

}  // namespace
}  // namespace droxa
