#include <gtest/gtest.h>

#include "tessaly/QVContainer.h"
#include "tessaly/QVQueryItem.h"
#include "tests/support/FakeDaemonConnection.h"

namespace droxa {

namespace {

const NSError kBroken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);

class QueryItem : public testing::Test {
 protected:
  FakeDaemonScope scope_;
  FakeDaemon &daemon_ = *scope_.daemon;
};

std::shared_ptr<const QVContainer> container(const char *containerID) {
  return QVContainer::allContainersByContainerID()[containerID];
}

}  // namespace

TEST_F(QueryItem, describesItselfByIdentifierNameAndSize) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = "d12";
  fields.filename = "letter.txt";
  fields.documentSize = 123;
  EXPECT_EQ(QVQueryItem(QVFileObjectID::documentID(12), fields).description(),
            "<d12 n:\"letter.txt\" s:123>");
  EXPECT_EQ(QVQueryItem(QVFileObjectID::documentID(12), fields, true).description(), "<d12 dead>");
}

TEST_F(QueryItem, theItemAtAURLIsAskedOfTheDaemon) {
  daemon_.addDocument("a.txt", 5);
  NSError error;
  const auto item = QVQueryItem::askDaemonQueryItemForURL(daemon_.url("a.txt"), false, &error);
  ASSERT_TRUE(item);
  EXPECT_EQ(item->fields(), daemon_.item("a.txt")->fields());
  EXPECT_FALSE(error);
  EXPECT_EQ(daemon_.calls().back(), "getQueryItemForURL(" + daemon_.url("a.txt").path() + ", fakeFSEvent 0)");
}

TEST_F(QueryItem, aFakedEventIsPassedOn) {
  daemon_.addDocument("a.txt");
  QVQueryItem::askDaemonQueryItemForURL(daemon_.url("a.txt"), true, nullptr);
  EXPECT_EQ(daemon_.calls().back(), "getQueryItemForURL(" + daemon_.url("a.txt").path() + ", fakeFSEvent 1)");
}

TEST_F(QueryItem, aMissingItemIsNoSuchItem) {
  NSError error;
  const NSURL missing = NSURL::fileURLWithPath(daemon_.url("").path() + "/missing");
  EXPECT_FALSE(QVQueryItem::askDaemonQueryItemForURL(missing, false, &error));
  EXPECT_EQ(error, qvc_errorNoSuchItem(missing.path()));
  EXPECT_FALSE(QVQueryItem::askDaemonQueryItemForURL(missing, false, nullptr));
}

TEST_F(QueryItem, aNilURLIsNoSuchItemAndNotAsked) {
  NSError error;
  EXPECT_FALSE(QVQueryItem::askDaemonQueryItemForURL(NSURL(), false, &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorNoSuchItem));
  EXPECT_TRUE(daemon_.calls().empty());
}

TEST_F(QueryItem, aBrokenConnectionGivesItsError) {
  daemon_.replies().failNextInTransport("getQueryItemForURL", kBroken);
  NSError error;
  EXPECT_FALSE(QVQueryItem::askDaemonQueryItemForURL(daemon_.url(""), false, &error));
  EXPECT_EQ(error, kBroken);
}

TEST_F(QueryItem, aContainersItemIsAskedOfTheDaemon) {
  const auto desktop = container(QVUbiquitousDesktopContainerID);
  const auto item = QVQueryItem::containerItemForContainer(desktop, true);
  ASSERT_TRUE(item);
  EXPECT_EQ(item->fields().filename, "Desktop");
  EXPECT_EQ(daemon_.calls().back(), "getContainerItem(com.quorva.Tessaly.desktop, forceScan 1)");
}

TEST_F(QueryItem, noContainerHasNoItem) {
  EXPECT_FALSE(QVQueryItem::containerItemForContainer(nullptr, false));
}

TEST_F(QueryItem, anUnknownContainerHasNoItem) {
  const auto unknown =
      std::make_shared<const QVContainer>(QVContainerDescription{"org.example.Gone", {}, {}, {}});
  EXPECT_FALSE(QVQueryItem::containerItemForContainer(unknown, false));
}

TEST_F(QueryItem, aContainerHasNoItemWhileTheDaemonIsAway) {
  const auto desktop = container(QVUbiquitousDesktopContainerID);
  scope_.connection->setUnreachable(kBroken);
  EXPECT_FALSE(QVQueryItem::containerItemForContainer(desktop, false));
}

}  // namespace droxa
