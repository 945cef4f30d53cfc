#pragma once

#include "platform/cloudkit/CKDatabase.h"
#include "tests/platform/cloudkit/EmbeddedWorld.h"
#include "tests/platform/cloudkit/contract/Calls.h"
#include "tests/support/FaultyCloud.h"

namespace droxa::contract {

// A database over a cloud whose calls can go wrong.
class OperationTest : public testing::Test {
 protected:
  using Call = FaultyCloud::Call;
  void SetUp() override { EXPECT_OK(cloud->saveZone(kZone, patiently())); }

  // An operation that retries without waiting long.
  template <class Operation>
  static std::shared_ptr<Operation> make() {
    auto operation = std::make_shared<Operation>();
    operation->configuration.initialRetryDelay = std::chrono::milliseconds(1);
    operation->configuration.longestRetryDelay = std::chrono::milliseconds(4);
    operation->configuration.timeoutIntervalForResource = kTestDeadline;
    return operation;
  }
  static FaultyCloud::Fault failing(CKErrorCode code) {
    FaultyCloud::Fault fault;
    fault.error = CKErrorMake(code, "scripted");
    return fault;
  }
  static FaultyCloud::Fault hanging() {
    FaultyCloud::Fault fault;
    fault.hangs = true;
    return fault;
  }

  EmbeddedWorld world;
  const std::shared_ptr<FaultyCloud> cloud = std::make_shared<FaultyCloud>(world.open("one"));
  CKDatabase database{cloud};
};

}  // namespace droxa::contract
