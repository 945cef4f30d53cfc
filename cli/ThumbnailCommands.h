#pragma once

#include <string>

#include "cli/Commands.h"

namespace CLI {
class App;
}

namespace droxa {

// The part of the command line that is about thumbnails and applications' folders. Thread contract: one
// thread.
class ThumbnailCommands {
 public:
  explicit ThumbnailCommands(CLI::App &app);  // adds them to it
  bool isChosen() const;
  // Whether Ctrl-C is for the command rather than the end of the process.
  bool canBeStopped() const;
  int run(CommandContext &context) const;

 private:
  CLI::App &app_;
  ThumbnailOptions options_;
  std::string application_;
};

}  // namespace droxa
