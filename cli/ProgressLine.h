#pragma once

#include <chrono>
#include <string>

#include "cli/CommandContext.h"

namespace droxa {

// Shows how far something is: a bar in one line on a terminal, a line a second elsewhere.
// Thread contract: one thread.
class ProgressLine {
 public:
  ProgressLine(CommandContext &context, std::string argument);
  // `share`: 0 to 1.
  void show(double share, const std::string &text);
  void clear();  // removes the bar

 private:
  CommandContext &context_;
  const std::string argument_;
  bool isBarShown_ = false;
  std::chrono::steady_clock::time_point nextLine_;
};

}  // namespace droxa
