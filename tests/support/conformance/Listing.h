#pragma once

#include "tests/support/conformance/DaemonConformanceFixture.h"

// How folders are listed.

namespace droxa {

using Strings = std::vector<std::string>;

TEST_P(DaemonConformance, aListingGoesPageByPage) {
  folder("f");
  for (const char *name : {"a", "b", "c", "d", "e"}) file(std::string("f/") + name);
  settle();
  const QVFileObjectID f = identifier("f");
  const ConformancePage first = page(f, 0, 0, 2);
  EXPECT_EQ(names(first.items), Strings({"a", "b"}));
  EXPECT_EQ(first.nextOffset, 2U);
  const ConformancePage second = page(f, 0, 2, 2);
  EXPECT_EQ(names(second.items), Strings({"c", "d"}));
  EXPECT_EQ(second.nextOffset, 4U);
  const ConformancePage last = page(f, 0, 4, 2);
  EXPECT_EQ(names(last.items), Strings({"e"}));
  EXPECT_EQ(last.nextOffset, 0U);
}

TEST_P(DaemonConformance, aPageThatEndsWithTheFolderIsTheLast) {
  folder("f");
  for (const char *name : {"a", "b", "c", "d"}) file(std::string("f/") + name);
  settle();
  EXPECT_EQ(page(identifier("f"), 0, 0, 4).nextOffset, 0U);
  EXPECT_EQ(page(identifier("f"), 0, 2, 2).nextOffset, 0U);
}

TEST_P(DaemonConformance, aPageMayBeginAnywhereAndBeAskedForAgain) {
  folder("f");
  for (const char *name : {"a", "b", "c", "d"}) file(std::string("f/") + name);
  settle();
  const QVFileObjectID f = identifier("f");
  EXPECT_EQ(names(page(f, 0, 3, 10).items), Strings({"d"}));
  EXPECT_EQ(names(page(f, 0, 1, 2).items), Strings({"b", "c"}));
  EXPECT_EQ(names(page(f, 0, 1, 2).items), Strings({"b", "c"}));
  EXPECT_EQ(names(page(f, 1, 3, 10).items).size(), 1U);
}

TEST_P(DaemonConformance, anOffsetBeyondTheEndGivesNothing) {
  folder("f");
  file("f/a");
  settle();
  for (const std::uint64_t offset : {std::uint64_t{1}, std::uint64_t{100}, UINT64_MAX}) {
    const ConformancePage beyond = page(identifier("f"), 0, offset, 10);
    EXPECT_EQ(beyond.error, NSError());
    EXPECT_TRUE(beyond.items.empty());
    EXPECT_EQ(beyond.nextOffset, 0U);
  }
}

TEST_P(DaemonConformance, anEmptyFolderHasOneEmptyPage) {
  folder("f");
  settle();
  const ConformancePage only = page(identifier("f"), 0, 0, 200);
  EXPECT_EQ(only.error, NSError());
  EXPECT_TRUE(only.items.empty());
  EXPECT_EQ(only.nextOffset, 0U);
}

TEST_P(DaemonConformance, aLargeFolderIsListedWithoutGapsOrRepeats) {
  folder("f");
  std::set<std::string> made;
  for (int i = 0; i < 450; ++i) {
    const std::string name = "file " + std::to_string(i);
    file("f/" + name);
    made.insert(name);
  }
  settle();
  for (const std::int64_t sortOrder : {0, 1}) {
    const Strings listed = names(list(identifier("f"), sortOrder));
    EXPECT_EQ(listed.size(), made.size());
    EXPECT_EQ(std::set<std::string>(listed.begin(), listed.end()), made);
  }
}

TEST_P(DaemonConformance, byNameIsTheByteOrderOfTheNames) {
  folder("f");
  const Strings sorted = {" ", ".hidden", "A", "B", "Z", "a", "a\nb", "a b", "ab", "b", "\xc3\xa9", "\xff"};
  for (auto name = sorted.rbegin(); name != sorted.rend(); ++name) file("f/" + *name);
  settle();
  Strings expected = sorted;
  std::sort(expected.begin(), expected.end());
  EXPECT_EQ(names(list(identifier("f"), 0)), expected);
  EXPECT_EQ(names(list(identifier("f"), 0, 3)), expected);
}

TEST_P(DaemonConformance, byDateIsNewestFirstThenByName) {
  folder("f");
  for (const char *name : {"old", "new", "b", "a"}) file(std::string("f/") + name);
  world_->changeFile(at("f/old"), 2, 1'000);
  world_->changeFile(at("f/new"), 2, 3'000);
  world_->changeFile(at("f/b"), 2, 2'000);
  world_->changeFile(at("f/a"), 2, 2'000);
  settle();
  EXPECT_EQ(names(list(identifier("f"), 1)), Strings({"new", "a", "b", "old"}));
  EXPECT_EQ(names(list(identifier("f"), 1, 1)), Strings({"new", "a", "b", "old"}));
}

TEST_P(DaemonConformance, otherSortOrdersReadAsByName) {
  folder("f");
  file("f/b");
  file("f/a");
  world_->changeFile(at("f/b"), 2, 4'000'000'000);
  settle();
  for (const std::int64_t sortOrder :
       {std::int64_t{2}, std::int64_t{257}, std::int64_t{-1}, INT64_MAX, INT64_MIN})
    EXPECT_EQ(names(list(identifier("f"), sortOrder)), Strings({"a", "b"})) << sortOrder;
}

TEST_P(DaemonConformance, aPageHasOneToAThousandItems) {
  folder("f");
  file("f/a");
  settle();
  const QVFileObjectID f = identifier("f");
  for (const std::uint64_t limit : {1U, 200U, 1000U})
    EXPECT_EQ(page(f, 0, 0, limit).error, NSError()) << limit;
  for (const std::uint64_t limit : {std::uint64_t{0}, std::uint64_t{1001}, UINT64_MAX}) {
    EXPECT_EQ(tessalyCode(page(f, 0, 0, limit).error), QVErrorInvalidArgument) << limit;
    EXPECT_EQ(tessalyCode(folderPage(0, 0, limit).error), QVErrorInvalidArgument) << limit;
  }
}

TEST_P(DaemonConformance, aFolderThatDoesNotExistIsNoSuchItem) {
  file("document");
  folder("gone");
  settle();
  const QVFileObjectID gone = identifier("gone");
  remove("gone");
  settle();
  EXPECT_EQ(tessalyCode(page(QVFileObjectID::folderOrAliasID(987'654'321), 0, 0, 10).error),
            QVErrorNoSuchItem);
  EXPECT_EQ(tessalyCode(page(gone, 0, 0, 10).error), QVErrorNoSuchItem);
  EXPECT_EQ(tessalyCode(page(identifier("document"), 0, 0, 10).error), QVErrorNoSuchItem);
}

TEST_P(DaemonConformance, noFolderIsTheRoot) {
  file("a.txt");
  settle();
  const QVQueryItems root = list(std::nullopt);
  EXPECT_EQ(named(root, "a.txt")->fields().parentItemIdentifier, NSFileProviderRootContainerItemIdentifier);
  EXPECT_EQ(names(list(std::nullopt, 0, 1)), names(root));
}

TEST_P(DaemonConformance, theRootListsTheOtherContainersButNotTheTrash) {
  settle();
  const QVQueryItems root = list(std::nullopt);
  EXPECT_EQ(names(root), Strings({"Desktop", "Documents", "Sketches"}));
  for (const Item &container : root) {
    EXPECT_EQ(container->fields().kind, NSFileProviderItemKind::folder);
    EXPECT_TRUE(container->fileObjectID().isFolderOrAliasID());
    EXPECT_EQ(container->fields().parentItemIdentifier, NSFileProviderRootContainerItemIdentifier);
  }
}

TEST_P(DaemonConformance, aContainerWhoseNameIsTakenIsListedWithItsIdentifier) {
  file("Desktop");
  settle();
  const QVQueryItems root = list(std::nullopt);
  EXPECT_EQ(named(root, "Desktop")->fields().kind, NSFileProviderItemKind::document);
  EXPECT_EQ(named(root, "Desktop (com.quorva.Tessaly.desktop)")->fields().kind,
            NSFileProviderItemKind::folder);
}

TEST_P(DaemonConformance, aContainerIsListedAsAFolder) {
  world_->makeFile(NSURL::fileURLWithPath(world_->documents(kConformanceContainer).path() + "/sketch"), 3);
  settle();
  const Item container = named(list(std::nullopt), "Sketches");
  const QVQueryItems inside = list(container->fileObjectID());
  EXPECT_EQ(names(inside), Strings({"sketch"}));
  EXPECT_EQ(inside[0]->fields().parentItemIdentifier, container->itemIdentifier());
}

TEST_P(DaemonConformance, whatIsInTheTrashIsTrashed) {
  const NSURL trash = world_->documents(QVUbiquitousTrashContainerID);
  world_->makeFile(NSURL::fileURLWithPath(trash.path() + "/old"), 3);
  settle();
  const QVQueryItems inside = list(itemAtURL(trash)->fileObjectID());
  EXPECT_EQ(names(inside), Strings({"old"}));
  EXPECT_TRUE(inside[0]->fields().isTrashed);
}

TEST_P(DaemonConformance, allFoldersAreListedOnceEach) {
  for (const char *path : {"f", "f/g", "f/g/h", "e"}) folder(path);
  file("f/document");
  settle();
  for (const std::uint64_t limit : {2U, 200U}) {
    const QVQueryItems folders = listAllFolders(0, limit);
    std::map<std::string, int> seen;
    for (const Item &one : folders) {
      EXPECT_EQ(one->fields().kind, NSFileProviderItemKind::folder);
      ++seen[one->itemIdentifier()];
    }
    for (const char *path : {"f", "f/g", "f/g/h", "e"})
      EXPECT_EQ(seen[identifier(path).asString()], 1) << path;
    for (const auto &entry : seen) EXPECT_EQ(entry.second, 1) << entry.first;
    for (const char *container : {"Desktop", "Documents", "Sketches"})
      EXPECT_TRUE(hasName(folders, container));
  }
  EXPECT_EQ(listAllFolders(1, 2).size(), listAllFolders(0, 200).size());
}

TEST_P(DaemonConformance, anItemTellsWhatItIs) {
  folder("f");
  file("f/document", 42);
  world_->makeAlias(at("f/alias"), at("f/document"));
  world_->makeSymbolicLink(at("f/link"), "/nowhere/outside");
  settle();
  const QVQueryItems items = list(identifier("f"));
  const Item document = named(items, "document");
  const Item alias = named(items, "alias");
  const Item link = named(items, "link");
  EXPECT_EQ(document->fields().kind, NSFileProviderItemKind::document);
  EXPECT_TRUE(document->fileObjectID().isDocumentID());
  EXPECT_EQ(document->fields().documentSize, 42U);
  EXPECT_FALSE(document->isDead());
  EXPECT_EQ(alias->fields().kind, NSFileProviderItemKind::alias);
  EXPECT_TRUE(alias->fileObjectID().isFolderOrAliasID());
  EXPECT_EQ(link->fields().kind, NSFileProviderItemKind::symbolicLink);
  EXPECT_TRUE(link->fileObjectID().isDocumentID());
  EXPECT_EQ(link->fields().typeIdentifier, "inode/symlink");
  const Item f = item("f");
  EXPECT_EQ(f->fields().kind, NSFileProviderItemKind::folder);
  EXPECT_TRUE(f->fileObjectID().isFolderOrAliasID());
  EXPECT_EQ(f->fields().typeIdentifier, "inode/directory");
  EXPECT_EQ(f->fields().documentSize, 0U);
  for (const Item &one : items) {
    EXPECT_EQ(one->itemIdentifier(), one->fileObjectID().asString());
    EXPECT_EQ(one->fields().parentItemIdentifier, f->itemIdentifier());
  }
}

TEST_P(DaemonConformance, whatIsKeptLocalIsListedAsExcluded) {
  folder("cache.nosync");
  file("cache.nosync/inside");
  file("draft.tmp");
  file("plain");
  settle();
  const QVQueryItems root = list(std::nullopt);
  EXPECT_TRUE(named(root, "draft.tmp")->fields().isExcludedFromSync);
  EXPECT_TRUE(named(root, "cache.nosync")->fields().isExcludedFromSync);
  EXPECT_TRUE(list(identifier("cache.nosync"))[0]->fields().isExcludedFromSync);
  EXPECT_FALSE(named(root, "plain")->fields().isExcludedFromSync);
}

TEST_P(DaemonConformance, anItemKeepsItsIdentifierThroughRenameAndMove) {
  folder("f");
  folder("g");
  file("f/a");
  settle();
  const QVFileObjectID a = identifier("f/a");
  const QVFileObjectID f = identifier("f");
  rename("f/a", "f/b");
  settle();
  EXPECT_EQ(identifier("f/b"), a);
  rename("f/b", "g/b");
  settle();
  EXPECT_EQ(identifier("g/b"), a);
  EXPECT_EQ(item("g/b")->fields().parentItemIdentifier, identifier("g").asString());
  rename("f", "g/f");
  settle();
  EXPECT_EQ(identifier("g/f"), f);
}

TEST_P(DaemonConformance, aNumberIsNeverUsedAgain) {
  file("a");
  settle();
  const QVFileObjectID before = identifier("a");
  remove("a");
  settle();
  folder("other");
  file("a");
  settle();
  EXPECT_NE(identifier("a").number(), before.number());
  EXPECT_NE(identifier("other").number(), before.number());
}

}  // namespace droxa
