#pragma once

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Which folders of the replica the mount's root is made of: the documents folder of the default container
// (the root itself), those of the other containers, under the names that the extension has for them, and the
// trash. What was learnt is kept while the extension is away.
// Thread contract: any thread; lock_ guards what is known and is never held during a call.
class MountRoots final : public std::enable_shared_from_this<MountRoots> {
 public:
  // `trashName`: what the trash is called in the mount.
  MountRoots(std::shared_ptr<ExtensionCalls> calls, std::string replica, std::string trashName);

  // Asks the extension anew. `done` is told whether everything was answered, once, on any thread.
  void refresh(std::function<void(bool isWhole)> done);

  std::string root() const;  // absolute; "" until it is known
  std::optional<std::string> folderNamed(const std::string &name) const;
  std::map<std::string, std::string> folders() const;  // by name
  const std::string &replica() const { return replica_; }

 private:
  struct Round;
  void askForContainers(const std::shared_ptr<Round> &round);
  void askForContainer(const std::shared_ptr<Round> &round, const std::string &path);
  void end(const std::shared_ptr<Round> &round);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::string replica_;
  const std::string trashName_;
  mutable Mutex lock_;
  std::string root_ GUARDED_BY(lock_);
  std::map<std::string, std::string> folders_ GUARDED_BY(lock_);
};

}  // namespace droxa
