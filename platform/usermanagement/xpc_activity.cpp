#include "platform/usermanagement/xpc_activity.h"

namespace droxa {

bool xpc_activity_set_state(const xpc_activity_t &activity, std::int64_t state) {
  return activity && activity->setState(state);
}

}  // namespace droxa
