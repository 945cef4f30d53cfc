#pragma once

#include "tests/platform/cloudkit/contract/AssetsContract.h"
#include "tests/platform/cloudkit/contract/ChangesContract.h"
#include "tests/platform/cloudkit/contract/RecordsContract.h"
#include "tests/platform/cloudkit/contract/ZonesContract.h"

// What every cloud does. A World is a class that makes an empty cloud of its own:
//   std::shared_ptr<CKCloud> open(const std::string &deviceName);              the same cloud for every
//   device;
//                                                                             also in a forked process
//   std::shared_ptr<CKCloud> openAnotherCloud(const std::string &deviceName);  one that has nothing to do
//   with it void setQuota(std::optional<std::uint64_t> bytes);                         of the account
#define DROXA_CLOUD_CONTRACT(name, World)                                    \
  namespace contract {                                                       \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudZones, testing::Types<World>);   \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudRecords, testing::Types<World>); \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudChanges, testing::Types<World>); \
  INSTANTIATE_TYPED_TEST_SUITE_P(name, CloudAssets, testing::Types<World>);  \
  }
