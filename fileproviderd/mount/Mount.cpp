#include "fileproviderd/mount/Mount.h"

#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <future>
#include <thread>
#include <unistd.h>
#include <utility>

#include "fileproviderd/mount/FuseNotices.h"
#include "fileproviderd/mount/MountPoint.h"
#include "fileproviderd/mount/Operations.h"
#include "platform/dispatch/dispatch.h"

namespace droxa {

namespace {

constexpr unsigned kMostThreads = 16;
constexpr unsigned kMostWrite = 1024 * 1024;
constexpr NodeId kReplica = ~NodeId{0};  // what the watch calls the folder of the containers
constexpr std::chrono::seconds kRootsPatience{3};
constexpr std::chrono::seconds kPendingPatience{5};

// Attributes and pages are told to be stale; the kernel never guesses. Pages aren't written back later, since
// then only the kernel would know a document's size and date, which others change too.
void begin(void * /*session*/, fuse_conn_info *connection) {
  connection->max_write = kMostWrite;
  connection->max_readahead = kMostWrite;
  connection->max_background = 64;
  connection->congestion_threshold = 48;
  const unsigned wanted = FUSE_CAP_ATOMIC_O_TRUNC | FUSE_CAP_ASYNC_READ | FUSE_CAP_READDIRPLUS |
                          FUSE_CAP_READDIRPLUS_AUTO | FUSE_CAP_PARALLEL_DIROPS | FUSE_CAP_CACHE_SYMLINKS |
                          FUSE_CAP_HANDLE_KILLPRIV | FUSE_CAP_EXPLICIT_INVAL_DATA | FUSE_CAP_SPLICE_WRITE |
                          FUSE_CAP_SPLICE_MOVE;
  connection->want |= connection->capable & wanted;
  connection->want &= ~static_cast<unsigned>(FUSE_CAP_WRITEBACK_CACHE | FUSE_CAP_AUTO_INVAL_DATA);
}

// No `flush`: what is written is with the replica's file system at once, so the kernel is told that there is
// nothing to do when a file is closed. No locks: those of the kernel hold for all programs of the mount.
fuse_lowlevel_ops operations() {
  fuse_lowlevel_ops ops{};
  ops.init = begin;
  ops.lookup = requests::lookUp;
  ops.forget = requests::forget;
  ops.forget_multi = requests::forgetMany;
  ops.getattr = requests::getAttributes;
  ops.setattr = requests::setAttributes;
  ops.readlink = requests::readLink;
  ops.mknod = requests::makeNode;
  ops.mkdir = requests::makeFolder;
  ops.symlink = requests::makeLink;
  ops.link = requests::link;
  ops.unlink = requests::remove;
  ops.rmdir = requests::removeFolder;
  ops.rename = requests::rename;
  ops.open = requests::open;
  ops.create = requests::create;
  ops.read = requests::read;
  ops.write = requests::write;
  ops.release = requests::close;
  ops.fsync = requests::sync;
  ops.lseek = requests::seek;
  ops.fallocate = requests::allocate;
  ops.copy_file_range = requests::copyRange;
  ops.opendir = requests::openFolder;
  ops.readdir = requests::readFolder;
  ops.readdirplus = requests::readFolderPlus;
  ops.releasedir = requests::closeFolder;
  ops.fsyncdir = requests::syncFolder;
  ops.statfs = requests::statusOfFileSystem;
  ops.getxattr = requests::getExtendedAttribute;
  ops.setxattr = requests::setExtendedAttribute;
  ops.listxattr = requests::listExtendedAttributes;
  ops.removexattr = requests::removeExtendedAttribute;
  return ops;
}

std::string trashName() {
  return ".Trash-" + std::to_string(::getuid());
}

// A value of a mount option.
std::string optionValue(const std::string &text) {
  std::string escaped;
  for (const char character : text) {
    if (character == ',' || character == '\\') escaped += '\\';
    escaped += character;
  }
  return escaped;
}

}  // namespace

// Thread contract: as Mount's; `isMounted` on any thread.
class Mount::Session {
 public:
  Session(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<Providings> providings,
          MountSettings settings)
      : settings_(std::move(settings)),
        point_(settings_.path, settings_.source),
        drive_(std::make_shared<MountedDrive>(
            std::make_shared<MountRoots>(calls, settings_.replica, trashName()),
            std::make_shared<Materialising>(std::move(providings), settings_.patience), calls)) {
    drive_->folderOpened = settings_.folderOpened;
    shared_.drive = drive_;
  }
  ~Session() { stop(); }
  Session(const Session &) = delete;
  Session &operator=(const Session &) = delete;

