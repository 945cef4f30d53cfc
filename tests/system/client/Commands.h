#pragma once

#include <string>

namespace droxa::testing {

// What the client program can do (main.cpp); each gives the exit status.
struct ClientArguments {
  std::string home;
  std::string path;
  int count = 0;
  int atOnce = 1;
};

int runCalls(const ClientArguments &arguments);
int runAsk(const ClientArguments &arguments);
int runWrite(const ClientArguments &arguments);
int runCrowd(const ClientArguments &arguments);
int runHoard(const ClientArguments &arguments);
int runDeaf(const ClientArguments &arguments);
int runMute(const ClientArguments &arguments);

}  // namespace droxa::testing
