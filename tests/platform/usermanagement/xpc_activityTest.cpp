#include <gtest/gtest.h>

#include "platform/usermanagement/xpc_activity.h"

namespace droxa {
namespace {

class Activity final : public xpc_activity {
 public:
  explicit Activity(bool takes) : takes_(takes) {}
  bool setState(std::int64_t state) override {
    asked = state;
    return takes_;
  }
  std::int64_t asked = -1;

 private:
  const bool takes_;
};

TEST(xpc_activity, passesTheStateOnAndTheAnswerBack) {
  const auto willing = std::make_shared<Activity>(true);
  EXPECT_TRUE(xpc_activity_set_state(willing, XPC_ACTIVITY_STATE_DEFER));
  EXPECT_EQ(willing->asked, 3);
  EXPECT_FALSE(xpc_activity_set_state(std::make_shared<Activity>(false), XPC_ACTIVITY_STATE_DEFER));
}

TEST(xpc_activity, noActivityTakesNoState) {
  EXPECT_FALSE(xpc_activity_set_state(nullptr, 3));
}

}  // namespace
}  // namespace droxa
