#pragma once

#include <functional>
#include <memory>
#include <utility>

#include "platform/foundation/NSProgress.h"
#include "platform/xpc/Progress.capnp.h"
#include "platform/xpc/capnp/Session.h"

// The progress that a call returns before its completion comes. The caller makes a progress of its own at
// once, the mirror, and passes along what follows the real one: the mirror shows the real one's counts as
// they change, and cancelling it cancels the real one, also when that was done before there was one. Where
// the call returns nil the mirror stays as it was made. Letting go of a mirror cancels nothing, and ends the
// following. On the loop.

namespace droxa {

// The caller's side.
schema::NSProgressWatcher::Client exportProgressMirror(Session &session, std::weak_ptr<NSProgress> mirror);

// The other side: takes what the call returned, once, on any thread; changes go to the caller for as long as
// the progress lives. A caller that is slow to take them gets the last one.
using ProgressReturn = std::function<void(const std::shared_ptr<NSProgress> &progress)>;
ProgressReturn receivedProgressWatcher(Session &session, schema::NSProgressWatcher::Client client);

// Out of and into the message that has the field `progress`.
template <class Builder>
void setProgressMirror(Builder message, Session &session, std::weak_ptr<NSProgress> mirror) {
  message.setProgress(exportProgressMirror(session, std::move(mirror)));
}
// Fills a request that has no other field.
inline auto watchedBy(std::weak_ptr<NSProgress> mirror) {
  return [mirror = std::move(mirror)](auto params, Session &session) {
    setProgressMirror(params, session, mirror);
  };
}
// Without a field: nobody watches.
template <class Reader>
ProgressReturn getProgressReturn(Reader message, Session &session) {
  if (!message.hasProgress()) return [](const std::shared_ptr<NSProgress> &) {};
  return receivedProgressWatcher(session, message.getProgress());
}

}  // namespace droxa
