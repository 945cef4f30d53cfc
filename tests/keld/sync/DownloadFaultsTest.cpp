#include <sys/mount.h>
#include <sys/stat.h>
#include <thread>

#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

constexpr std::size_t kSize = 3 << 20;

std::string bytes(std::size_t size, unsigned seed = 1) {
  std::string text(size, '\0');
  for (char &c : text) c = static_cast<char>((seed = seed * 1664525 + 1013904223) >> 24);
  return text;
}

KeldOptions quickToGiveUp() {
  KeldOptions options;
  options.sync.downloads.stallTimeout = std::chrono::milliseconds(300);
  options.sync.downloads.atOnce = 2;
  return options;
}

class DownloadFaults : public FaultyDrive {
 protected:
  DownloadFaults() : FaultyDrive(quickToGiveUp()) {}

  NSError end(const std::shared_ptr<QVTransfer> &transfer) {
    Once<NSError> answer("end of a transfer");
    transfer->waitWithReply(answer.completion());
    return answer.value<0>();
  }
  void expectNames(const NSError &error, const std::string &path) {
    EXPECT_NE(error.localizedDescription().find(device.keld.at(path)), std::string::npos)
        << error.description();
  }
  bool reads(int calls) {
    return eventually([&] { return cloud->count(Call::readAsset) >= calls; });
  }
  bool hangs() {
    return eventually([&] { return cloud->hanging() > 0; });
  }
  std::uint64_t partLength() {
    std::uint64_t length = 0;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(device.keld.replica() + "/" +
                                                                           std::string(kContentsStorageName)))
      if (entry.path().extension() == ".part") length += std::filesystem::file_size(entry.path());
    return length;
  }
};

TEST_F(DownloadFaults, aHundredWhoWantADocumentCauseOneRead) {
  dataless("a", bytes(kSize));
  Fault slow;
  slow.delay = std::chrono::milliseconds(100);
  cloud->onEveryCall(Call::readAsset, slow);
  std::vector<std::thread> threads;
  std::vector<std::shared_ptr<QVTransfer>> transfers(100);
  for (std::size_t index = 0; index < transfers.size(); ++index)
    threads.emplace_back([&, index] { transfers[index] = device.startDownload("a"); });
  for (std::thread &thread : threads) thread.join();
  for (const auto &transfer : transfers) EXPECT_FALSE(end(transfer));
  EXPECT_EQ(cloud->count(Call::readAsset), 1);
  EXPECT_EQ(device.read("a"), bytes(kSize));
}

TEST_F(DownloadFaults, oneThatIsCancelledWhileItWaitsReadsNothing) {
  for (const char *name : {"a", "b", "c"}) dataless(name, std::string("contents of ") + name);
  cloud->onEveryCall(Call::readAsset, hanging());
  const auto a = device.startDownload("a", 0);
  const auto b = device.startDownload("b", 0);
  ASSERT_TRUE(reads(2));
  const auto c = device.startDownload("c", 0);
  c->cancel();
  EXPECT_TRUE(end(c).is(QVTessalyErrorDomain, QVErrorCancelled));
  a->cancel();
  b->cancel();
  EXPECT_TRUE(end(a).is(QVTessalyErrorDomain, QVErrorCancelled));
  cloud->clearFaults();
  EXPECT_EQ(device.contents("c"), "contents of c");
}

TEST_F(DownloadFaults, thePartOfACancelledDownloadIsResumedWhereItEnded) {
  const std::string contents = bytes(kSize);
  dataless("a", contents);
  Fault stuck;
  stuck.endsAt = kSize / 2;
  stuck.hangsAtEnd = true;
  cloud->onNextCall(Call::readAsset, stuck);
  const auto transfer = device.startDownload("a");
  ASSERT_TRUE(hangs());
  transfer->cancel();
  EXPECT_TRUE(end(transfer).is(QVTessalyErrorDomain, QVErrorCancelled));
  ASSERT_TRUE(eventually([&] { return cloud->hanging() == 0; }));
  EXPECT_EQ(partLength(), kSize / 2);
  EXPECT_TRUE(device.isDataless("a"));
  // Half of it is wrong in the cloud now; only what is asked for comes from there.
  Fault damaged;
  damaged.wrongByteAt = 10;
  cloud->onNextCall(Call::readAsset, damaged);
  EXPECT_EQ(device.contents("a"), contents);
}

