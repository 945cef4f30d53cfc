#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// What is being provided for clients of the host. The extension has one providing of a path at a time, which
// the clients that want the path share; it is cancelled when the last of them cancels or goes. A client that
// comes while that is under way gets a new one after its end. When the extension ends in the middle, the
// providing is started once more; a second end is told to the clients.
//
// Contents are never let go of here: a cancelled providing that ended meanwhile stays as it is.
// Thread contract: any thread. lock_ guards the table and is never held during a call.
class Providings final : public std::enable_shared_from_this<Providings> {
 public:
  explicit Providings(std::shared_ptr<ExtensionCalls> calls);

  // A client's share. Ends with nil, the extension's error, NSUserCancelledError (NSCocoaErrorDomain) once
  // cancelled, or NSFileProviderErrorServerUnreachable when the extension couldn't be kept up.
  std::shared_ptr<FPDProviding> start(const NSURL &url, std::uint64_t readingOptions);
  std::size_t pathsUnderWay() const;

 private:
  class Client;
  struct Entry {
    NSURL url;
    std::uint64_t readingOptions = 0;
    std::map<std::uint64_t, std::weak_ptr<Client>> clients;
    std::shared_ptr<FPDProviding> providing;  // the extension's; null until it has given one
    bool isCancelled = false;
    int ends = 0;  // of the extension, in the middle
  };

  void begin(const std::string &path);
  void begun(const std::string &path, const std::shared_ptr<FPDProviding> &providing, const NSError &error);
  void cutOff(const std::string &path, const NSError &error);
  void ended(const std::string &path, const NSError &error);
  void leave(const std::string &path, std::uint64_t client);
  void askForProgress(const std::string &path, const FPDProgressCompletion &completion);

  const std::shared_ptr<ExtensionCalls> calls_;
  mutable Mutex lock_;
  std::map<std::string, Entry> entries_ GUARDED_BY(lock_);  // by path; until the extension's providing ends
  std::uint64_t lastClient_ GUARDED_BY(lock_) = 0;
};

}  // namespace droxa
