// The daemon protocol's suite, asked of the real daemon in this process.

#include <sys/time.h>

#include "tests/keld/KeldFixture.h"
#include "tests/platform/TemporaryFolder.h"
#include "tests/support/DaemonConformance.h"

namespace droxa {

namespace {

class KeldWorld final : public DaemonWorld {
 public:
  // With a cloud, what becomes of documents there is told like every other change.
  KeldWorld(keld::WatcherKind watcher, bool hasCloud)
      : fixture_(hasCloud ? onCloud(watcher, cloudFolder()) : keld::WatchedBy(watcher), false) {
    std::filesystem::create_directories(fixture_.documents(kConformanceContainer));
    fixture_.start();
  }

  std::shared_ptr<QVProtocol> daemon() override { return fixture_.session(); }
  NSURL documents(const std::string &containerID) override {
    return NSURL::fileURLWithPath(fixture_.documents(containerID));
  }
  void makeFile(const NSURL &url, std::size_t size) override {
    fixture_.write(url.path(), std::string(size, 'x'));
  }
  void changeFile(const NSURL &url, std::size_t size, std::int64_t seconds) override {
    makeFile(url, size);
    const timeval times[2] = {{seconds, 0}, {seconds, 0}};
    ASSERT_EQ(::utimes(url.path().c_str(), times), 0);
  }
  void makeFolder(const NSURL &url) override { fixture_.folder(url.path()); }
  void makeAlias(const NSURL &url, const NSURL &target) override { makeSymbolicLink(url, target.path()); }
  void makeSymbolicLink(const NSURL &url, const std::string &target) override {
    std::filesystem::create_symlink(target, url.path());
  }
  void rename(const NSURL &from, const NSURL &to) override { fixture_.rename(from.path(), to.path()); }
  void remove(const NSURL &url) override { fixture_.remove(url.path()); }
  void settle() override { fixture_.settle(); }
  // As users get one: the cloud has the document, and its contents are let go of here.
  bool addDatalessDocument(const NSURL &url, const std::string &contents) override {
    fixture_.write(url.path(), contents);
    const auto isDone = [&](const std::function<NSError()> &attempt) {
      NSError error;
      const bool done = eventually([&] { return !(error = attempt()); });
      EXPECT_TRUE(done) << url.path() << ": " << error.description();
      return done;
    };
    return isDone([&] {
             Once<NSError> sent("upload of " + url.path());
             fixture_.session()->waitForUploadAtURL(url, sent.completion());
             return sent.value<0>();
           }) &&
           isDone([&] {
             Once<QVContentsResult, NSError> evicted("eviction of " + url.path());
             fixture_.session()->evictItemAtURL(url, evicted.completion());
             return evicted.value<1>();
           });
  }

 private:
  std::string cloudFolder() const { return folder_.path() + "/cloud"; }
  static keld::KeldOptions onCloud(keld::WatcherKind watcher, const std::string &cloudFolder) {
    keld::KeldOptions options = keld::WatchedBy(watcher);
    options.sync.cloudFolder = cloudFolder;
    options.sync.device = "conformance";
    return options;
  }

  const TemporaryFolder folder_;
  keld::KeldFixture fixture_;
};

template <keld::WatcherKind watcher, bool hasCloud>
std::unique_ptr<DaemonWorld> world() {
  return std::make_unique<KeldWorld>(watcher, hasCloud);
}

template <bool hasCloud>
auto worlds() {
  return testing::Values(DaemonWorldMaker{"BestWatcher", world<keld::WatcherKind::best, hasCloud>},
                         DaemonWorldMaker{"Inotify", world<keld::WatcherKind::inotify, hasCloud>},
                         DaemonWorldMaker{"Scanning", world<keld::WatcherKind::scan, hasCloud>});
}

}  // namespace

INSTANTIATE_TEST_SUITE_P(Keld, DaemonConformance, worlds<false>(), ConformanceName);
INSTANTIATE_TEST_SUITE_P(Keld, DaemonContentsConformance, worlds<true>(), ConformanceName);

}  // namespace droxa