TEST_F(DownloadFaults, whoWantsItAfterTheLastOneCancelledGetsIt) {
  dataless("a", "contents");
  cloud->onNextCall(Call::readAsset, hanging());
  const auto first = device.startDownload("a");
  ASSERT_TRUE(hangs());
  first->cancel();
  const auto second = device.startDownload("a");  // while the first one's call is on its way out
  EXPECT_TRUE(end(first).is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_FALSE(end(second));
  EXPECT_EQ(device.read("a"), "contents");
}

TEST_F(DownloadFaults, oneThatCancelsLeavesTheOthersTheirs) {
  dataless("a", "contents");
  Fault slow;
  slow.delay = std::chrono::milliseconds(100);
  cloud->onNextCall(Call::readAsset, slow);
  const auto first = device.startDownload("a");
  const auto second = device.startDownload("a");
  first->cancel();
  first->cancel();
  EXPECT_TRUE(end(first).is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_FALSE(end(second));
}

TEST_F(DownloadFaults, aCloudThatHangsEndsItAndItGoesOnLater) {
  const std::string contents = bytes(kSize);
  dataless("a", contents);
  Fault stuck;
  stuck.endsAt = kSize / 3;
  stuck.hangsAtEnd = true;
  cloud->onNextCall(Call::readAsset, stuck);
  cloud->onCall(Call::readAsset, 2, hanging());
  const NSError error = device.download("a");
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, 4355)) << error.description();
  expectNames(error, "a");
  EXPECT_TRUE(device.isDataless("a"));
  EXPECT_EQ(partLength(), kSize / 3);
  EXPECT_EQ(device.contents("a"), contents);
}

TEST_F(DownloadFaults, aTransferThatMovesIsNotGivenUp) {
  const std::string contents = bytes(kSize);
  dataless("a", contents);
  for (std::uint64_t call = 1; call <= 4; ++call) {
    Fault stuck;
    stuck.endsAt = call * kSize / 5;
    stuck.hangsAtEnd = true;
    cloud->onCall(Call::readAsset, static_cast<int>(call), stuck);
  }
  EXPECT_EQ(device.contents("a"), contents);
}

TEST_F(DownloadFaults, wrongBytesChangeNothingAndTheNextTryWorks) {
  const std::string contents = bytes(kSize);
  dataless("a", contents);
  for (const std::uint64_t at : {std::uint64_t{0}, kSize / 2, kSize - 1}) {
    Fault damaged;
    damaged.wrongByteAt = at;
    cloud->onNextCall(Call::readAsset, damaged);
    const NSError error = device.download("a");
    EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorChecksumMismatch)) << error.description();
    expectNames(error, "a");
    struct stat status = {};
    ASSERT_EQ(::stat(device.keld.at("a").c_str(), &status), 0);
    EXPECT_LE(status.st_blocks, 8);
    EXPECT_TRUE(device.isDataless("a"));
    EXPECT_EQ(device.status("a").error.code(), QVErrorChecksumMismatch);
  }
  EXPECT_EQ(device.contents("a"), contents);
  EXPECT_FALSE(device.status("a").error);
}

TEST_F(DownloadFaults, contentsThatEndTooSoonAreWrong) {
  dataless("a", bytes(kSize));
  Fault shortened;
  shortened.endsAt = kSize - 1;
  cloud->onNextCall(Call::readAsset, shortened);
  EXPECT_TRUE(device.download("a").is(QVTessalyErrorDomain, QVErrorChecksumMismatch));
  EXPECT_TRUE(device.isDataless("a"));
  EXPECT_EQ(device.contents("a"), bytes(kSize));
}

