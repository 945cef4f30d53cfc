#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/usermanagement/UMUserManager.h"
#include "platform/usermanagement/xpc_activity.h"

namespace droxa {

// Stands for the default (personal) persona, without data separation.
inline constexpr char QVDefaultPersonaID[] = "__defaultPersonaID__";

using QVBlock = std::function<void()>;

// The two hooks: null unless the extension's class set-up sets them, before any instance exists; never
// cleared. Whoever hands work to another queue passes it through the hook when there is one.
using QVRememberBlockPersona = QVBlock (*)(QVBlock block);
using QVRememberActivityPersona = xpc_activity_handler_t (*)(xpc_activity_handler_t handler);
extern QVRememberBlockPersona qvc_block_remember_persona;
extern QVRememberActivityPersona qvc_activity_block_remember_persona;

// The current persona: its unique string when it is data-separated, else QVDefaultPersonaID.
std::optional<std::string> qv_currentPersonaIDWithIsDataSeparated(bool *isDataSeparated);
// The same without the question.
std::optional<std::string> qv_currentPersonaID(UMUserManager &manager);

// Restores a saved persona of the calling thread and forgets it; null restores nothing.
void _QVRestorePersona(std::shared_ptr<UMPersonaContext> *saved);  // NOLINT(bugprone-reserved-identifier)

}  // namespace droxa
