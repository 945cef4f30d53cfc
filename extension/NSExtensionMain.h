#pragma once

namespace droxa {

// The entry of the extension's program: makes the one instance of the principal class and serves the host
// until it goes away or SIGTERM or SIGINT comes. Returns only for what ends it before it serves: 0 after
// --help, 2 for arguments that make no sense, 78 for a configuration that can't be read. Must be called
// before the process has any other thread.
int NSExtensionMain(int argc, char *argv[]);

}  // namespace droxa
