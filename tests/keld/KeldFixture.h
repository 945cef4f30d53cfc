#pragma once

#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "keld/Keld.h"
#include "keld/KeldSession.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingReceivers.h"
#include "tests/support/ScratchHome.h"
#include "tests/support/UnreachableCloud.h"

namespace droxa::keld {

// A daemon over a home of its own, and one line for each thing that tests do with them. Paths are below the
// default container's documents folder; those that begin with '/' are absolute. Thread contract: the test's
// thread.
class KeldFixture {
 public:
  explicit KeldFixture(KeldOptions options = {}, bool starts = true) : options_(std::move(options)) {
    // What isn't about the sync isn't to see its traces.
    if (!options_.sync.cloud && options_.sync.cloudFolder.empty())
      options_.sync.cloud = std::make_shared<UnreachableCloud>();
    std::filesystem::create_directories(at(""));
    if (starts) start();
  }
  ~KeldFixture() { stop(); }

  void start() {
    std::string problem;
    daemon_ = Keld::start(DroxaHome(home_.root()), options_, &problem);
    ASSERT_TRUE(daemon_) << problem;
    session_ = daemon_->newSession();
  }
  void stop() {
    session_.reset();
    if (daemon_) daemon_->stop();
    daemon_.reset();
  }
  void waitForFirstScan() {
    ASSERT_TRUE(eventually([this] { return daemon_->keeper().firstScanDone(); }));
  }
  // Returns when the keeper has worked off what was done so far.
  void settle() {
    waitForFirstScan();
    static int marks = 0;
    const std::string mark = at("/" + replica() + "/" + QVUbiquitousDefaultContainerID + "/settled-" +
                                std::to_string(::getpid()) + "-" + std::to_string(++marks));
    write(mark);
    ASSERT_TRUE(eventually([&] { return knows(mark); })) << "the watcher told nothing of " << mark;
    remove(mark);
    ASSERT_TRUE(eventually([&] { return !knows(mark); }))
        << "the watcher told nothing of the end of " << mark;
  }

  Keld &daemon() { return *daemon_; }
  std::shared_ptr<Keld> sharedDaemon() { return daemon_; }
  const std::shared_ptr<QVProtocol> &session() { return session_; }
  ScratchHome &home() { return home_; }
  std::string replica() const { return home_.replica(); }
  std::string databasePath() const { return DroxaHome(home_.root()).state() + "/keld.sqlite"; }
  KeldOptions &options() { return options_; }

  // --- The drive.
  std::string at(const std::string &path) const {
    if (!path.empty() && path[0] == '/') return path.substr(path.find_first_not_of('/') - 1);
    return documents(QVUbiquitousDefaultContainerID) + (path.empty() ? "" : "/" + path);
  }
  std::string documents(const std::string &container) const {
    return replica() + "/" + container + "/" + QVDocumentsFolderName(container);
  }
  void write(const std::string &path, const std::string &contents = "x") {
    std::ofstream(at(path), std::ios::binary | std::ios::trunc) << contents;
  }
  void folder(const std::string &path) { std::filesystem::create_directories(at(path)); }
  void rename(const std::string &from, const std::string &to) { std::filesystem::rename(at(from), at(to)); }
  // The daemon may be making something in it anew at the same time.
  void remove(const std::string &path) {
    EXPECT_TRUE(eventually([&] {
      std::error_code code;
      std::filesystem::remove_all(at(path), code);
      return !code;
    })) << path;
  }

  // --- Questions.
  std::optional<ItemRecord> record(const std::string &path) {
    std::optional<ItemRecord> found;
    const auto below = daemon_->pathBelowReplica(NSURL::fileURLWithPath(at(path)));
    (void)daemon_->read([&](ItemQueries &queries, const ItemPresenter &) {
      if (below) found = queries.byPathBelowReplica(*below);
    });
    return found;
  }
  bool knows(const std::string &path) { return record(path).has_value(); }
  ItemNumber number(const std::string &path) {
    const auto found = record(path);
    return found ? found->id : 0;
  }
  std::shared_ptr<const QVQueryItem> item(const std::string &path) {
    Once<std::shared_ptr<const QVQueryItem>, NSError> answer("item at " + path);
    session_->getQueryItemForURL(NSURL::fileURLWithPath(at(path)), false, answer.completion());
    return answer.value<0>();
  }
  struct Page {
    QVQueryItems items;
    std::uint64_t nextOffset = 0;
    NSError error;
  };
  Page page(std::optional<QVFileObjectID> folderID, std::uint64_t offset, std::uint64_t limit,
            std::int64_t sortOrder = 0) {
    Once<QVQueryItems, std::uint64_t, NSError> answer("page");
    session_->enumerateItemsInFolder(folderID, sortOrder, offset, limit, answer.completion());
    return {answer.value<0>(), answer.value<1>(), answer.value<2>()};
  }
  Page pageOf(const std::string &path, std::uint64_t offset, std::uint64_t limit,
              std::int64_t sortOrder = 0) {
    return page(QVFileObjectID::folderOrAliasID(number(path)), offset, limit, sortOrder);
  }
  std::vector<std::string> namesIn(const std::string &path, std::uint64_t limit = 200,
                                   std::int64_t sortOrder = 0) {
    std::vector<std::string> names;
    std::uint64_t offset = 0;
    do {
      const Page one = pageOf(path, offset, limit, sortOrder);
      EXPECT_FALSE(one.error) << path << ": " << one.error.description();
      for (const auto &each : one.items) names.push_back(each->fields().filename);
      offset = one.nextOffset;
    } while (offset != 0);
    return names;
  }

 private:
  ScratchHome home_;
  KeldOptions options_;
  std::shared_ptr<Keld> daemon_;
  std::shared_ptr<QVProtocol> session_;
};

inline KeldOptions WatchedBy(WatcherKind kind) {
  KeldOptions options;
  options.keeper.watcher = kind;
  options.keeper.scanInterval = std::chrono::milliseconds(20);
  return options;
}

inline std::vector<std::string> NamesOf(const QVQueryItems &items) {
  std::vector<std::string> names;
  for (const auto &item : items) names.push_back(item->fields().filename);
  return names;
}

}  // namespace droxa::keld
