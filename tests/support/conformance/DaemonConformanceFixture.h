#pragma once

#include <algorithm>
#include <gtest/gtest.h>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingReceivers.h"
#include "tests/support/conformance/DaemonWorld.h"

namespace droxa {

struct ConformancePage {
  QVQueryItems items;
  std::uint64_t nextOffset = 0;
  NSError error;
};

// What the tests of the daemon's protocol share: one line for each thing that is done or asked.
class DaemonConformance : public testing::TestWithParam<DaemonWorldMaker> {
 protected:
  using Item = std::shared_ptr<const QVQueryItem>;

  void SetUp() override {
    world_ = GetParam().make();
    world_->settle();
  }

  // Paths are below the default container's documents folder.
  NSURL at(const std::string &path) {
    const NSURL root = world_->documents(QVUbiquitousDefaultContainerID);
    return path.empty() ? root : NSURL::fileURLWithPath(root.path() + "/" + path);
  }
  void file(const std::string &path, std::size_t size = 1) { world_->makeFile(at(path), size); }
  void folder(const std::string &path) { world_->makeFolder(at(path)); }
  void rename(const std::string &from, const std::string &to) { world_->rename(at(from), at(to)); }
  void remove(const std::string &path) { world_->remove(at(path)); }
  void settle() { world_->settle(); }
  std::shared_ptr<QVProtocol> daemon() { return world_->daemon(); }

  Item itemAtURL(const NSURL &url) {
    Once<Item, NSError> found("item at " + url.path());
    daemon()->getQueryItemForURL(url, false, found.completion());
    EXPECT_EQ(found.value<1>(), NSError());
    return found.value<0>();
  }
  Item item(const std::string &path) { return itemAtURL(at(path)); }
  QVFileObjectID identifier(const std::string &path) {
    const Item found = item(path);
    return found ? found->fileObjectID() : QVFileObjectID::documentID(UINT64_MAX);
  }
  std::int64_t codeForURL(const NSURL &url) {
    Once<Item, NSError> answer("item at " + url.path());
    daemon()->getQueryItemForURL(url, false, answer.completion());
    EXPECT_FALSE(answer.value<0>());
    return tessalyCode(answer.value<1>());
  }

  // One page of a listing.
  ConformancePage page(std::optional<QVFileObjectID> folderID, std::int64_t sortOrder, std::uint64_t offset,
                       std::uint64_t limit) {
    Once<QVQueryItems, std::uint64_t, NSError> answer("page");
    daemon()->enumerateItemsInFolder(folderID, sortOrder, offset, limit, answer.completion());
    return {answer.value<0>(), answer.value<1>(), answer.value<2>()};
  }
  ConformancePage folderPage(std::int64_t sortOrder, std::uint64_t offset, std::uint64_t limit) {
    Once<QVQueryItems, std::uint64_t, NSError> answer("page of all folders");
    daemon()->enumerateAllFoldersWithSortOrder(sortOrder, offset, limit, answer.completion());
    return {answer.value<0>(), answer.value<1>(), answer.value<2>()};
  }
  // Every page of a listing, one after the other.
  template <class NextPage>
  static QVQueryItems drain(const NextPage &nextPage) {
    QVQueryItems all;
    std::uint64_t offset = 0;
    for (int pages = 0; pages < 10'000; ++pages) {
      const ConformancePage one = nextPage(offset);
      EXPECT_EQ(one.error, NSError());
      all.insert(all.end(), one.items.begin(), one.items.end());
      if (one.nextOffset == 0 || one.error) return all;
      EXPECT_GT(one.nextOffset, offset);
      offset = one.nextOffset;
    }
    ADD_FAILURE() << "the listing doesn't end";
    return all;
  }
  QVQueryItems list(std::optional<QVFileObjectID> folderID, std::int64_t sortOrder = 0,
                    std::uint64_t limit = 200) {
    return drain([&](std::uint64_t offset) { return page(folderID, sortOrder, offset, limit); });
  }
  QVQueryItems listAllFolders(std::int64_t sortOrder, std::uint64_t limit) {
    return drain([&](std::uint64_t offset) { return folderPage(sortOrder, offset, limit); });
  }

  std::uint64_t rank() {
    Once<std::uint64_t, NSError> answer("rank");
    daemon()->currentNotifRankWithReply(answer.completion());
    EXPECT_EQ(answer.value<1>(), NSError());
    return answer.value<0>();
  }

  void signOut() {
    Once<NSError> done("sign out");
    daemon()->signOut(done.completion());
    ASSERT_EQ(done.value<0>(), NSError());
  }
  std::optional<QVAccountDescription> signIn(const std::string &name) {
    Once<std::optional<QVAccountDescription>, NSError> done("sign in");
    daemon()->signIn(name, done.completion());
    EXPECT_EQ(done.value<1>(), NSError());
    return done.value<0>();
  }

  // The code of a Tessaly error; -1 for nil and for other domains.
  static std::int64_t tessalyCode(const NSError &error) {
    return error.domain() == QVTessalyErrorDomain ? error.code() : -1;
  }
  static std::vector<std::string> names(const QVQueryItems &items) {
    std::vector<std::string> list;
    for (const Item &one : items) list.push_back(one->fields().filename);
    return list;
  }
  static Item named(const QVQueryItems &items, const std::string &name) {
    for (const Item &one : items)
      if (one->fields().filename == name) return one;
    ADD_FAILURE() << "no item is called " << name;
    return nullptr;
  }
  static bool hasName(const QVQueryItems &items, const std::string &name) {
    const std::vector<std::string> all = names(items);
    return std::find(all.begin(), all.end(), name) != all.end();
  }

  std::unique_ptr<DaemonWorld> world_;
};

inline std::string ConformanceName(const testing::TestParamInfo<DaemonWorldMaker> &info) {
  return info.param.name;
}

}  // namespace droxa
