#pragma once

#include <algorithm>
#include <chrono>
#include <memory>
#include <string>

#include "platform/cloudkit/EmbeddedCloud.h"
#include "tests/keld/KeldFixture.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa::keld {

inline KeldOptions DeviceOptions(const std::string &cloudFolder, const std::string &device) {
  KeldOptions options;
  options.sync.cloudFolder = cloudFolder;
  options.sync.device = device;
  return options;
}

// A daemon on a cloud, and what tests do with its documents. Thread contract: the test's thread.
class Device {
 public:
  Device(const std::string &cloudFolder, const std::string &name)
      : Device(DeviceOptions(cloudFolder, name)) {}
  explicit Device(KeldOptions options) : keld(std::move(options)) { keld.waitForFirstScan(); }

  NSURL url(const std::string &path) { return NSURL::fileURLWithPath(keld.at(path)); }
  std::string read(const std::string &path) {
    std::ifstream file(keld.at(path), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  // What is in the folder, as the disk has it.
  std::vector<std::string> names(const std::string &path = "") {
    std::vector<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(keld.at(path)))
      names.push_back(entry.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
  }
  bool exists(const std::string &path) {
    return std::filesystem::exists(std::filesystem::symlink_status(keld.at(path)));
  }

  NSError waitForUploads(const std::string &path = "") {
    Once<NSError> answer("uploads");
    keld.session()->waitForUploadAtURL(path.empty() ? NSURL() : url(path), answer.completion());
    return answer.value<0>();
  }
  QVContentsStatus status(const std::string &path) {
    Once<QVContentsStatus, NSError> answer("status of " + path);
    keld.session()->getContentsStatusAtURL(url(path), answer.completion());
    EXPECT_FALSE(answer.value<1>()) << answer.value<1>().description();
    return answer.value<0>();
  }
  QVTransferStatus transfers() {
    Once<QVTransferStatus, NSError> answer("transfers");
    keld.session()->getTransferStatus(answer.completion());
    return answer.value<0>();
  }
  std::shared_ptr<QVTransfer> startDownload(const std::string &path,
                                            std::uint64_t options = QVDownloadForReader) {
    Once<std::shared_ptr<QVTransfer>, NSError> answer("download of " + path);
    keld.session()->startDownloadAtURL(url(path), options, answer.completion());
    EXPECT_FALSE(answer.value<1>()) << answer.value<1>().description();
    return answer.value<0>();
  }
  NSError download(const std::string &path) {
    const auto transfer = startDownload(path);
    if (!transfer) return qvc_error(0, "no transfer");
    Once<NSError> answer("end of the download of " + path);
    transfer->waitWithReply(answer.completion());
    return answer.value<0>();
  }
  NSError evict(const std::string &path, QVContentsResult *result = nullptr) {
    Once<QVContentsResult, NSError> answer("eviction of " + path);
    keld.session()->evictItemAtURL(url(path), answer.completion());
    if (result) *result = answer.value<0>();
    return answer.value<1>();
  }
  NSError pin(const std::string &path, bool isPinned = true) {
    Once<NSError> answer("pin of " + path);
    keld.session()->setPinnedAtURL(url(path), isPinned, answer.completion());
    return answer.value<0>();
  }
  bool isDataless(const std::string &path) { return status(path).contents == QVContentsState::dataless; }
  // The document came from the cloud, or went with it.
  bool knowsSoon(const std::string &path) {
    return eventually([&] { return keld.knows(path); });
  }
  bool losesSoon(const std::string &path) {
    return eventually([&] { return !keld.knows(path) && !exists(path); });
  }
  // Reads what the document says on this device, wherever its contents are.
  std::string contents(const std::string &path) {
    const NSError error = download(path);
    EXPECT_FALSE(error) << error.description();
    return read(path);
  }

  // The same while the document is still moving: what isn't there now is asked for again.
  bool saysSoon(const std::string &path, const std::string &text) {
    return eventually([&] {
      Once<std::shared_ptr<QVTransfer>, NSError> answer("download of " + path);
      keld.session()->startDownloadAtURL(url(path), QVDownloadForReader, answer.completion());
      if (const auto transfer = answer.value<0>()) {
        Once<NSError> ended("end of the download of " + path);
        transfer->waitWithReply(ended.completion());
        (void)ended.wait();
      }
      return read(path) == text;
    });
  }

  KeldFixture keld;
};

// Two devices on one cloud.
class TwoDevices : public testing::Test {
 protected:
  TwoDevices() : cloudFolder(folder.path() + "/cloud"), anna(cloudFolder, "anna"), ben(cloudFolder, "ben") {}

  // A document that both have, local on anna's and dataless on ben's.
  void share(const std::string &path, const std::string &contents) {
    anna.keld.write(path, contents);
    const NSError error = anna.waitForUploads(path);
    ASSERT_FALSE(error) << error.description();
    ASSERT_TRUE(ben.knowsSoon(path));
    ASSERT_TRUE(eventually([&] { return ben.status(path).upload == QVUploadState::inCloud; }));
  }

  const TemporaryFolder folder;
  const std::string cloudFolder;
  Device anna, ben;
};

}  // namespace droxa::keld
