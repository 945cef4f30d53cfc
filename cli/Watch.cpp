#include <atomic>
#include <sysexits.h>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/Text.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;

// Prints what is pushed, each batch flushed before the next is asked for.
// Thread contract: called on the connection's threads; lock_ guards the output until close().
class WatchPrinter final : public FPDWatchObserver {
 public:
  WatchPrinter(std::ostream &out, bool json) : json_(json), out_(&out) {}

  void receiveChanges(const std::vector<FPDChange> &changes, std::function<void()> reply) override {
    {
      Lock held(lock_);
      if (!out_) return;
      for (const FPDChange &change : changes)
        *out_ << (json_ ? changeJSON(change) : changeLine(change)) << '\n';
      out_->flush();
      if (!out_->good()) isBroken_ = true;
    }
    reply();
  }

  void close() {
    Lock held(lock_);
    out_ = nullptr;
  }
  bool isBroken() const { return isBroken_; }

 private:
  const bool json_;
  std::atomic<bool> isBroken_{false};
  Mutex lock_;
  std::ostream *out_ GUARDED_BY(lock_);
};

}  // namespace

int runWatch(CommandContext &context, const std::string &argument, bool json) {
  auto hasEnded = std::make_shared<std::atomic<bool>>(false);
  context.host->connecting()->setEndHandler([hasEnded] { *hasEnded = true; });
  const auto container = resolveContainer(*context.host, argument);
  if (container.error) return reportError(context, argument, container.error);
  const auto &item = container.value.item;
  if (item && item->fields().kind != NSFileProviderItemKind::folder) {
    context.err << "droxa: " << escapedText(argument) << ": it is a " << kindText(item->fields().kind)
                << ", and only folders can be watched; watch the folder that it is in" << std::endl;
    return kExitFailure;
  }
  const auto printer = std::make_shared<WatchPrinter>(context.out, json);
  const auto watch = context.host->watch(container.value.identifier, printer);
  if (!watch.value) return reportError(context, argument, watch.error);
  context.err << "watching " << escapedText(argument.empty() ? "/" : argument) << " ("
              << container.value.identifier << "); Ctrl-C ends it" << std::endl;
  while (!*hasEnded && !printer->isBroken() && !context.waitForStop(100ms)) {
  }
  printer->close();
  watch.value->stop();
  if (*hasEnded) {
    context.err << "droxa: " << escapedText(argument)
                << ": fileproviderd has gone, and the watch with it; watch again when `droxa status` shows it"
                << std::endl;
    return EX_UNAVAILABLE;
  }
  return printer->isBroken() ? kExitFailure : kExitSuccess;
}

}  // namespace droxa
