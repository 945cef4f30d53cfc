#pragma once

#include "tessaly/QVMoveCapability.h"
#include "tests/support/Eventually.h"
#include "tests/support/conformance/DaemonConformanceFixture.h"
#include "tests/support/conformance/Senders.h"

// Contents: fetching them, letting go of them, pinning, moves. All of it needs a world with a cloud.

namespace droxa {

class DaemonContentsConformance : public DaemonConformance {
 protected:
  // Skips the test in a world that has no dataless documents.
  void SetUp() override {
    DaemonConformance::SetUp();
    if (!world_->addDatalessDocument(at("dataless"), "twelve bytes")) GTEST_SKIP() << "no cloud";
    settle();
  }
  void dataless(const std::string &path, const std::string &contents = "contents") {
    ASSERT_TRUE(world_->addDatalessDocument(at(path), contents));
  }

  std::shared_ptr<QVTransfer> start(const std::string &path, NSError *error = nullptr) {
    Once<std::shared_ptr<QVTransfer>, NSError> answer("download of " + path);
    daemon()->startDownloadAtURL(at(path), QVDownloadForReader, answer.completion());
    if (error) *error = answer.value<1>();
    EXPECT_EQ(answer.value<0>() == nullptr, bool(answer.value<1>()));
    return answer.value<0>();
  }
  static NSError end(const std::shared_ptr<QVTransferring> &transfer) {
    if (!transfer) return NSError(NSPOSIXErrorDomain, 0);
    Once<NSError> answer("end of the transfer");
    transfer->waitWithReply(answer.completion());
    return answer.value<0>();
  }
  NSError download(const std::string &path) { return end(start(path)); }
  QVContentsStatus status(const std::string &path) {
    Once<QVContentsStatus, NSError> answer("contents of " + path);
    daemon()->getContentsStatusAtURL(at(path), answer.completion());
    EXPECT_EQ(answer.value<1>(), NSError());
    return answer.value<0>();
  }
  QVContentsState state(const std::string &path) { return status(path).contents; }
  QVContentsResult evict(const std::string &path, NSError *error = nullptr) {
    Once<QVContentsResult, NSError> answer("eviction of " + path);
    daemon()->evictItemAtURL(at(path), answer.completion());
    if (error)
      *error = answer.value<1>();
    else
      EXPECT_EQ(answer.value<1>(), NSError());
    return answer.value<0>();
  }
  NSError pin(const std::string &path, bool isPinned) {
    Once<NSError> answer("pin of " + path);
    daemon()->setPinnedAtURL(at(path), isPinned, answer.completion());
    return answer.value<0>();
  }
  NSError waitForUpload(const NSURL &url) {
    Once<NSError> answer("upload");
    daemon()->waitForUploadAtURL(url, answer.completion());
    return answer.value<0>();
  }
  std::uint64_t move(const NSURL &source, const NSURL &destination, NSError *error = nullptr) {
    Once<std::uint64_t, NSError> answer("move");
    daemon()->getMoveCapability(source, destination, answer.completion());
    if (error) *error = answer.value<1>();
    return answer.value<0>();
  }
  // Expects every question about contents to be answered with the code.
  void expectCodeOfEach(const std::string &path, std::int64_t code) {
    NSError error;
    EXPECT_FALSE(start(path, &error));
    EXPECT_EQ(tessalyCode(error), code);
    evict(path, &error);
    EXPECT_EQ(tessalyCode(error), code);
    EXPECT_EQ(tessalyCode(pin(path, true)), code);
    Once<QVContentsStatus, NSError> contents("contents");
    daemon()->getContentsStatusAtURL(at(path), contents.completion());
    EXPECT_EQ(tessalyCode(contents.value<1>()), code);
    EXPECT_EQ(tessalyCode(waitForUpload(at(path))), code);
    EXPECT_EQ(move(at(path), at("elsewhere"), &error), 0U);
    EXPECT_EQ(tessalyCode(error), code);
  }
};

TEST_P(DaemonContentsConformance, aDatalessDocumentIsListedWithItsSize) {
  EXPECT_FALSE(item("dataless")->fields().isDownloaded);
  EXPECT_EQ(item("dataless")->fields().documentSize, 12U);
  EXPECT_EQ(state("dataless"), QVContentsState::dataless);
  EXPECT_EQ(status("dataless").size, 12U);
  EXPECT_EQ(status("dataless").upload, QVUploadState::inCloud);
}

TEST_P(DaemonContentsConformance, aDownloadEndsWithTheContentsHere) {
  EXPECT_EQ(download("dataless"), NSError());
  EXPECT_EQ(state("dataless"), QVContentsState::present);
  settle();
  EXPECT_TRUE(item("dataless")->fields().isDownloaded);
  EXPECT_EQ(item("dataless")->fields().documentSize, 12U);
}

TEST_P(DaemonContentsConformance, aDownloadOfWhatIsHereHasEnded) {
  file("here", 5);
  settle();
  EXPECT_EQ(download("here"), NSError());
  EXPECT_EQ(state("here"), QVContentsState::present);
}

TEST_P(DaemonContentsConformance, aDownloadOfAFolderBringsEverythingBelow) {
  folder("f");
  folder("f/g");
  dataless("f/a");
  dataless("f/g/b");
  settle();
  EXPECT_EQ(state("f"), QVContentsState::dataless);
  EXPECT_EQ(status("f").dataless, 2U);
  EXPECT_EQ(status("f").documents, 2U);
  EXPECT_EQ(download("f"), NSError());
  EXPECT_EQ(state("f"), QVContentsState::present);
  EXPECT_EQ(state("f/g/b"), QVContentsState::present);
  EXPECT_EQ(state("dataless"), QVContentsState::dataless);
}

TEST_P(DaemonContentsConformance, everyInterestInADownloadIsToldOfItsEnd) {
  const auto first = start("dataless");
  const auto second = start("dataless");
  EXPECT_EQ(end(first), NSError());
  EXPECT_EQ(end(second), NSError());
  EXPECT_EQ(end(second), NSError());
}

TEST_P(DaemonContentsConformance, whatIsDownloadedIsPushedToThoseWhoWatch) {
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("")), NSError());
  EXPECT_EQ(download("dataless"), NSError());
  settle();
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("dataless"));
}

