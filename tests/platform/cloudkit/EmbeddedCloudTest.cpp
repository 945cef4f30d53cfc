#include <csignal>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sqlite3.h>
#include <sys/wait.h>
#include <thread>

#include "platform/cloudkit/EmbeddedCloud.h"
#include "tests/platform/cloudkit/EmbeddedWorld.h"
#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {
namespace {

namespace fs = std::filesystem;

// Holds the cloud's write lock from outside.
class HeldLock {
 public:
  explicit HeldLock(const std::string &folder) {
    EXPECT_EQ(sqlite3_open((folder + "/cloud.sqlite").c_str(), &database_), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(database_, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  }
  ~HeldLock() { sqlite3_close(database_); }
  HeldLock(const HeldLock &) = delete;
  HeldLock &operator=(const HeldLock &) = delete;

 private:
  sqlite3 *database_ = nullptr;
};

// Runs the body in a process that is killed when it has written so many lines to the pipe; answers the lines.
std::vector<std::string> linesUntilKilled(std::size_t count, const std::function<void(int pipe)> &body) {
  int ends[2];
  EXPECT_EQ(pipe(ends), 0);
  const pid_t child = fork();
  if (child == 0) {
    close(ends[0]);
    body(ends[1]);
    _exit(0);
  }
  close(ends[1]);
  std::vector<std::string> lines(1);
  char c = 0;
  bool isKilled = false;
  while (::read(ends[0], &c, 1) == 1) {
    if (c != '\n') {
      lines.back() += c;
      continue;
    }
    lines.emplace_back();
    if (lines.size() > count && !isKilled) {
      kill(child, SIGKILL);
      isKilled = true;
    }
  }
  close(ends[0]);
  int status = 0;
  EXPECT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFSIGNALED(status)) << "the process ended by itself";
  lines.pop_back();
  return lines;
}

TEST(EmbeddedCloud, whatAKilledProcessSavedIsThere) {
  EmbeddedWorld world;
  EXPECT_OK(world.open("one")->saveZone(kZone, patiently()));
  for (std::size_t round = 1; round <= 4; ++round) {
    const std::string prefix = std::to_string(round) + "-";
    const auto acknowledged = linesUntilKilled(20 * round, [&](int pipe) {
      const auto device = world.open("child");
      for (int i = 0;; ++i) {
        const std::string name = prefix + std::to_string(i);
        CKRecord record = item(name);
        const MemoryFile file(noise(300 * 1024, static_cast<std::uint64_t>(i) + 1));
        record.fields["contents"] = CKAsset::assetWithDescriptor(file.descriptor(), nullptr);
        if (modify(*device, {record}).error) _exit(1);
        const std::string line = name + "\n";
        if (write(pipe, line.data(), line.size()) < 0) _exit(1);
      }
    });
    const auto device = world.open("two");
    for (const std::string &name : acknowledged) {
      const CKRecordResult result = fetch(*device, item(name).recordID);
      ASSERT_FALSE(result.error) << name << ": " << result.error.description();
      const auto *asset = result.record.get<CKAsset>("contents");
      ASSERT_TRUE(asset);
      EXPECT_OK(read(*device, asset->reference()).second);
    }
    EXPECT_OK(device->saveZone({"still writable"}, patiently()));
  }
}

TEST(EmbeddedCloud, whatAKilledUploadLeftIsCollected) {
  EmbeddedWorld world;
  const auto cloud = world.openEmbedded("one");
  linesUntilKilled(1, [&](int pipe) {
    const auto device = world.open("child");
    const MemoryFile file(noise(24 * 1024 * 1024));
    const auto tell = [&](std::uint64_t done, std::uint64_t) {
      if (done == 0) return;
      if (write(pipe, "\n", 1) < 0) _exit(1);
      pause();
    };
    device->uploadAsset(file.descriptor(), 24 * 1024 * 1024, tell, {});
  });
  EXPECT_FALSE(fs::is_empty(world.folder() + "/unfinished"));
  EXPECT_OK(cloud->collectGarbage(std::chrono::seconds(0), patiently()).error);
  EXPECT_TRUE(fs::is_empty(world.folder() + "/unfinished"));
}

TEST(EmbeddedCloud, aCallThatWaitsForALockIsCancelledSoon) {
  EmbeddedWorld world;
  const auto cloud = world.openEmbedded("one");
  const HeldLock lock(world.folder());
  CKCallContext context;
  context.cancellation = std::make_shared<CKCancellation>();
  NSError error;
  std::thread call([&] { error = cloud->saveZone(kZone, context); });
  const auto start = std::chrono::steady_clock::now();
  context.cancellation->cancel();
  call.join();
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
  EXPECT_CODE(error, operationCancelled);
  EXPECT_OK(cloud->listZones(patiently()).error);  // readers don't wait
}

TEST(EmbeddedCloud, aCallThatWaitsForALockEndsAtItsDeadline) {
  EmbeddedWorld world;
  const auto cloud = world.openEmbedded("one");
  const HeldLock lock(world.folder());
  const auto start = std::chrono::steady_clock::now();
  EXPECT_TRUE(
      CKErrorIsTimeout(cloud->saveZone(kZone, CKCallContext::withTimeout(std::chrono::milliseconds(100)))));
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(3));
}

TEST(EmbeddedCloud, aFolderThatGoesAwayIsUnavailableAndOneThatComesInItsPlaceIsAnotherCloud) {
  EmbeddedWorld world;
  const auto cloud = world.openEmbedded("one");
  EXPECT_OK(cloud->saveZone(kZone, patiently()));
  save(*cloud, item("a"));
  const UUID uuid = cloud->cloudIdentifier();
  const CKServerChangeToken token = changes(*cloud).token;
  fs::rename(world.folder(), world.folder() + ".away");
  EXPECT_CODE(cloud->listZones(patiently()).error, serviceUnavailable);
  EXPECT_EQ(cloud->accountStatus(patiently()).status, CKAccountStatus::temporarilyUnavailable);
  EXPECT_TRUE(cloud->cloudIdentifier().isNull());
  EXPECT_CODE(upload(*cloud, "bytes").error, serviceUnavailable);

  EXPECT_OK(world.open("two")->saveZone(kZone, patiently()));
  EXPECT_FALSE(cloud->cloudIdentifier() == uuid);
  EXPECT_CODE(changes(*cloud, token).error, changeTokenExpired);
  EXPECT_TRUE(changes(*cloud).changedRecords.empty());

  fs::remove_all(world.folder());
  fs::rename(world.folder() + ".away", world.folder());
  EXPECT_EQ(cloud->cloudIdentifier(), uuid);
  EXPECT_EQ(changes(*cloud, token).token, token);
}

TEST(EmbeddedCloud, accountsOfOneFolderDontSeeEachOther) {
  EmbeddedWorld world;
  const auto one = world.open("one");
  const auto stranger = EmbeddedCloud::open(world.folder(), "somebody else", "one", nullptr);
  ASSERT_TRUE(stranger);
  EXPECT_OK(one->saveZone(kZone, patiently()));
  EXPECT_TRUE(stranger->listZones(patiently()).zones.empty());
  EXPECT_CODE(changes(*stranger).error, zoneNotFound);
  EXPECT_EQ(stranger->cloudIdentifier(), one->cloudIdentifier());
}

TEST(EmbeddedCloud, whatIsNoCloudIsNotOpened) {
  const TemporaryFolder folder;
  NSError error;
  folder.write("cloud/cloud.sqlite", std::string(8192, 'x'));
  EXPECT_FALSE(EmbeddedCloud::open(folder.path() + "/cloud", "a", "d", &error));
  EXPECT_CODE(error, internalError);
  folder.write("file", "");
  EXPECT_FALSE(EmbeddedCloud::open(folder.path() + "/file/cloud", "a", "d", &error));
  EXPECT_CODE(error, serviceUnavailable);
  EXPECT_FALSE(EmbeddedCloud::open(folder.path() + "/other", "", "d", &error));
  EXPECT_CODE(error, invalidArguments);
}

TEST(EmbeddedCloud, usageFollowsRecordsAndZones) {
  EmbeddedWorld world;
  const auto cloud = world.openEmbedded("one");
  EXPECT_OK(cloud->saveZone(kZone, patiently()));
  CKRecord record = item("a");
  record.fields["contents"] = upload(*cloud, noise(1000)).asset;
  record = save(*cloud, record);
  EXPECT_EQ(cloud->usage(patiently()).bytes, 1000U);
  record.fields["contents"] = upload(*cloud, noise(10)).asset;
  save(*cloud, record);
  EXPECT_EQ(cloud->usage(patiently()).bytes, 10U);
  EXPECT_OK(cloud->setQuota(5, patiently()));
  EXPECT_EQ(cloud->usage(patiently()).quota, 5U);
  EXPECT_OK(cloud->deleteZone(kZone, patiently()));
  EXPECT_EQ(cloud->usage(patiently()).bytes, 0U);
}

TEST(EmbeddedCloud, manyProcessesMayMakeOneCloudAtOnce) {
  EmbeddedWorld world;
  std::vector<pid_t> children;
  for (int i = 0; i < 6; ++i) {
    const pid_t child = fork();
    if (child == 0) {
      NSError error;
      const auto device = EmbeddedCloud::open(world.folder(), "account", "child", &error);
      if (device) error = device->saveZone({std::to_string(i)}, patiently());
      if (error) std::fprintf(stderr, "%s\n", error.description().c_str());
      _exit(error ? 1 : 0);
    }
    children.push_back(child);
  }
  for (const pid_t child : children) {
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }
  EXPECT_EQ(world.open("one")->listZones(patiently()).zones.size(), 6U);
}

}  // namespace
}  // namespace droxa::contract
