#pragma once

#include <capnp/capability.h>

#include "platform/xpc/Values.capnp.h"
#include "platform/xpc/capnp/Session.h"

// Descriptors into and out of messages: each crosses as an object of its own, so that it is closed when its
// last holder lets go of it. Thread contract: the loop.

namespace droxa {

// An object that lends its peer a duplicate of `descriptor`, taken now. A descriptor that can't be duplicated
// fails the message.
schema::Descriptor::Client exportDescriptor(int descriptor);

// A duplicate of the descriptor that came with `client`, the caller's own and close-on-exec; -1 when none
// came.
int receivedDescriptor(capnp::Capability::Client client);

}  // namespace droxa
