#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// The extension's services that clients of the host hold. The host passes them on, and is no part of the
// connections that are made to them. Each costs descriptors in both processes, so that there is a limit to
// what one process and all of them may hold; whoever is at it is told to let go of some first, and others
// aren't concerned.
// Thread contract: any thread. lock_ guards the counts and is never held during a call.
class Services final : public std::enable_shared_from_this<Services> {
 public:
  static constexpr std::size_t kMostOfOneClient = 32;
  static constexpr std::size_t kMost = 256;

  explicit Services(std::shared_ptr<ExtensionCalls> calls);

  // The service `name` on the item, for the client `process`. NSPOSIXErrorDomain EMFILE at a limit; else as
  // the extension's.
  void open(const std::string &name, const std::string &itemIdentifier, std::int32_t process,
            const FPDServiceCompletion &completion);
  std::size_t held() const;

 private:
  class Relayed;
  NSError add(std::int32_t process);
  void remove(std::int32_t process);

  const std::shared_ptr<ExtensionCalls> calls_;
  mutable Mutex lock_;
  std::map<std::int32_t, std::size_t> held_ GUARDED_BY(lock_);  // by process
  std::size_t all_ GUARDED_BY(lock_) = 0;
};

}  // namespace droxa
