// Downloads that want the newest version that the cloud has, and not what happens to be here.

#include <gtest/gtest.h>

#include "tests/keld/sync/TwoDevices.h"

namespace droxa::keld {
namespace {

using CurrentVersion = TwoDevices;

// Ben hasn't been told of the change when he asks, or has; the download ends with it either way.
TEST_F(CurrentVersion, comesWithTheDownloadThatWantsIt) {
  share("a.txt", "one");
  EXPECT_EQ(ben.contents("a.txt"), "one");
  for (const std::string text : {"second", "third, longer"}) {
    anna.keld.write("a.txt", text);
    ASSERT_FALSE(anna.waitForUploads("a.txt"));
    const auto transfer = ben.startDownload("a.txt", QVDownloadForReader | QVDownloadCurrentVersion);
    ASSERT_TRUE(transfer);
    Once<NSError> ended("the download");
    transfer->waitWithReply(ended.completion());
    EXPECT_FALSE(ended.value<0>()) << ended.value<0>().description();
    EXPECT_EQ(ben.read("a.txt"), text);
  }
}

TEST_F(CurrentVersion, ofADatalessDocumentIsFetchedToo) {
  share("a.txt", "one");
  anna.keld.write("a.txt", "second");
  ASSERT_FALSE(anna.waitForUploads("a.txt"));
  const auto transfer = ben.startDownload("a.txt", QVDownloadForReader | QVDownloadCurrentVersion);
  ASSERT_TRUE(transfer);
  Once<NSError> ended("the download");
  transfer->waitWithReply(ended.completion());
  EXPECT_FALSE(ended.value<0>());
  EXPECT_EQ(ben.read("a.txt"), "second");
}

}  // namespace
}  // namespace droxa::keld