TEST_P(DaemonContentsConformance, aTransferThatHasEndedIsCompleteAndNotCancelledAnyMore) {
  const auto transfer = start("dataless");
  EXPECT_EQ(end(transfer), NSError());
  Once<std::uint64_t, std::uint64_t> progress("progress");
  transfer->getProgress(progress.completion());
  EXPECT_EQ(progress.value<0>(), progress.value<1>());
  transfer->cancel();
  EXPECT_EQ(end(transfer), NSError());
}

TEST_P(DaemonContentsConformance, anEvictedDocumentIsDatalessAndComesBack) {
  EXPECT_EQ(download("dataless"), NSError());
  const QVContentsResult result = evict("dataless");
  EXPECT_EQ(result.documents, 1U);
  EXPECT_EQ(result.refused, 0U);
  EXPECT_TRUE(result.failures.empty());
  EXPECT_EQ(state("dataless"), QVContentsState::dataless);
  settle();
  EXPECT_FALSE(item("dataless")->fields().isDownloaded);
  EXPECT_EQ(download("dataless"), NSError());
  EXPECT_EQ(state("dataless"), QVContentsState::present);
}

TEST_P(DaemonContentsConformance, whatIsDatalessIsEvictedWithoutAnError) {
  EXPECT_EQ(evict("dataless").refused, 0U);
  EXPECT_EQ(state("dataless"), QVContentsState::dataless);
}