  std::string start(bool *isForNow) {
    *isForNow = false;
    if (std::string problem = whyMountingIsImpossible(); !problem.empty()) return problem;
    if (std::string problem = point_.prepare(); !problem.empty()) return problem;
    if (!awaitRoots()) {
      *isForNow = true;
      return "the extension doesn't say where the drive's documents are";
    }
    return serve();
  }

  void stop() {
    if (!fuse_) return;
    drive_->materialising->stop(ENOTCONN);
    if (settings_.announcer && isMounted_)
      settings_.announcer->play(Announcer::Play::writeBack, point_.path());
    fuse_session_exit(fuse_);
    point_.takeOff();
    endLoop();
    drive_->watch.stop();
    invalidation_->stop();
    if (settings_.announcer) settings_.announcer->watchOverNothing();
    // A session with a request that never ends is left as it is: somebody may answer it yet.
    if (awaitPending()) fuse_session_destroy(fuse_);
    fuse_ = nullptr;
  }

  std::vector<ShownFolder> shownFolders() const {
    std::vector<ShownFolder> folders;
    if (!isMounted()) return folders;
    folders.push_back({drive_->roots->root(), path()});
    for (const auto &[name, place] : drive_->roots->folders())
      if (name != trashName()) folders.push_back({place, path() + "/" + name});
    return folders;
  }

  bool isMounted() const { return isMounted_.load(); }
  const std::string &path() const { return point_.path(); }

 private:
  bool awaitRoots() {
    const auto asked = std::make_shared<std::promise<bool>>();
    auto answer = asked->get_future();
    drive_->roots->refresh([asked](bool isWhole) { asked->set_value(isWhole); });
    return answer.wait_for(kRootsPatience) == std::future_status::ready && !drive_->roots->root().empty();
  }

  std::string serve() {
    std::string options = "-ofsname=" + optionValue(settings_.source) + ",subtype=droxa,default_permissions";
    char name[] = "droxa";
    char *words[] = {name, options.data(), nullptr};
    fuse_args arguments = FUSE_ARGS_INIT(2, words);
    static const fuse_lowlevel_ops ops = operations();
    fuse_ = fuse_session_new(&arguments, &ops, sizeof(ops), &shared_);
    fuse_opt_free_args(&arguments);
    if (!fuse_) return "the session with the kernel can't be made";
    invalidation_ = std::make_shared<Invalidation>(
        drive_, std::make_shared<FuseNotices>(fuse_, drive_, settings_.announcer, point_.path()));
    drive_->news = invalidation_.get();
    drive_->watch.start(
        [this](NodeId folder, const std::string &child, bool isNew) { seen(folder, child, isNew); },
        [this] { invalidation_->missed(); });
    watchRoot();
    if (fuse_session_mount(fuse_, point_.path().c_str()) != 0) {
      const std::string problem = point_.path() + ": can't be mounted: " + std::strerror(errno);
      drive_->watch.stop();
      fuse_session_destroy(fuse_);
      fuse_ = nullptr;
      return problem;
    }
    if (settings_.announcer) {
      drive_->playing.setProcess(settings_.announcer->process());
      settings_.announcer->watchOver(point_, point_.connection());
    }
    invalidation_->start();
    struct sigaction nothing {};
    nothing.sa_handler = [](int) {};
    ::sigaction(SIGUSR2, &nothing, nullptr);
    isMounted_ = true;
    loop_ = std::thread([this] { loop(); });
    return {};
  }

