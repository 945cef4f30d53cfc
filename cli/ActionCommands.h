#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "cli/Actions.h"

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace droxa {

// The part of the command line that changes items: its commands, their options, and which was chosen.
// Thread contract: one thread.
class ActionCommands {
 public:
  explicit ActionCommands(CLI::App &app);  // adds them to it
  bool isChosen() const;
  // Whether Ctrl-C is for the command rather than the end of the process.
  bool canBeStopped() const;
  int run(CommandContext &context) const;

 private:
  CLI::App *add(const char *name, const char *description);
  CLI::Option *addItem(CLI::App *command, const char *help);
  CLI::Option *addItems(CLI::App *command, const char *name, const std::string &help);
  void addPlaces();
  void addTrash();
  void addNotes();
  bool has(const char *command) const;
  int runToFolder(CommandContext &context) const;

  CLI::App &app_;
  std::string argument_;
  std::vector<std::string> arguments_;
  std::vector<std::string> names_;
  std::string name_;
  std::string folder_;
  std::string date_;
  std::uint64_t rank_ = 0;
  bool withParents_ = false;
  bool withContents_ = false;
  bool none_ = false;
  bool json_ = false;
};

}  // namespace droxa
