#include "tests/platform/cloudkit/CloudContract.h"
#include "tests/platform/cloudkit/EmbeddedWorld.h"
#include "tests/support/FaultyCloud.h"

namespace droxa {

// The decorator without faults.
class FaultlessWorld {
 public:
  std::shared_ptr<CKCloud> open(const std::string &deviceName) const {
    return std::make_shared<FaultyCloud>(world_.open(deviceName));
  }
  std::shared_ptr<CKCloud> openAs(const std::string &accountName, const std::string &deviceName) const {
    return std::make_shared<FaultyCloud>(world_.openAs(accountName, deviceName));
  }
  void setUserIdentity(const std::string &accountName, const std::string &displayName,
                       const std::string &handle) const {
    world_.setUserIdentity(accountName, displayName, handle);
  }
  std::shared_ptr<CKCloud> openAnotherCloud(const std::string &deviceName) const {
    return std::make_shared<FaultyCloud>(world_.openAnotherCloud(deviceName));
  }
  void setQuota(std::optional<std::uint64_t> bytes) const { world_.setQuota(bytes); }
  void setQuotaOf(const std::string &accountName, std::optional<std::uint64_t> bytes) const {
    world_.setQuotaOf(accountName, bytes);
  }

 private:
  EmbeddedWorld world_;
};

DROXA_CLOUD_CONTRACT(FaultyCloud, FaultlessWorld)

}  // namespace droxa