TEST_F(DownloadFaults, errorsOfTheNetworkAreToldAndTheNextTryGoesOn) {
  dataless("a", bytes(kSize));
  for (const CKErrorCode code : {CKErrorCode::networkFailure, CKErrorCode::networkUnavailable,
                                 CKErrorCode::serviceUnavailable, CKErrorCode::requestRateLimited}) {
    cloud->onNextCall(Call::readAsset, failing(code));
    const NSError error = device.download("a");
    EXPECT_TRUE(error.is(NSCocoaErrorDomain, 4355)) << error.description();
    expectNames(error, "a");
  }
  Fault broken;
  broken.endsAt = 1 << 20;
  broken.errorAtEnd = CKErrorMake(CKErrorCode::networkFailure, "cut");
  cloud->onNextCall(Call::readAsset, broken);
  EXPECT_TRUE(device.download("a").is(NSCocoaErrorDomain, 4355));
  EXPECT_EQ(partLength(), 1U << 20);
  EXPECT_EQ(device.contents("a"), bytes(kSize));
}

TEST_F(DownloadFaults, contentsThatTheCloudLostAreToldAsThat) {
  dataless("a", "contents");
  for (const CKErrorCode code : {CKErrorCode::unknownItem, CKErrorCode::assetNotAvailable}) {
    cloud->onNextCall(Call::readAsset, failing(code));
    const NSError error = device.download("a");
    EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorChecksumMismatch)) << error.description();
  }
  EXPECT_TRUE(device.isDataless("a"));
}

TEST_F(DownloadFaults, aReaderOvertakesWhatWaitsInTheBackground) {
  for (const char *name : {"a", "b", "c", "d"}) dataless(name, std::string("contents of ") + name);
  cloud->onCall(Call::readAsset, 1, hanging());
  cloud->onCall(Call::readAsset, 2, hanging());
  std::vector<std::shared_ptr<QVTransfer>> queued;
  for (const char *name : {"a", "b", "c"})
    queued.push_back(device.startDownload(name, QVDownloadInBackground));
  ASSERT_TRUE(reads(2));
  EXPECT_EQ(device.download("d"), NSError());
  EXPECT_NE(device.status("c").contents, QVContentsState::present);
  for (const auto &transfer : queued) transfer->cancel();
}

TEST_F(DownloadFaults, twoDocumentsOfTheSameContentsWaitForEachOther) {
  dataless("a", bytes(kSize));
  dataless("b", bytes(kSize));
  const auto a = device.startDownload("a");
  const auto b = device.startDownload("b");
  EXPECT_FALSE(end(a));
  EXPECT_FALSE(end(b));
  EXPECT_EQ(device.read("a"), bytes(kSize));
  EXPECT_EQ(device.read("b"), bytes(kSize));
}

// --- The document changes while it is on its way.

class DownloadMeanwhile : public DownloadFaults {
 protected:
  // Begins a download, and lets it end after `meanwhile`.
  NSError downloadWhile(const std::function<void()> &meanwhile) {
    Fault slow;
    slow.delay = std::chrono::milliseconds(200);
    cloud->onNextCall(Call::readAsset, slow);
    const auto transfer = device.startDownload("a");
    EXPECT_TRUE(reads(1));
    meanwhile();
    return end(transfer);
  }
};

TEST_F(DownloadMeanwhile, aDocumentThatIsRenamedGetsItsContents) {
  dataless("a", "contents");
  EXPECT_FALSE(downloadWhile([&] { device.keld.rename("a", "b"); }));
  EXPECT_EQ(device.read("b"), "contents");
  EXPECT_FALSE(device.exists("a"));
  EXPECT_TRUE(isInCloudSoon("b"));
}

TEST_F(DownloadMeanwhile, aDocumentThatIsDeletedStaysAway) {
  dataless("a", "contents");
  const NSError error = downloadWhile([&] { device.keld.remove("a"); });
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorNoSuchItem)) << error.description();
  expectNames(error, "a");
  EXPECT_FALSE(device.exists("a"));
  EXPECT_TRUE(leavesCloudSoon("a"));
}

