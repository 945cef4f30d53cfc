#include <gtest/gtest.h>
#include <string>

#include "fileproviderd/mount/NodeTable.h"

namespace droxa::testing {
namespace {

struct stat fileWith(ino_t inode, off_t size = 1, time_t modified = 1) {
  struct stat status {};
  status.st_dev = 1;
  status.st_ino = inode;
  status.st_mode = S_IFREG | 0600;
  status.st_size = size;
  status.st_mtim.tv_sec = modified;
  status.st_ctim.tv_sec = modified;
  return status;
}

struct stat folderWith(ino_t inode) {
  struct stat status = fileWith(inode);
  status.st_mode = S_IFDIR | 0700;
  return status;
}

TEST(NodeTable, aFileThatIsFoundAgainIsTheSameNode) {
  NodeTable table;
  const auto first = table.enter(kRootNode, "a", fileWith(10));
  const auto again = table.enter(kRootNode, "a", fileWith(10));
  EXPECT_TRUE(first.isNew);
  EXPECT_FALSE(again.isNew);
  EXPECT_EQ(first.node, again.node);
  EXPECT_EQ(first.number, 10U);
  EXPECT_EQ(table.find(kRootNode, "a"), first.node);
}

TEST(NodeTable, aFileThatWasMovedKeepsItsNode) {
  NodeTable table;
  const auto folder = table.enter(kRootNode, "f", folderWith(5));
  const auto file = table.enter(kRootNode, "a", fileWith(10));
  table.renamed(kRootNode, "a", folder.node, "b");
  EXPECT_EQ(table.find(kRootNode, "a"), 0U);
  EXPECT_EQ(table.find(folder.node, "b"), file.node);
  EXPECT_EQ(table.chain(file.node), (std::vector<NodeId>{kRootNode, folder.node, file.node}));
  // Behind the mount: it is found under another name.
  EXPECT_EQ(table.enter(kRootNode, "c", fileWith(10)).node, file.node);
  EXPECT_EQ(table.find(folder.node, "b"), 0U);
}

TEST(NodeTable, aDocumentThatGetsItsContentsKeepsNodeAndNumber) {
  NodeTable table;
  const auto before = table.enter(kRootNode, "a", fileWith(10, 300, 7));
  const auto after = table.enter(kRootNode, "a", fileWith(11, 300, 7));
  EXPECT_EQ(after.node, before.node);
  EXPECT_EQ(after.number, 10U);
  EXPECT_FALSE(after.hasChanged);
  // Another file that gets the inode isn't shown under the same number.
  EXPECT_NE(table.enter(kRootNode, "b", fileWith(10)).number, 10U);
}

TEST(NodeTable, aFileThatTookTheNameIsAnotherNode) {
  NodeTable table;
  const auto before = table.enter(kRootNode, "a", fileWith(10, 300, 7));
  const auto after = table.enter(kRootNode, "a", fileWith(11, 301, 8));
  EXPECT_NE(after.node, before.node);
  EXPECT_EQ(table.view(before.node)->parent, 0U) << "it has no name any more";
  EXPECT_TRUE(table.chain(before.node).empty());
}

TEST(NodeTable, whatSomebodyElseWroteIsSeenAndWhatWasWrittenHereIsNot) {
  NodeTable table;
  const auto file = table.enter(kRootNode, "a", fileWith(10, 1, 1));
  EXPECT_EQ(table.see(file.node, fileWith(10, 1, 1)), false);
  EXPECT_EQ(table.see(file.node, fileWith(10, 2, 2)), true);
  EXPECT_FALSE(table.mayKeepPages(file.node));
  EXPECT_TRUE(table.mayKeepPages(file.node)) << "they are renewed with an open that doesn't keep them";
  table.beginOwnChange(file.node);
  EXPECT_EQ(table.see(file.node, fileWith(10, 3, 3)), false);
  const struct stat now = fileWith(10, 4, 4);
  table.endOwnChange(file.node, &now);
  EXPECT_EQ(table.see(file.node, now), false);
  EXPECT_TRUE(table.mayKeepPages(file.node));
  EXPECT_EQ(table.see(file.node, fileWith(99, 4, 9)), std::nullopt) << "another file";
}

// An own change that made no difference doesn't hide that of somebody else.
TEST(NodeTable, whatIsSeenDuringAnOwnChangeIsSeenAgainAfterIt) {
  NodeTable table;
  const auto file = table.enter(kRootNode, "a", fileWith(10, 1, 1));
  table.beginOwnChange(file.node);
  EXPECT_EQ(table.see(file.node, fileWith(10, 7, 7)), false);
  table.endOwnChange(file.node, nullptr);
  EXPECT_EQ(table.see(file.node, fileWith(10, 7, 7)), true);
  EXPECT_FALSE(table.mayKeepPages(file.node));
}

TEST(NodeTable, anInodeThatIsUsedAgainIsAnotherNode) {
  NodeTable table;
  const auto file = table.enter(kRootNode, "a", fileWith(10));
  table.removed(kRootNode, "a", true);
  EXPECT_NE(table.enter(kRootNode, "b", fileWith(10)).node, file.node);
  const auto folder = table.enter(kRootNode, "b", folderWith(10));
  EXPECT_TRUE(folder.isNew) << "of another type";
}

TEST(NodeTable, anExchangeSwapsTheNames) {
  NodeTable table;
  const auto one = table.enter(kRootNode, "a", fileWith(10));
  const auto other = table.enter(kRootNode, "b", fileWith(11));
  table.exchanged(kRootNode, "a", kRootNode, "b");
  EXPECT_EQ(table.find(kRootNode, "a"), other.node);
  EXPECT_EQ(table.find(kRootNode, "b"), one.node);
}

TEST(NodeTable, aNodeLivesUntilItIsForgottenAsOftenAsItWasTold) {
  NodeTable table;
  const auto folder = table.enter(kRootNode, "f", folderWith(5));
  const auto file = table.enter(folder.node, "a", fileWith(10));
  table.enter(folder.node, "a", fileWith(10));
  EXPECT_TRUE(table.forget(folder.node, 1).empty()) << "something below it is known";
  table.forget(file.node, 1);
  EXPECT_TRUE(table.view(file.node).has_value());
  EXPECT_EQ(table.forget(file.node, 1), std::vector<NodeId>{folder.node});
  EXPECT_FALSE(table.view(file.node).has_value());
  EXPECT_FALSE(table.view(folder.node).has_value());
  EXPECT_EQ(table.size(), 1U);
  EXPECT_NE(table.enter(kRootNode, "f", folderWith(5)).node, folder.node) << "identifiers aren't used again";
}

TEST(NodeTable, manyNodesAreFoundAndForgotten) {
  NodeTable table;
  std::vector<NodeId> nodes;
  for (ino_t inode = 2; inode < 20'000; ++inode)
    nodes.push_back(table.enter(kRootNode, std::to_string(inode), fileWith(inode)).node);
  for (ino_t inode = 2; inode < 20'000; ++inode)
    ASSERT_EQ(table.find(kRootNode, std::to_string(inode)), nodes[inode - 2]);
  for (const NodeId node : nodes) table.forget(node, 1);
  EXPECT_EQ(table.size(), 1U);
  EXPECT_EQ(table.find(kRootNode, "77"), 0U);
}

}  // namespace
}  // namespace droxa::testing
