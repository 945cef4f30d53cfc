#pragma once

#include "platform/usermanagement/xpc_activity.h"
#include "tessaly/QVPersona.h"

// What the class set-up installs into the Tessaly library's hooks. Any thread.

namespace droxa {

// `block` so that it runs, on whatever thread, under the persona that is current now; where that persona
// can't be adopted then, it is not run, and a fault is logged. `block` itself when the current persona has no
// unique string: it then runs under whatever persona its queue has.
QVBlock QVRememberPersonaOfBlock(QVBlock block);

// The same for the handler of a scheduled activity, which is deferred where the persona can't be adopted.
xpc_activity_handler_t QVRememberPersonaOfActivity(xpc_activity_handler_t handler);

}  // namespace droxa
