#pragma once

#include <optional>
#include <string>
#include <vector>

#include "cli/Commands.h"

namespace CLI {
class App;
}

namespace droxa {

// The part of the command line that is about contents: its commands, their options, and which was chosen.
// Thread contract: one thread.
class ContentsCommands {
 public:
  explicit ContentsCommands(CLI::App &app);  // adds them to it
  bool isChosen() const;
  // Whether Ctrl-C is for the command rather than the end of the process.
  bool canBeStopped() const;
  int run(CommandContext &context) const;

 private:
  CLI::App *add(const char *name, const char *description, const char *help, bool needsOne);
  void addWait();
  void addDeletions();
  bool has(const char *command) const;

  CLI::App &app_;
  CLI::App *deletions_ = nullptr;
  std::vector<std::string> arguments_;
  double waitSeconds_ = 0;  // 0: as long as it takes
  bool json_ = false;
};

}  // namespace droxa
