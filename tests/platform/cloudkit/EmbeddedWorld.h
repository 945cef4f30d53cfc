#pragma once

#include "platform/cloudkit/EmbeddedCloud.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {

// A cloud in a folder of the test's own.
class EmbeddedWorld {
 public:
  std::shared_ptr<EmbeddedCloud> openEmbedded(const std::string &deviceName,
                                              const std::string &accountName = "account") const {
    NSError error;
    auto cloud = EmbeddedCloud::open(folder(), accountName, deviceName, &error);
    EXPECT_TRUE(cloud) << error.description();
    return cloud;
  }
  std::shared_ptr<CKCloud> open(const std::string &deviceName) const { return openEmbedded(deviceName); }
  std::shared_ptr<CKCloud> openAs(const std::string &accountName, const std::string &deviceName) const {
    return openEmbedded(deviceName, accountName);
  }
  void setUserIdentity(const std::string &accountName, const std::string &displayName,
                       const std::string &handle) const {
    EXPECT_FALSE(openEmbedded("identity", accountName)->setUserIdentity(displayName, handle, {}));
  }
  std::shared_ptr<CKCloud> openAnotherCloud(const std::string &deviceName) const {
    return EmbeddedCloud::open(folder_.path() + "/another", "account", deviceName, nullptr);
  }
  void setQuota(std::optional<std::uint64_t> bytes) const {
    EXPECT_FALSE(openEmbedded("quota")->setQuota(bytes, {}));
  }
  void setQuotaOf(const std::string &accountName, std::optional<std::uint64_t> bytes) const {
    EXPECT_FALSE(openEmbedded("quota", accountName)->setQuota(bytes, {}));
  }
  std::string folder() const { return folder_.path() + "/cloud"; }

 private:
  const TemporaryFolder folder_;
};

}  // namespace droxa
