#pragma once

#include <string>

#include "cli/CommandContext.h"

namespace droxa {

// How an action on an item ended.
struct ActionEnd {
  ControlClient::Item item;  // as it is now; null where there is none any more, or nobody can tell
  NSError error;
  bool wasStopped = false;  // by Ctrl-C; it may have been too late, which the rest tells
};

enum class ActionPatience {
  timeout,          // as long as any question may take
  untilStopped,     // however long it takes; Ctrl-C cancels
  showingProgress,  // the same, and shows how far it is
};

// Has the host do it, and waits for the end. `asked` is what the person named.
ActionEnd act(CommandContext &context, const std::string &asked, const FPDActionRequest &request,
              ActionPatience patience = ActionPatience::timeout);

// Prints the item that came back, as one line of `ls -l` or a JSON object, or says what went wrong; gives the
// exit status.
int reportAction(CommandContext &context, const std::string &asked, const FPDActionRequest &request,
                 const ActionEnd &end, bool json);

// The two together.
int actAndReport(CommandContext &context, const std::string &asked, const FPDActionRequest &request,
                 bool json);

}  // namespace droxa