TEST_F(DownloadMeanwhile, whatIsWrittenAnewIsKept) {
  dataless("a", "contents");
  EXPECT_FALSE(downloadWhile([&] { device.keld.write("a", "written here"); }));
  EXPECT_EQ(device.read("a"), "written here");
  EXPECT_TRUE(eventually([&] { return hand.contents("a") == "written here"; }));
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(DownloadMeanwhile, aFileThatIsPutInItsPlaceIsKept) {
  dataless("a", "contents");
  EXPECT_FALSE(downloadWhile([&] {
    device.keld.write("/" + device.keld.replica() + "/other", "another file");
    std::filesystem::rename(device.keld.replica() + "/other", device.keld.at("a"));
  }));
  EXPECT_EQ(device.read("a"), "another file");
  EXPECT_TRUE(eventually([&] { return hand.contents("a") == "another file"; }));
}

TEST_F(DownloadMeanwhile, aNewerVersionComesInstead) {
  dataless("a", "contents");
  EXPECT_FALSE(downloadWhile([&] {
    hand.put("a", "newer contents");
    EXPECT_TRUE(eventually([&] { return device.status("a").size == 14; }));
  }));
  EXPECT_EQ(device.contents("a"), "newer contents");
}

// --- Space.

TEST(DownloadSpace, aFullDiskIsToldAndTheNextTryWorks) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root mounts a small disk";
  const TemporaryFolder folder;
  const std::string cloudFolder = folder.path() + "/cloud";
  CloudHand hand(cloudFolder);
  KeldOptions options = DeviceOptions(cloudFolder, "ben");
  options.sync.contents.spaceToLeave = 0;
  KeldFixture keld(options, false);
  std::filesystem::create_directories(keld.replica());
  if (::mount("tmpfs", keld.replica().c_str(), "tmpfs", 0, "size=4m") != 0)
    GTEST_SKIP() << "no tmpfs can be mounted here";
  struct Unmount {
    std::string path;
    ~Unmount() { ::umount2(path.c_str(), MNT_DETACH); }
  } unmount{keld.replica()};
  { Device device(options); }
  hand.put("large", bytes(3 << 20));
  keld.start();
  keld.waitForFirstScan();
  ASSERT_TRUE(eventually([&] { return keld.knows("large"); }));
  std::ofstream(keld.replica() + "/" + std::string(QVUbiquitousDefaultContainerID) + "/fill",
                std::ios::binary)
      << std::string(2 << 20, 'f');
  const auto download = [&] {
    Once<std::shared_ptr<QVTransfer>, NSError> started("download");
    keld.session()->startDownloadAtURL(NSURL::fileURLWithPath(keld.at("large")), QVDownloadForReader,
                                       started.completion());
    Once<NSError> ended("its end");
    started.value<0>()->waitWithReply(ended.completion());
    return ended.value<0>();
  };
  const NSError error = download();
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, ENOSPC)) << error.description();
  EXPECT_NE(error.localizedDescription().find(keld.at("large")), std::string::npos) << error.description();
  std::filesystem::remove(keld.replica() + "/" + std::string(QVUbiquitousDefaultContainerID) + "/fill");
  EXPECT_FALSE(download());
  keld.stop();
}

TEST(DownloadSpace, whatIsToStayFreeIsLeftFree) {
  const TemporaryFolder folder;
  CloudHand hand(folder.path() + "/cloud");
  KeldOptions options = DeviceOptions(folder.path() + "/cloud", "ben");
  options.sync.contents.spaceToLeave = std::uint64_t{1} << 60;
  Device device(options);
  hand.put("a", "contents");
  ASSERT_TRUE(device.knowsSoon("a"));
  const NSError error = device.download("a");
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, ENOSPC)) << error.description();
  EXPECT_NE(error.localizedDescription().find(device.keld.at("a")), std::string::npos) << error.description();
  EXPECT_TRUE(device.isDataless("a"));
}

