#include "cli/ProgressLine.h"

#include <algorithm>
#include <utility>

#include "cli/Text.h"

namespace droxa {

namespace {

constexpr std::chrono::seconds kBetweenLines{1};
constexpr int kBarWidth = 30;

}  // namespace

ProgressLine::ProgressLine(CommandContext &context, std::string argument)
    : context_(context), argument_(std::move(argument)) {}

void ProgressLine::show(double share, const std::string &text) {
  if (context_.isTerminal) {
    const int full = static_cast<int>(std::clamp(share, 0.0, 1.0) * kBarWidth);
    context_.out << "\r[" << std::string(static_cast<std::size_t>(full), '#')
                 << std::string(static_cast<std::size_t>(kBarWidth - full), '.') << "] " << text << "\033[K"
                 << std::flush;
    isBarShown_ = true;
    return;
  }
  const auto now = std::chrono::steady_clock::now();
  if (now < nextLine_) return;
  nextLine_ = now + kBetweenLines;
  context_.out << escapedText(argument_) << ": " << text << std::endl;
}

void ProgressLine::clear() {
  if (isBarShown_) context_.out << "\r\033[K" << std::flush;
  isBarShown_ = false;
}

}  // namespace droxa
