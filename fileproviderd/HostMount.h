#pragma once

#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "fileproviderd/ExtensionCalls.h"
#include "fileproviderd/Providings.h"
#include "fileproviderd/ShownFolder.h"
#include "platform/foundation/Paths.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

class Announcer;
class Mount;

// The home's mount: where it is to be is noted in the home (DroxaHome::mountFile), so that a host which is
// started again mounts the drive where it was.
// Thread contract: any thread. working_ is held while something is mounted or unmounted; lock_, taken under
// it, guards what is told, and is never held during a call.
class HostMount final : public std::enable_shared_from_this<HostMount> {
 public:
  struct State {
    std::string path;     // "": not mounted
    std::string problem;  // why not, though it is to be
  };

  HostMount(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<Providings> providings, DroxaHome home);
  ~HostMount();
  HostMount(const HostMount &) = delete;
  HostMount &operator=(const HostMount &) = delete;

  // Mounts in the background what is noted, and tries for as long as it takes the extension to answer.
  // `program` is the host's own, which can be started as the announcer ("": none is). On the main thread.
  void begin(const std::string &program);
  void end();  // unmounts; the note stays

  // "" or why it can't be. Wait for the kernel and the extension.
  std::string mount(const std::string &path);
  void unmount();

  // Before begin(); see MountSettings.
  void setFolderOpened(std::function<void(const std::string &path)> handler) {
    folderOpened_ = std::move(handler);
  }

  State state() const;
  std::vector<ShownFolder> shownFolders() const;
  // The drive's path of one in the mount; `path` itself for any other.
  std::string drivePath(const std::string &path) const;

 private:
  void keepTrying(const std::string &path);
  std::string tryToMount(const std::string &path, bool *isForNow) REQUIRES(working_);
  void takeOff() REQUIRES(working_);
  void tell(const std::string &problem);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::shared_ptr<Providings> providings_;
  const DroxaHome home_;
  std::shared_ptr<Announcer> announcer_;                       // constant after begin()
  std::function<void(const std::string &path)> folderOpened_;  // constant after setFolderOpened()
  Mutex working_;
  mutable Mutex lock_;
  std::shared_ptr<Mount> mount_ GUARDED_BY(lock_);
  std::string problem_ GUARDED_BY(lock_);
  bool isEnded_ GUARDED_BY(lock_) = false;
};

}  // namespace droxa