// --- Folders.

TEST_F(DownloadFaults, aFolderEndsWithItsFirstErrorAndCountsAll) {
  hand.folder("f");
  for (int index = 0; index < 5; ++index) hand.put("f/" + std::to_string(index), bytes(1000));
  hand.put("f/wrong", bytes(2000, 7));
  ASSERT_TRUE(eventually([&] {
    return device.keld.knows("f") && device.status("f").documents == 6 && device.status("f").dataless == 6;
  }));
  cloud->onEveryCall(Call::readAsset, failing(CKErrorCode::networkFailure));
  const auto failed = device.startDownload("f");
  EXPECT_TRUE(end(failed).is(NSCocoaErrorDomain, 4355));
  cloud->clearFaults();
  const auto transfer = device.startDownload("f");
  EXPECT_FALSE(end(transfer));
  Once<std::uint64_t, std::uint64_t> progress("progress");
  transfer->getProgress(progress.completion());
  EXPECT_EQ(progress.value<0>(), 7000U);
  EXPECT_EQ(progress.value<1>(), 7000U);
  EXPECT_EQ(device.status("f").dataless, 0U);
}

TEST_F(DownloadFaults, progressGoesUpToTheEnd) {
  dataless("a", bytes(kSize));
  Fault stuck;
  stuck.endsAt = kSize / 2;
  stuck.hangsAtEnd = true;
  cloud->onNextCall(Call::readAsset, stuck);
  const auto transfer = device.startDownload("a");
  ASSERT_TRUE(hangs());
  Once<std::uint64_t, std::uint64_t> half("progress");
  transfer->getProgress(half.completion());
  EXPECT_EQ(half.value<0>(), kSize / 2);
  EXPECT_EQ(half.value<1>(), kSize);
  EXPECT_FALSE(end(transfer));
  Once<std::uint64_t, std::uint64_t> whole("progress");
  transfer->getProgress(whole.completion());
  EXPECT_EQ(whole.value<0>(), kSize);
}

// --- Ends.

TEST_F(DownloadFaults, stoppingTheDaemonAnswersEverybodyOnce) {
  for (int index = 0; index < 6; ++index)
    dataless(std::to_string(index), "contents " + std::to_string(index));
  cloud->onEveryCall(Call::readAsset, hanging());
  std::vector<std::shared_ptr<QVTransfer>> transfers;
  std::vector<std::unique_ptr<Once<NSError>>> ends;
  for (int index = 0; index < 6; ++index) {
    transfers.push_back(device.startDownload(std::to_string(index), QVDownloadInBackground));
    ends.push_back(std::make_unique<Once<NSError>>("end of a transfer"));
    transfers.back()->waitWithReply(ends.back()->completion());
  }
  ASSERT_TRUE(hangs());
  device.keld.daemon().stop();
  for (const auto &end : ends) {
    EXPECT_TRUE(end->value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
    EXPECT_EQ(end->calls(), 1);
  }
}

TEST_F(DownloadFaults, whatThePinsWantIsTriedAgain) {
  dataless("a", "contents");
  cloud->onNextCall(Call::readAsset, failing(CKErrorCode::networkFailure));
  EXPECT_FALSE(device.pin("a"));
  ASSERT_TRUE(reads(1));
  ASSERT_TRUE(eventually([&] {
    hand.put("news", std::to_string(cloud->count(Call::fetchZoneChanges)));
    return device.read("a") == "contents";
  })) << "the daemon comes by with every change";
}

TEST_F(DownloadFaults, whatThePinsWantComesAfterARestart) {
  dataless("a", "contents");
  cloud->onEveryCall(Call::readAsset, hanging());
  EXPECT_FALSE(device.pin("a"));
  ASSERT_TRUE(reads(1));
  device.keld.stop();
  cloud->clearFaults();
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(eventually([&] { return device.read("a") == "contents"; }));
}

}  // namespace
}  // namespace droxa::keld
