#pragma once

#include <string>

#include "platform/xpc/NSXPCConnection.h"

// Unix stream sockets by path and by descriptor. Every descriptor made here is close-on-exec; failures are
// negative system error codes. Any thread.

namespace droxa {

// A connected socket. Waits some seconds for a listener whose queue is full.
int connectToSocketPath(const std::string &path);
// The same through an O_PATH descriptor of the listening socket.
int connectToSocketDescriptor(int descriptor);

// A listening socket at `path`, mode 0600. A socket there to which nobody listens is replaced; -EADDRINUSE
// when somebody does, or when there is anything else.
int listenAtSocketPath(const std::string &path);
// A listening socket without a name; `*pathDescriptor` becomes an O_PATH descriptor of it.
int listenAnonymously(int *pathDescriptor);
// An O_PATH descriptor of a listening socket by its path in the file system; -1 when it has none.
int pathDescriptorOfSocket(int socket);

// The kernel's word on the process at the other end. The process descriptor is the caller's.
NSXPCPeer peerOfSocket(int socket);

}  // namespace droxa
