#pragma once

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "platform/fileprovider/FPReplacements.h"
#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSFileCoordinator.h"
#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/NSProgress.h"
#include "tests/platform/TemporaryFolder.h"
#include "tests/support/Eventually.h"

namespace droxa {

namespace fs = std::filesystem;

// A sync service that says what it was asked, and for which ".<name>.promise" stands for what isn't here.
class ScriptedItems final : public NSUbiquitousItemProviding {
 public:
  NSError evictItemAtURL(const NSURL & /*url*/) override { return {}; }
  bool isDataless(const NSURL &url) override { return url.lastPathComponent().ends_with(".dataless"); }
  NSURL itemReplacementDirectoryForURL(const NSURL & /*url*/) override { return replacements; }
  void willDeleteItemAtURL(const NSURL &url) override {
    deleted.push_back(url.path());
    EXPECT_TRUE(fs::exists(fs::symlink_status(url.path())));
  }
  NSURL physicalURLForURL(const NSURL &url) override {
    const NSURL promise = promiseOf(url.URLByDeletingLastPathComponent(), url.lastPathComponent());
    return fs::exists(promise.path()) ? promise : url;
  }
  NSURL physicalURLForName(const NSURL &folder, const std::string &name) override {
    return promiseOf(folder, name);
  }

  NSURL replacements;                // nil: beside the item
  std::vector<std::string> deleted;  // each waited for by the test

 private:
  static NSURL promiseOf(const NSURL &folder, const std::string &name) {
    return folder.URLByAppendingPathComponent("." + name + ".promise");
  }
};

struct Answer {
  NSURL url;
  NSError error;
  bool is(std::int64_t code) const { return error.is(NSCocoaErrorDomain, code); }
};

// A folder on one file system, and the real operations under a coordination of the test's own.
class OperationsFixture : public testing::Test {
 protected:
  explicit OperationsFixture(const std::string &fileSystem = testing::TempDir()) {
    std::string name = fs::path(fileSystem) / "droxa-XXXXXX";
    root = mkdtemp(name.data()) ? name : "";
    EXPECT_FALSE(root.empty()) << "no temporary folder in " << fileSystem;
    NSFileCoordinator::setDefaultForTesting(
        std::make_shared<NSFileCoordinator>(coordination.path() + "/locks"));
    NSFileManager::defaultManager()->setUbiquitousItemProvider(items);
  }
  ~OperationsFixture() override {
    NSFileManager::defaultManager()->setUbiquitousItemProvider(nullptr);
    NSFileCoordinator::setDefaultForTesting(nullptr);
    std::error_code ignored;
    fs::remove_all(root, ignored);
  }

  std::string path(const std::string &name) const { return root + "/" + name; }
  NSURL url(const std::string &name) const { return NSURL::fileURLWithPath(path(name)); }
  void write(const std::string &name, const std::string &contents) const {
    fs::create_directories(fs::path(path(name)).parent_path());
    std::ofstream(path(name), std::ios::binary) << contents;
  }
  void makeFolder(const std::string &name) const { fs::create_directories(path(name)); }
  std::string read(const std::string &name) const {
    std::ifstream file(path(name), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  bool exists(const std::string &name) const { return fs::exists(fs::symlink_status(path(name))); }
  // What is in the folder, hidden things included, in order.
  std::vector<std::string> names(const std::string &folder = "") const {
    std::vector<std::string> found;
    for (const auto &entry : fs::directory_iterator(path(folder))) found.push_back(entry.path().filename());
    std::sort(found.begin(), found.end());
    return found;
  }
  ino_t inode(const std::string &name) const {
    struct stat status {};
    EXPECT_EQ(lstat(path(name).c_str(), &status), 0) << name;
    return status.st_ino;
  }

  // Waits for the one answer of an operation; a second fails the test.
  Answer await(const std::function<void(FPURLCompletion)> &begin) {
    const auto answer = std::make_shared<std::promise<Answer>>();
    const auto answers = std::make_shared<std::atomic<int>>(0);
    begin([answer, answers](const NSURL &newURL, const NSError &error) {
      EXPECT_EQ(++*answers, 1) << "a second answer";
      EXPECT_NE(static_cast<bool>(newURL), static_cast<bool>(error));
      if (*answers == 1) answer->set_value({newURL, error});
    });
    auto future = answer->get_future();
    if (future.wait_for(kTestDeadline) == std::future_status::ready) return future.get();
    ADD_FAILURE() << "no answer";
    return {};
  }
  Answer import(const NSURL &source, const NSURL &folder) {
    return await(
        [&](FPURLCompletion done) { operations->importUnderFolder(source, folder, std::move(done)); });
  }
  Answer create(const NSURL &parent, const std::string &name) {
    return await([&](FPURLCompletion done) { operations->createSubFolder(parent, name, std::move(done)); });
  }
  Answer rename(const NSURL &item, const std::string &name) {
    return await([&](FPURLCompletion done) { operations->renameWithNewName(item, name, std::move(done)); });
  }
  Answer move(const NSURL &item, const NSURL &folder, const std::optional<std::string> &name = std::nullopt) {
    return await([&](FPURLCompletion done) {
      operations->reparentUnderFolder_withNewName(item, folder, name, std::move(done));
    });
  }
  Answer bounce(const NSURL &item, const NSURL &folder, bool allowed = true) {
    return await([&](FPURLCompletion done) {
      operations->reparentUnderFolder_allowBouncing(item, folder, allowed, std::move(done));
    });
  }
  NSError remove(const NSURL &item) {
    return await([&](const FPURLCompletion &done) {
             operations->deleteWithCompletionHandler(
                 item, [done, item](const NSError &error) { done(error ? NSURL() : item, error); });
           })
        .error;
  }

  void expectCollision(const Answer &answer, const NSURL &with) {
    EXPECT_TRUE(answer.is(NSFileWriteFileExistsError)) << answer.error.description();
    EXPECT_EQ(fp_collidingURL(answer.error), with);
  }
  void expectDescribes(const NSError &error, const std::string &text) {
    EXPECT_NE(error.localizedDescription().find(text), std::string::npos) << error.description();
  }

  const TemporaryFolder coordination;
  std::string root;
  const std::shared_ptr<ScriptedItems> items = std::make_shared<ScriptedItems>();
  const std::shared_ptr<FPURLOperations> operations = FPMakeURLOperations();
};

// The same on each file system that this machine has for tests: the build's, one in memory, and one without
// extended attributes.
class OperationsOnFileSystems : public OperationsFixture, public testing::WithParamInterface<std::string> {
 protected:
  OperationsOnFileSystems() : OperationsFixture(GetParam().empty() ? testing::TempDir() : GetParam()) {}
};
inline std::vector<std::string> testedFileSystems() {
  return {"", "/dev/shm"};
}
inline std::string fileSystemName(const testing::TestParamInfo<std::string> &info) {
  return info.param.empty() ? "disk" : "memory";
}

// A file system mounted for one test; not there where the machine doesn't permit it.
class MountedFileSystem {
 public:
  MountedFileSystem(const char *type, const char *options)
      : isMounted_(mount("none", folder_.path().c_str(), type, 0, options) == 0) {}
  ~MountedFileSystem() {
    if (isMounted_) umount2(folder_.path().c_str(), MNT_DETACH);
  }
  MountedFileSystem(const MountedFileSystem &) = delete;
  MountedFileSystem &operator=(const MountedFileSystem &) = delete;
  bool isMounted() const { return isMounted_; }
  const std::string &path() const { return folder_.path(); }

 private:
  const TemporaryFolder folder_;
  const bool isMounted_;
};

}  // namespace droxa
