#include "extension/QVPersonaRemembering.h"

#include <optional>
#include <string>
#include <utility>

#include "additions/QVPersonaAdoption.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

std::optional<std::string> CurrentPersonaString() {
  return UMUserManager::sharedManager().currentPersona()->userPersonaUniqueString();
}

void RunBlock(const std::string &persona, const QVBlock &block) {
  const QVPersonaAdoption adoption(persona);
  if (!adoption.adopted()) {
    os_log_fault(qvc_default_log(), "[CRIT] UNREACHABLE: Failed to adopt persona for block adoption");
    return;
  }
  block();
}

void RunActivity(const std::string &persona, const xpc_activity_handler_t &handler,
                 const xpc_activity_t &activity) {
  const QVPersonaAdoption adoption(persona);
  if (!adoption.adopted()) {
    os_log_fault(qvc_default_log(),
                 "[CRIT] UNREACHABLE: Can't adopt persona for xpc activity, deferring the activity");
    if (!xpc_activity_set_state(activity, XPC_ACTIVITY_STATE_DEFER)) {
      os_log_debug(qvc_default_log(), "[DEBUG] Failed to defer the activity after persona failure.");
    }
    return;
  }
  handler(activity);
}

}  // namespace

QVBlock QVRememberPersonaOfBlock(QVBlock block) {
  std::optional<std::string> persona = CurrentPersonaString();
  if (!persona) return block;
  return [persona = *std::move(persona), block = std::move(block)] { RunBlock(persona, block); };
}

xpc_activity_handler_t QVRememberPersonaOfActivity(xpc_activity_handler_t handler) {
  std::optional<std::string> persona = CurrentPersonaString();
  if (!persona) return handler;
  return [persona = *std::move(persona), handler = std::move(handler)](const xpc_activity_t &activity) {
    RunActivity(persona, handler, activity);
  };
}

}  // namespace droxa
