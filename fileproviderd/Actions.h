#pragma once

#include <memory>

#include "fileproviderd/ExtensionCalls.h"
#include "fileproviderd/FollowedContainers.h"
#include "fileproviderd/OpenListings.h"

namespace droxa {

// What clients of the host have done to items: each action is relayed to one of the extension's, and ends
// with it. One that the extension's end cuts off isn't begun again, since nobody knows how far it came; the
// extension is asked for another one only as long as nothing has begun.
//
// When an action has ended, the containers that it is known to have changed are looked at without waiting for
// their signals. Where an item was before isn't known here: that container is signalled like any other.
// Thread contract: any thread.
class Actions final {
 public:
  Actions(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<FollowedContainers> followed,
          std::shared_ptr<OpenListings> listings);
  void perform(const FPDActionRequest &request, const FPDActionCompletion &completion) const;

 private:
  class Relayed;
  void lookAgain(const FPDActionRequest &request,
                 const std::shared_ptr<const NSFileProviderItem> &item) const;

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::shared_ptr<FollowedContainers> followed_;
  const std::shared_ptr<OpenListings> listings_;
};

}  // namespace droxa
