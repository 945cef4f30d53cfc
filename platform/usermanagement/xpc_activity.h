#pragma once

#include <cstdint>
#include <functional>
#include <memory>

namespace droxa {

// A scheduled activity, as its handler sees it.
class xpc_activity {
 public:
  virtual ~xpc_activity() = default;
  // False when the activity can't take that state any more.
  virtual bool setState(std::int64_t state) = 0;
};
using xpc_activity_t = std::shared_ptr<xpc_activity>;
using xpc_activity_handler_t = std::function<void(const xpc_activity_t &)>;

inline constexpr std::int64_t XPC_ACTIVITY_STATE_DEFER = 3;

bool xpc_activity_set_state(const xpc_activity_t &activity, std::int64_t state);

}  // namespace droxa
