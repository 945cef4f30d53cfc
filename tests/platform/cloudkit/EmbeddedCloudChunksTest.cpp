#include <atomic>
#include <filesystem>
#include <fstream>
#include <thread>

#include "platform/cloudkit/embedded/Chunker.h"
#include "tests/platform/cloudkit/EmbeddedWorld.h"
#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {
namespace {

constexpr std::size_t kMiB = 1024 * 1024;

class EmbeddedCloudChunks : public testing::Test {
 protected:
  void SetUp() override { EXPECT_OK(cloud->saveZone(kZone, patiently())); }

  std::vector<std::filesystem::path> chunkFiles() const {
    std::vector<std::filesystem::path> files;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(world.folder() + "/chunks")) {
      if (entry.is_regular_file()) files.push_back(entry.path());
    }
    return files;
  }
  std::uint64_t chunkBytes() const {
    std::uint64_t bytes = 0;
    for (const auto &file : chunkFiles()) bytes += std::filesystem::file_size(file);
    return bytes;
  }
  CKRecord document(const std::string &name, const std::string &bytes) const {
    CKRecord record = item(name);
    record.fields["contents"] = upload(*cloud, bytes).asset;
    return save(*cloud, record);
  }
  static CKAssetReference contentsOf(const CKRecord &record) {
    return record.get<CKAsset>("contents")->reference();
  }

  EmbeddedWorld world;
  const std::shared_ptr<EmbeddedCloud> cloud = world.openEmbedded("one");
};

TEST(Chunker, cutsWithinItsBoundsAndNearItsAverage) {
  const std::string bytes = noise(64 * kMiB);
  const std::span all(reinterpret_cast<const std::uint8_t *>(bytes.data()), bytes.size());
  std::size_t count = 0;
  for (std::size_t at = 0; at < all.size(); ++count) {
    const auto rest = all.subspan(at);
    const std::size_t length =
        embedded::ChunkLength(rest.first(std::min(rest.size(), embedded::kLargestChunk)));
    EXPECT_LE(length, embedded::kLargestChunk);
    EXPECT_GE(length, std::min(rest.size(), embedded::kSmallestChunk));
    at += length;
  }
  EXPECT_GE(count, 45U);
  EXPECT_LE(count, 90U);
}

TEST_F(EmbeddedCloudChunks, anInsertionInTheMiddleSharesMostChunks) {
  std::string bytes = noise(20 * kMiB);
  upload(*cloud, bytes);
  EXPECT_EQ(chunkBytes(), bytes.size());
  bytes.insert(bytes.size() / 2, "inserted");
  upload(*cloud, bytes);
  EXPECT_LE(chunkBytes() - 20 * kMiB, 2 * embedded::kLargestChunk);
}

TEST_F(EmbeddedCloudChunks, theSameBytesAreKeptOnceAndNotWrittenAgain) {
  const std::string bytes = noise(3 * kMiB);
  upload(*cloud, bytes);
  const std::uint64_t before = chunkBytes();
  std::vector<std::uint64_t> inodes;
  const auto inode = [](const std::filesystem::path &path) {
    struct stat status {};
    EXPECT_EQ(stat(path.c_str(), &status), 0);
    return status.st_ino;
  };
  const auto files = chunkFiles();
  for (const auto &file : files) inodes.push_back(inode(file));
  upload(*world.open("two"), bytes);
  EXPECT_EQ(chunkBytes(), before);
  for (std::size_t i = 0; i < files.size(); ++i) EXPECT_EQ(inode(files[i]), inodes[i]);
  EXPECT_TRUE(std::filesystem::is_empty(world.folder() + "/unfinished"));
}

TEST_F(EmbeddedCloudChunks, aFileUnderTheSmallestChunkIsOne) {
  upload(*cloud, noise(200 * 1024));
  EXPECT_EQ(chunkFiles().size(), 1U);
}

TEST_F(EmbeddedCloudChunks, aDamagedChunkIsToldWithTheAssetsNameAndMendedByAnotherUpload) {
  const std::string bytes = noise(3 * kMiB);
  const CKAssetReference asset = upload(*cloud, bytes).asset.reference();
  const auto file = chunkFiles().front();
  {
    std::fstream damage(file, std::ios::in | std::ios::out | std::ios::binary);
    damage.seekp(1000);
    damage << "damage";
  }
  const auto [got, error] = read(*cloud, asset);
  EXPECT_CODE(error, assetNotAvailable);
  EXPECT_NE(error.localizedDescription().find(asset.sha256), std::string::npos);
  EXPECT_EQ(got, bytes.substr(0, got.size()));
  EXPECT_FALSE(cloud->hasAsset(asset, patiently()).isPresent);
  upload(*cloud, bytes);
  EXPECT_TRUE(read(*cloud, asset).first == bytes);
}

