#pragma once

#include "tests/support/conformance/DaemonConformanceFixture.h"

// Identifiers, URLs, containers.

namespace droxa {

TEST_P(DaemonConformance, anIdentifierHasTheURLOfItsItem) {
  folder("f");
  file("f/a");
  world_->makeAlias(at("alias"), at("f/a"));
  settle();
  for (const char *path : {"f", "f/a", "alias"}) {
    Once<NSURL, NSError> byString("URL for identifier");
    daemon()->getURLForItemIdentifier(identifier(path).asString(), byString.completion());
    EXPECT_EQ(byString.value<0>(), at(path));
    EXPECT_EQ(byString.value<1>(), NSError());
    Once<NSURL, NSError> byID("URL for file object");
    daemon()->getURLForFileObjectID(identifier(path), byID.completion());
    EXPECT_EQ(byID.value<0>(), at(path));
    EXPECT_EQ(byID.value<1>(), NSError());
  }
}

TEST_P(DaemonConformance, anIdentifierFollowsItsItem) {
  folder("f");
  file("a");
  settle();
  const QVFileObjectID a = identifier("a");
  rename("a", "f/b");
  settle();
  Once<NSURL, NSError> url("URL for file object");
  daemon()->getURLForFileObjectID(a, url.completion());
  EXPECT_EQ(url.value<0>(), at("f/b"));
}

TEST_P(DaemonConformance, anIdentifierWithoutAnItemIsNoSuchItem) {
  file("a");
  settle();
  const QVFileObjectID a = identifier("a");
  const QVFileObjectID otherKind = QVFileObjectID::folderOrAliasID(a.number());
  remove("a");
  settle();
  for (const QVFileObjectID &missing : {a, otherKind, QVFileObjectID::documentID(UINT64_MAX)}) {
    Once<NSURL, NSError> byString("URL for identifier");
    daemon()->getURLForItemIdentifier(missing.asString(), byString.completion());
    EXPECT_FALSE(byString.value<0>());
    EXPECT_EQ(tessalyCode(byString.value<1>()), QVErrorNoSuchItem);
    Once<NSURL, NSError> byID("URL for file object");
    daemon()->getURLForFileObjectID(missing, byID.completion());
    EXPECT_EQ(tessalyCode(byID.value<1>()), QVErrorNoSuchItem);
  }
}

TEST_P(DaemonConformance, anIdentifierOfTheOtherKindIsNoSuchItem) {
  file("a");
  settle();
  Once<NSURL, NSError> url("URL for file object");
  daemon()->getURLForFileObjectID(QVFileObjectID::folderOrAliasID(identifier("a").number()),
                                  url.completion());
  EXPECT_EQ(tessalyCode(url.value<1>()), QVErrorNoSuchItem);
}

TEST_P(DaemonConformance, whatIsNoIdentifierIsAnInvalidArgument) {
  settle();
  for (const char *text :
       {"", "d", "i0", "d01", "x12", "12", "d-1", "d1 ", "d99999999999999999999", "../d1"}) {
    Once<NSURL, NSError> url("URL for identifier");
    daemon()->getURLForItemIdentifier(text, url.completion());
    EXPECT_FALSE(url.value<0>());
    EXPECT_EQ(tessalyCode(url.value<1>()), QVErrorInvalidArgument) << text;
  }
}

TEST_P(DaemonConformance, aURLHasTheItemThatIsThere) {
  folder("f");
  file("f/a", 12);
  settle();
  const Item a = item("f/a");
  EXPECT_EQ(a->fields().filename, "a");
  EXPECT_EQ(a->fields().documentSize, 12U);
  EXPECT_EQ(a->fields(), named(list(identifier("f")), "a")->fields());
}

TEST_P(DaemonConformance, aURLWithoutAnItemIsNoSuchItem) {
  file("a");
  settle();
  EXPECT_EQ(codeForURL(at("missing")), QVErrorNoSuchItem);
  EXPECT_EQ(codeForURL(at("a/below a file")), QVErrorNoSuchItem);
  EXPECT_EQ(codeForURL(NSURL::fileURLWithPath("/")), QVErrorNoSuchItem);
  EXPECT_EQ(codeForURL(NSURL::fileURLWithPath("/etc/hostname")), QVErrorNoSuchItem);
  EXPECT_EQ(codeForURL(NSURL::fileURLWithPath(at("").path() + "/../../../outside")), QVErrorNoSuchItem);
}

TEST_P(DaemonConformance, aFakedEventShowsANewItemAtOnce) {
  settle();
  file("new");
  Once<Item, NSError> found("new item");
  daemon()->getQueryItemForURL(at("new"), true, found.completion());
  EXPECT_EQ(found.value<1>(), NSError());
  ASSERT_TRUE(found.value<0>());
  EXPECT_EQ(found.value<0>()->fields().filename, "new");
}

TEST_P(DaemonConformance, whatIsNotedOnAnItemIsShownWithANewRank) {
  file("a");
  folder("f");
  world_->makeAlias(at("alias"), at("a"));
  settle();
  for (const char *path : {"a", "f", "alias"}) {
    const std::uint64_t before = rank();
    Once<NSError> done(std::string("metadata of ") + path);
    daemon()->setMetadataAtURL(at(path), {{{"Red"}}, 1'700'000'000'000'000'001, 7}, done.completion());
    ASSERT_EQ(done.value<0>(), NSError()) << path;
    const Item noted = item(path);
    EXPECT_EQ(noted->fields().lastUsedDate, NSDate::dateWithNanosecondsSince1970(1'700'000'000'000'000'001));
    EXPECT_EQ(noted->fields().favoriteRank, 7U);
    EXPECT_EQ(noted->fields().tagData, QVTagDataOfNames({"Red"}));
    EXPECT_GT(noted->fields().changeRank, before);
  }
  Once<NSError> rankAlone("the rank alone");
  daemon()->setMetadataAtURL(at("alias"), {{}, {}, 0}, rankAlone.completion());
  ASSERT_EQ(rankAlone.value<0>(), NSError());
  EXPECT_EQ(item("alias")->fields().favoriteRank, 0U);
  EXPECT_TRUE(item("alias")->fields().lastUsedDate);
  EXPECT_EQ(item("a")->fields().favoriteRank, 7U) << "an alias's own was set on its target";
}

TEST_P(DaemonConformance, whatCantBeNotedIsRefused) {
  file("a");
  settle();
  Once<NSError> comma("a tag with a comma");
  daemon()->setMetadataAtURL(at("a"), {{{"a,b"}}, {}, 7}, comma.completion());
  EXPECT_EQ(tessalyCode(comma.value<0>()), QVErrorInvalidArgument);
  EXPECT_EQ(item("a")->fields().favoriteRank, 0U);
  for (const NSURL &url : {at("missing"), NSURL::fileURLWithPath("/etc/hostname"), NSURL()}) {
    Once<NSError> missing("metadata of nothing");
    daemon()->setMetadataAtURL(url, {{{"Red"}}, {}, {}}, missing.completion());
    EXPECT_EQ(tessalyCode(missing.value<0>()), QVErrorNoSuchItem) << url.path();
  }
}

TEST_P(DaemonConformance, theContainersAreTold) {
  settle();
  Once<std::vector<QVContainerDescription>, NSError> answer("containers");
  daemon()->getContainers(answer.completion());
  ASSERT_EQ(answer.value<1>(), NSError());
  std::map<std::string, QVContainerDescription> containers;
  for (const QVContainerDescription &one : answer.value<0>()) containers[one.containerID] = one;
  EXPECT_EQ(containers.size(), 5U);
  for (const char *containerID :
       {QVUbiquitousDefaultContainerID, QVUbiquitousDocumentsContainerID, QVUbiquitousDesktopContainerID,
        QVUbiquitousTrashContainerID, kConformanceContainer}) {
    const QVContainerDescription &one = containers[containerID];
    EXPECT_EQ(one.documentsURL, world_->documents(containerID)) << containerID;
    EXPECT_EQ(one.url, one.documentsURL.URLByDeletingLastPathComponent());
    EXPECT_EQ(one.documentsID.has_value(), containerID != std::string(QVUbiquitousDefaultContainerID));
    if (one.documentsID) {
      EXPECT_EQ(itemAtURL(one.documentsURL)->fileObjectID(), *one.documentsID);
    }
  }
}

TEST_P(DaemonConformance, aContainersItemIsTheOneThatTheRootLists) {
  settle();
  const QVQueryItems root = list(std::nullopt);
  for (const char *containerID :
       {QVUbiquitousDocumentsContainerID, QVUbiquitousDesktopContainerID, kConformanceContainer}) {
    Once<Item, NSError> answer("item of a container");
    daemon()->getContainerItem(containerID, true, answer.completion());
    ASSERT_TRUE(answer.value<0>()) << containerID;
    const Item container = answer.value<0>();
    EXPECT_EQ(container->fields(), named(root, container->fields().filename)->fields());
  }
}

TEST_P(DaemonConformance, theTrashAndTheRootHaveContainerItemsToo) {
  settle();
  for (const char *containerID : {QVUbiquitousDefaultContainerID, QVUbiquitousTrashContainerID}) {
    Once<Item, NSError> answer("item of a container");
    daemon()->getContainerItem(containerID, false, answer.completion());
    ASSERT_TRUE(answer.value<0>()) << containerID;
    EXPECT_EQ(answer.value<0>()->fields().kind, NSFileProviderItemKind::folder);
    EXPECT_EQ(answer.value<0>()->fields(), itemAtURL(world_->documents(containerID))->fields());
  }
}

TEST_P(DaemonConformance, anUnknownContainerIsNoSuchItem) {
  settle();
  for (const char *containerID : {"org.example.Nothing", "", "..", "a/b"}) {
    Once<Item, NSError> answer("item of a container");
    daemon()->getContainerItem(containerID, false, answer.completion());
    EXPECT_FALSE(answer.value<0>());
    EXPECT_EQ(tessalyCode(answer.value<1>()), QVErrorNoSuchItem) << containerID;
  }
}

}  // namespace droxa
