#pragma once

#include "tests/platform/cloudkit/contract/AssetsContract.h"
#include "tests/platform/cloudkit/contract/ChangesContract.h"
#include "tests/platform/cloudkit/contract/RecordsContract.h"
#include "tests/platform/cloudkit/contract/ShareAccessContract.h"
#include "tests/platform/cloudkit/contract/ShareFeedContract.h"
#include "tests/platform/cloudkit/contract/SharePropertiesContract.h"
#include "tests/platform/cloudkit/contract/SharesContract.h"
#include "tests/platform/cloudkit/contract/ZonesContract.h"

// What every cloud does. A World is a class that makes an empty cloud of its own, with the members
//   std::shared_ptr<CKCloud> open(const std::string &deviceName);
//     the same cloud and account for every device, also in a forked process
//   std::shared_ptr<CKCloud> openAs(const std::string &accountName, const std::string &deviceName);
//     the same cloud for any account, also in a forked process
//   std::shared_ptr<CKCloud> openAnotherCloud(const std::string &deviceName);
//     one that has nothing to do with it
//   void setQuota(std::optional<std::uint64_t> bytes);
//     of open()'s account
//   void setQuotaOf(const std::string &accountName, std::optional<std::uint64_t> bytes);
//   void setUserIdentity(const std::string &accountName, const std::string &displayName,
//                        const std::string &handle);
#define DROXA_CLOUD_CONTRACT(name, World)                                    \
  namespace contract {                                                       \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudZones, testing::Types<World>);   \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudRecords, testing::Types<World>); \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudChanges, testing::Types<World>); \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudAssets, testing::Types<World>);  \
  }                                                                          \
  DROXA_CLOUD_SHARES_CONTRACT(name, World)

// Its part about shares.
#define DROXA_CLOUD_SHARES_CONTRACT(name, World)                                     \
  namespace contract {                                                               \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudShares, testing::Types<World>);          \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudShareAccess, testing::Types<World>);     \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudShareFeed, testing::Types<World>);       \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudShareProperties, testing::Types<World>); \
  }
