#include <gtest/gtest.h>

#include "tessaly/QVErrors.h"
#include "tessaly/QVMoveCapability.h"
#include "tests/support/FakeDaemonConnection.h"

namespace droxa {

namespace {

void expectAllowed(std::uint64_t capability) {
  EXPECT_NE(capability & QVMoveAllowed, 0U) << capability;
  EXPECT_EQ(capability & QVMoveNeedsContents, 0U) << capability;
}
void expectNeedsContents(std::uint64_t capability) {
  EXPECT_NE(capability & QVMoveAllowed, 0U) << capability;
  EXPECT_NE(capability & QVMoveNeedsContents, 0U) << capability;
}
void expectRefused(std::uint64_t capability) {
  EXPECT_NE(capability, 0U);
  EXPECT_EQ(capability & (QVMoveAllowed | QVMoveNeedsContents), 0U) << capability;
}

}  // namespace

TEST(MoveCapability, whatNeedsContentsIsAllowed) {
  EXPECT_EQ(QVMoveNeedsContents & ~QVMoveAllowed, 0U);
}

TEST(MoveCapability, aLocalItemMovesAsItIs) {
  EXPECT_EQ(QVCapabilityOfMove({}), QVMoveWithinContainer);
  expectAllowed(QVCapabilityOfMove({}));
  expectAllowed(QVCapabilityOfMove({.leavesContainer = true}));
  expectAllowed(QVCapabilityOfMove({.leavesDrive = true}));
  expectAllowed(QVCapabilityOfMove({.leavesContainer = true, .leavesShare = true}));
  expectAllowed(QVCapabilityOfMove({.isIntoLocalPlace = true}));
}

TEST(MoveCapability, aDatalessItemStaysWithoutContentsInItsContainerAndInTheTrash) {
  expectAllowed(QVCapabilityOfMove({.isDataless = true}));
  expectAllowed(QVCapabilityOfMove({.isOfFolder = true, .isDataless = true}));
  expectAllowed(QVCapabilityOfMove({.isDataless = true, .leavesContainer = true, .isIntoTrash = true}));
}

TEST(MoveCapability, aDatalessItemNeedsItsContentsToGoWhereTheCloudDoesntFollow) {
  for (const bool isFolder : {false, true}) {
    expectNeedsContents(
        QVCapabilityOfMove({.isOfFolder = isFolder, .isDataless = true, .leavesDrive = true}));
    expectNeedsContents(
        QVCapabilityOfMove({.isOfFolder = isFolder, .isDataless = true, .leavesContainer = true}));
    expectNeedsContents(
        QVCapabilityOfMove({.isOfFolder = isFolder, .isDataless = true, .isIntoLocalPlace = true}));
    expectNeedsContents(
        QVCapabilityOfMove({.isOfFolder = isFolder, .isDataless = true, .leavesShare = true}));
  }
}

TEST(MoveCapability, eachBitThatNeedsContentsHasItsMove) {
  std::uint64_t seen = 0;
  for (unsigned bits = 0; bits < 32; ++bits)
    seen |= QVCapabilityOfMove({.isOfFolder = (bits & 1) != 0,
                                .isDataless = true,
                                .leavesDrive = (bits & 2) != 0,
                                .leavesContainer = (bits & 4) != 0,
                                .leavesShare = (bits & 8) != 0,
                                .isIntoLocalPlace = (bits & 16) != 0});
  EXPECT_EQ(seen & QVMoveNeedsContents, QVMoveNeedsContents);
}

TEST(MoveCapability, whatIsRefusedIsNeitherAllowedNorWorthADownload) {
  for (const bool isDataless : {false, true}) {
    expectRefused(QVCapabilityOfMove({.isIntoItself = true, .isDataless = isDataless}));
    expectRefused(QVCapabilityOfMove({.isOfContainer = true, .isDataless = isDataless, .leavesDrive = true}));
    expectRefused(
        QVCapabilityOfMove({.isToReadOnlyPlace = true, .isDataless = isDataless, .leavesContainer = true}));
  }
}

TEST(MoveCapability, anAliasMovesWithoutContents) {
  expectAllowed(QVCapabilityOfMove({.isOfAlias = true, .isDataless = true, .leavesDrive = true}));
}

TEST(MoveCapability, isAskedOfTheDaemon) {
  const FakeDaemonScope fake;
  fake.daemon->addDatalessDocument("a");
  const NSURL away = NSURL::fileURLWithPath("/tmp/a");
  NSError error;
  EXPECT_EQ(qv_capabilityToMoveToURL(fake.daemon->url("a"), away, &error), QVMoveDatalessOutOfDrive);
  EXPECT_EQ(error, NSError());
  EXPECT_EQ(fake.daemon->calls()[0], "getMoveCapability(" + fake.daemon->url("a").path() + ", /tmp/a)");
}

TEST(MoveCapability, aQuestionThatFailsIsNoCapabilityAndItsError) {
  const FakeDaemonScope fake;
  const NSURL missing = fake.daemon->url("").URLByAppendingPathComponent("missing");
  NSError error;
  EXPECT_EQ(qv_capabilityToMoveToURL(missing, missing, &error), 0U);
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorNoSuchItem));
  EXPECT_EQ(qv_capabilityToMoveToURL(missing, missing, nullptr), 0U);
  fake.daemon->replies().failNextInTransport("getMoveCapability", NSError(NSCocoaErrorDomain, 4097));
  EXPECT_EQ(qv_capabilityToMoveToURL(missing, missing, &error), 0U);
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, 4097));
}

}  // namespace droxa
