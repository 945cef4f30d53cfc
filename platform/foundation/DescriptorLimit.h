#pragma once

namespace droxa {

// Raises the process's soft limit of open descriptors as far as the system lets it, up to 65,536: a daemon
// holds one for each client, and the usual soft limit of 1,024 is meant for programs that select(2). Children
// inherit it. Before there are other threads.
void DroxaRaiseDescriptorLimit();

}  // namespace droxa
