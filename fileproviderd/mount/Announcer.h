#pragma once

#include <memory>
#include <string>
#include <sys/types.h>

#include "fileproviderd/mount/Descriptor.h"
#include "fileproviderd/mount/MountPoint.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Plays changes that happened behind a mount on the mount itself, so that the kernel tells the programs which
// watch its folders: a small process, whose requests the host recognises and answers as if each had done what
// was done already. It has to be another process: one that is killed while it waits for itself can't end. For
// the same reason it frees the mount's connection when the process that made it dies, and takes the mount
// off. Thread contract: start() on the main thread, with which the process ends; play() and watchOver() on
// any thread, one at a time. lock_ is held while the process plays.
class Announcer {
 public:
  enum class Play : char {
    makeFile = 'f',
    makeFolder = 'd',
    makeLink = 'l',
    removeFile = 'u',
    removeFolder = 'r',
    changeContents = 'c',
    changeAttributes = 'a',
    writeBack = 's',  // no change: has the kernel write what programs changed in mapped memory
  };

  ~Announcer();
  // `program` is started with the argument that announcerMain() runs under; null where it can't be.
  static std::shared_ptr<Announcer> start(const std::string &program);

  pid_t process() const { return process_; }
  // Waits until it was played, but not for ever: an announcer that doesn't answer is ended. False once it is.
  bool play(Play play, const std::string &path);
  // The mount that is to be taken off when this process dies, and the number of its connection.
  void watchOver(const MountPoint &point, unsigned connection);
  void watchOverNothing();

  static constexpr char kArgument[] = "--announcer";

 private:
  Announcer(pid_t process, Descriptor socket) : process_(process), socket_(std::move(socket)) {}
  bool send(char kind, const std::string &text);

  const pid_t process_;
  Mutex lock_;
  Descriptor socket_ GUARDED_BY(lock_);
};

// The process: serves what comes over standard input until that ends. Gives its exit status.
int announcerMain();

}  // namespace droxa
