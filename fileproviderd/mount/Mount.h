#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "fileproviderd/ExtensionCalls.h"
#include "fileproviderd/Providings.h"
#include "fileproviderd/ShownFolder.h"

namespace droxa {

class Announcer;

struct MountSettings {
  std::string path;    // absolute
  std::string source;  // what the mount is known by in the system's table
  std::string replica;
  std::chrono::milliseconds patience{60'000};  // of a read that waits for contents
  std::shared_ptr<Announcer> announcer;        // null: programs that watch folders aren't told
  // Told, on a thread of the session, of the path in the replica of each folder that a program opens. May be
  // null; must not wait.
  std::function<void(const std::string &path)> folderOpened;
};

// The drive as a folder: a session with the kernel, from start() to stop(), or until somebody unmounts it.
// Thread contract: start() and stop() on one thread; the session has threads of its own.
class Mount {
 public:
  Mount(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<Providings> providings,
        MountSettings settings);
  ~Mount();
  Mount(const Mount &) = delete;
  Mount &operator=(const Mount &) = delete;

  // Asks the extension what the root is made of, and mounts. "" or why it isn't mounted; `isForNow` when
  // another try may help.
  std::string start(bool *isForNow);
  void stop();
  bool isMounted() const;
  const std::string &path() const;
  // The folders that the mount is made of, the trash left out; none unless it is mounted.
  std::vector<ShownFolder> shownFolders() const;

 private:
  class Session;
  const std::unique_ptr<Session> session_;
};

}  // namespace droxa