TEST_P(DaemonContentsConformance, aPinnedDocumentIsFetchedAndNotEvicted) {
  EXPECT_EQ(pin("dataless", true), NSError());
  EXPECT_TRUE(eventually([&] { return state("dataless") == QVContentsState::present; }));
  EXPECT_TRUE(status("dataless").isPinned);
  NSError error;
  const QVContentsResult result = evict("dataless", &error);
  EXPECT_EQ(tessalyCode(error), QVErrorPinned);
  EXPECT_EQ(result.documents, 0U);
  EXPECT_EQ(state("dataless"), QVContentsState::present);
  EXPECT_EQ(pin("dataless", false), NSError());
  EXPECT_FALSE(status("dataless").isPinned);
  EXPECT_TRUE(eventually([&] { return evict("dataless", &error).documents == 1; })) << error.description();
}

TEST_P(DaemonContentsConformance, anEvictedFolderKeepsWhatIsRefused) {
  folder("f");
  dataless("f/kept");
  dataless("f/let go");
  settle();
  EXPECT_EQ(download("f"), NSError());
  EXPECT_EQ(pin("f/kept", true), NSError());
  const QVContentsResult result = evict("f");
  EXPECT_EQ(result.documents, 1U);
  EXPECT_EQ(result.refused, 1U);
  ASSERT_EQ(result.failures.size(), 1U);
  EXPECT_EQ(result.failures[0].path, at("f/kept").path());
  EXPECT_EQ(tessalyCode(result.failures[0].error), QVErrorPinned);
  EXPECT_EQ(state("f/kept"), QVContentsState::present);
  EXPECT_EQ(state("f/let go"), QVContentsState::dataless);
}

TEST_P(DaemonContentsConformance, whatWasUploadedIsInTheCloud) {
  file("new", 7);
  settle();
  EXPECT_EQ(waitForUpload(at("new")), NSError());
  EXPECT_EQ(status("new").upload, QVUploadState::inCloud);
  EXPECT_EQ(waitForUpload(NSURL()), NSError());
}

TEST_P(DaemonContentsConformance, whereNothingIsThereAreNoContents) {
  expectCodeOfEach("missing", QVErrorNoSuchItem);
}

TEST_P(DaemonContentsConformance, thereAreNoContentsWhileNobodyIsSignedIn) {
  signOut();
  expectCodeOfEach("dataless", QVErrorLoggedOut);
  EXPECT_EQ(tessalyCode(waitForUpload(NSURL())), QVErrorLoggedOut);
}

TEST_P(DaemonContentsConformance, aMoveWithinItsContainerNeedsNoContents) {
  folder("f");
  settle();
  for (const char *name : {"f/moved", "renamed"}) {
    const std::uint64_t capability = move(at("dataless"), at(name));
    EXPECT_NE(capability & QVMoveAllowed, 0U);
    EXPECT_EQ(capability & QVMoveNeedsContents, 0U);
  }
}

TEST_P(DaemonContentsConformance, aDatalessDocumentNeedsItsContentsToLeave) {
  const NSURL other = world_->documents(kConformanceContainer);
  const NSURL away = NSURL::fileURLWithPath("/tmp/away");
  file("here");
  settle();
  for (const NSURL &destination : {other.URLByAppendingPathComponent("moved"), away}) {
    EXPECT_NE(move(at("dataless"), destination) & QVMoveNeedsContents, 0U);
    EXPECT_EQ(move(at("here"), destination) & QVMoveNeedsContents, 0U);
    EXPECT_NE(move(at("here"), destination) & QVMoveAllowed, 0U);
  }
}

TEST_P(DaemonContentsConformance, aFolderIsNotMovedIntoItself) {
  folder("f");
  settle();
  EXPECT_EQ(move(at("f"), at("f/g")) & QVMoveAllowed, 0U);
}

TEST_P(DaemonContentsConformance, downloadsAreCounted) {
  Once<QVTransferStatus, NSError> before("transfers");
  daemon()->getTransferStatus(before.completion());
  EXPECT_EQ(before.value<1>(), NSError());
  EXPECT_EQ(download("dataless"), NSError());
  Once<QVTransferStatus, NSError> after("transfers");
  daemon()->getTransferStatus(after.completion());
  EXPECT_EQ(after.value<0>().downloads.done, before.value<0>().downloads.done + 1);
  EXPECT_TRUE(after.value<0>().isCloudReachable);
}

}  // namespace droxa
