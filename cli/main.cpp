#include <iostream>
#include <signal.h>
#include <sys/stat.h>
#include <sysexits.h>
#include <unistd.h>

#include "cli/CommandLine.h"

namespace {

// Nobody reads any more, or the disk is full. A reader that has gone ends the process as any command of a
// pipe.
int outputFailed() {
  struct stat status {};
  if (fstat(STDOUT_FILENO, &status) == 0 && (S_ISFIFO(status.st_mode) || S_ISSOCK(status.st_mode))) {
    signal(SIGPIPE, SIG_DFL);
    raise(SIGPIPE);
  }
  std::cerr << "droxa: the output can't be written" << std::endl;
  return EX_IOERR;
}

}  // namespace

int main(int argc, char *argv[]) {
  signal(SIGPIPE, SIG_IGN);
  std::ios::sync_with_stdio(false);
  const int status = droxa::droxaMain(argc, argv, std::cout, std::cerr);
  std::cout.flush();
  if (!std::cout.good()) _exit(outputFailed());
  _exit(status);  // the pool's threads have nothing left to say
}
