#pragma once

#include <string>
#include <vector>

#include "cli/Share.h"

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace droxa {

// The part of the command line that is about sharing: `share` and its subcommands, their options, and which
// was chosen. Thread contract: one thread.
class ShareCommands {
 public:
  explicit ShareCommands(CLI::App &app);  // adds them to it
  bool isChosen() const;
  int run(CommandContext &context) const;

 private:
  CLI::App *add(const char *name, const char *description);
  void addChanges();
  bool has(const char *command) const;
  int runPermission(CommandContext &context) const;

  CLI::App &app_;
  CLI::App *share_ = nullptr;
  CLI::Option *remove_ = nullptr;
  ShareArguments arguments_;
  std::vector<std::string> names_;
  std::string name_, title_, url_, everyone_;
  std::vector<std::string> permission_;
  bool readOnly_ = false;
};

}  // namespace droxa
