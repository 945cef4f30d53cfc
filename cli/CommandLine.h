#pragma once

#include <ostream>

namespace droxa {

// The whole of `droxa`: reads the arguments, runs the command, gives the exit status.
int droxaMain(int argc, const char *const *argv, std::ostream &out, std::ostream &err);

}  // namespace droxa