  // Taking the folder off wakes the session's threads only where the connection could be aborted, or nobody
  // has a file open. The loop looks whether it is to end whenever its wait is interrupted; it may have been
  // about to wait, so it is told until it has ended.
  void endLoop() {
    while (isMounted_) {
      ::pthread_kill(loop_.native_handle(), SIGUSR2);
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    if (loop_.joinable()) loop_.join();
  }

  bool awaitPending() {
    const std::weak_ptr<int> pending = std::exchange(shared_.pending, nullptr);
    const auto until = std::chrono::steady_clock::now() + kPendingPatience;
    while (!pending.expired() && std::chrono::steady_clock::now() < until)
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    return pending.expired();
  }

  void watchRoot() {
    int error = 0;
    const SharedDescriptor root = drive_->folder(kRootNode, &error);
    if (root) drive_->watch.add(kRootNode, root->get());
    const Descriptor replica(::open(settings_.replica.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (replica) drive_->watch.add(kReplica, replica.get());
  }

  void seen(NodeId folder, const std::string &child, bool isNew) {
    if (folder != kReplica) return invalidation_->seen(folder, child, isNew);
    // A container may have come or gone; its documents folder, and what the extension knows, come a moment
    // later.
    for (const auto delay : {std::chrono::milliseconds(100), std::chrono::milliseconds(1500)})
      dispatch_after_global(delay, [drive = drive_, told = std::weak_ptr<Invalidation>(invalidation_)] {
        refreshRoots(drive, told);
      });
  }

  static void refreshRoots(const std::shared_ptr<MountedDrive> &drive,
                           const std::weak_ptr<Invalidation> &told) {
    drive->roots->refresh([drive, told, before = drive->roots->folders()](bool) {
      const auto invalidation = told.lock();
      if (!invalidation) return;
      auto names = drive->roots->folders();
      for (const auto &folder : before)
        if (!names.erase(folder.first)) names.insert(folder);
      for (const auto &[name, path] : names) invalidation->seen(kRootNode, name, true);
    });
  }

  // Until the session ends, here or because somebody unmounts the folder.
  void loop() {
    sigset_t interrupting;  // which the threads of the pool, one of which began this one, don't take
    sigemptyset(&interrupting);
    sigaddset(&interrupting, SIGUSR2);
    ::pthread_sigmask(SIG_UNBLOCK, &interrupting, nullptr);
    fuse_loop_config *config = fuse_loop_cfg_create();
    fuse_loop_cfg_set_clone_fd(config, 1);
    fuse_loop_cfg_set_max_threads(config, kMostThreads);
    fuse_loop_cfg_set_idle_threads(config, kMostThreads);
    fuse_session_loop_mt(fuse_, config);
    fuse_loop_cfg_destroy(config);
    isMounted_ = false;
  }

  const MountSettings settings_;
  const MountPoint point_;
  const std::shared_ptr<MountedDrive> drive_;
  requests::Session shared_;
  fuse_session *fuse_ = nullptr;
  std::shared_ptr<Invalidation> invalidation_;
  std::thread loop_;
  std::atomic<bool> isMounted_{false};
};

Mount::Mount(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<Providings> providings,
             MountSettings settings)
    : session_(std::make_unique<Session>(std::move(calls), std::move(providings), std::move(settings))) {}

Mount::~Mount() = default;

std::string Mount::start(bool *isForNow) {
  return session_->start(isForNow);
}

void Mount::stop() {
  session_->stop();
}

bool Mount::isMounted() const {
  return session_->isMounted();
}

const std::string &Mount::path() const {
  return session_->path();
}

std::vector<ShownFolder> Mount::shownFolders() const {
  return session_->shownFolders();
}

}  // namespace droxa