TEST_F(EmbeddedCloudChunks, aMissingOrShortenedChunkIsTold) {
  const CKAssetReference asset = upload(*cloud, noise(200 * 1024)).asset.reference();
  const auto file = chunkFiles().front();
  std::filesystem::resize_file(file, 1000);
  EXPECT_CODE(read(*cloud, asset).second, assetNotAvailable);
  std::filesystem::remove(file);
  EXPECT_CODE(read(*cloud, asset).second, assetNotAvailable);
  EXPECT_FALSE(cloud->hasAsset(asset, patiently()).isPresent);
}

TEST_F(EmbeddedCloudChunks, aFileWhoseTimesWereSetBackIsToldByItsBytes) {
  const std::string bytes = noise(8 * kMiB);
  const MemoryFile file(bytes);
  file.putAt("", 0, 1000);
  EXPECT_CODE(cloud
                  ->uploadAsset(
                      file.descriptor(), bytes.size(),
                      [&](std::uint64_t done, std::uint64_t total) {
                        if (done == total) file.putAt("late", 0, 1000);
                      },
                      patiently())
                  .error,
              assetFileModified);
  // Attributes alone may change: the file is read in one state.
  EXPECT_OK(cloud
                ->uploadAsset(
                    file.descriptor(), bytes.size(),
                    [&](std::uint64_t, std::uint64_t) { fchmod(file.descriptor(), 0600); }, patiently())
                .error);
}

TEST_F(EmbeddedCloudChunks, garbageIsWhatNoRecordRefersTo) {
  const std::string shared = noise(5 * kMiB);
  const CKRecord kept = document("kept", shared);
  const CKRecord dropped = document("dropped", shared + "tail");
  upload(*cloud, noise(2 * kMiB, 7));
  EXPECT_EQ(cloud->collectGarbage(std::chrono::hours(1), patiently()).chunks, 0U);  // the time of grace
  EXPECT_OK(removeError(*cloud, dropped.recordID));
  const EmbeddedCloud::Garbage garbage = cloud->collectGarbage(std::chrono::seconds(0), patiently());
  EXPECT_OK(garbage.error);
  EXPECT_EQ(garbage.assets, 2U);
  EXPECT_GE(garbage.chunks, 2U);
  EXPECT_EQ(chunkBytes(), shared.size());
  EXPECT_TRUE(read(*cloud, contentsOf(kept)).first == shared);
  EXPECT_CODE(read(*cloud, contentsOf(dropped)).second, unknownItem);
  EXPECT_CODE(saveError(*cloud, CKRecord(dropped)), unknownItem);
}

TEST_F(EmbeddedCloudChunks, collectingWhileOthersUploadLosesNothingThatARecordRefersTo) {
  std::atomic<bool> done{false};
  std::thread collector([&] {
    while (!done) EXPECT_OK(cloud->collectGarbage(std::chrono::seconds(0), patiently()).error);
  });
  const auto device = world.open("two");
  std::vector<std::pair<CKRecord, std::string>> saved;
  for (std::uint64_t i = 0; i < 30; ++i) {
    const std::string bytes = noise(kMiB, i % 3 + 1) + std::to_string(i);
    const CKUploadReply uploaded = upload(*device, bytes);
    if (uploaded.error) {  // its chunks vanished again and again: to be tried again, as the error says
      EXPECT_CODE(uploaded.error, serviceUnavailable);
      continue;
    }
    CKRecord record = item(std::to_string(i));
    record.fields["contents"] = uploaded.asset;
    const CKModifyReply reply = modify(*device, {record});
    if (reply.error) {
      EXPECT_CODE(reply.saved.at(0).error, assetFileNotFound);  // collected before the record referred to it
    } else {
      saved.emplace_back(reply.saved.at(0).record, bytes);
    }
  }
  done = true;
  collector.join();
  for (const auto &[record, bytes] : saved) {
    const auto [got, error] = read(*device, contentsOf(record));
    EXPECT_OK(error);
    EXPECT_TRUE(got == bytes);
  }
}

}  // namespace
}  // namespace droxa::contract
