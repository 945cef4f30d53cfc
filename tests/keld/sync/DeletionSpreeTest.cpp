#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

constexpr int kDocuments = 40;

class DeletionSpree : public FaultyDrive {
 protected:
  explicit DeletionSpree(KeldOptions options = {}) : FaultyDrive(std::move(options)) {}

  void fill() {
    device.keld.folder("f/g");
    for (int index = 0; index < kDocuments; ++index)
      device.keld.write("f/g/" + std::to_string(index), "contents " + std::to_string(index));
    std::filesystem::create_symlink("g/1", device.keld.at("f/link"));
    device.keld.write("kept", "k");
    const NSError error = device.waitForUploads();
    ASSERT_FALSE(error) << error.description();
    ASSERT_EQ(hand.all().size(), kEverything);
  }
  void confirm(bool carryOut) {
    Once<NSError> answer("answer");
    device.keld.session()->confirmDeletions(carryOut, answer.completion());
    EXPECT_FALSE(answer.value<0>());
  }
  void allow(const std::string &path) {
    Once<NSError> answer("word for " + path);
    device.keld.session()->allowDeletionAtURL(device.url(path), answer.completion());
    EXPECT_FALSE(answer.value<0>());
  }
  bool holds(std::uint64_t deletions) {
    return eventually([&] { return device.transfers().heldDeletions == deletions; });
  }

  static constexpr std::size_t kEverything = kDocuments + 4;  // two folders, a link and what is kept
};

TEST_F(DeletionSpree, mostOfTheDriveIsNotDeletedUnasked) {
  fill();
  device.keld.remove("f");
  ASSERT_TRUE(holds(kEverything - 1)) << device.transfers().heldDeletions;
  EXPECT_EQ(hand.all().size(), kEverything);
  EXPECT_TRUE(device.waitForUploads().is(QVTessalyErrorDomain, QVErrorUnsentChanges));
}

TEST_F(DeletionSpree, whatWasMeantIsCarriedOut) {
  fill();
  device.keld.remove("f");
  ASSERT_TRUE(holds(kEverything - 1));
  confirm(true);
  EXPECT_TRUE(eventually([&] { return hand.paths() == std::vector<std::string>{"kept"}; }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(device.transfers().heldDeletions, 0U);
}

TEST_F(DeletionSpree, whatWasNotMeantComesBackWithFoldersAndLinks) {
  fill();
  device.keld.remove("f");
  ASSERT_TRUE(holds(kEverything - 1));
  confirm(false);
  ASSERT_TRUE(device.knowsSoon("f/g/" + std::to_string(kDocuments - 1)));
  for (int index = 0; index < kDocuments; ++index)
    ASSERT_TRUE(device.knowsSoon("f/g/" + std::to_string(index))) << index;
  EXPECT_TRUE(device.isDataless("f/g/1"));
  EXPECT_EQ(device.contents("f/g/1"), "contents 1");
  ASSERT_TRUE(device.knowsSoon("f/link"));
  EXPECT_EQ(std::filesystem::read_symlink(device.keld.at("f/link")), "g/1");
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.all().size(), kEverything);
  EXPECT_EQ(device.transfers().heldDeletions, 0U);
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(DeletionSpree, whatAPersonAskedForIsNoSpree) {
  fill();
  allow("f");
  device.keld.remove("f");
  EXPECT_TRUE(eventually([&] { return hand.paths() == std::vector<std::string>{"kept"}; }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(device.transfers().heldDeletions, 0U);
}

TEST_F(DeletionSpree, whatAPersonAskedForBeforeARestartIsNoSpree) {
  fill();
  allow("f");
  device.keld.stop();
  device.keld.remove("f");
  device.keld.start();
  EXPECT_TRUE(eventually([&] { return hand.paths() == std::vector<std::string>{"kept"}; }));
  EXPECT_EQ(device.transfers().heldDeletions, 0U);
}

TEST_F(DeletionSpree, whatAPersonAskedForGoesWhileOthersAreHeld) {
  fill();
  device.keld.remove("f");
  ASSERT_TRUE(holds(kEverything - 1));
  allow("kept");
  device.keld.remove("kept");
  EXPECT_TRUE(leavesCloudSoon("kept"));
  EXPECT_TRUE(holds(kEverything - 1));
  EXPECT_EQ(hand.all().size(), kEverything - 1);
}

TEST_F(DeletionSpree, theWordForOneIsNoneForTheOthers) {
  fill();
  allow("f/g/1");
  device.keld.remove("f");
  EXPECT_TRUE(leavesCloudSoon("f/g/1"));
  EXPECT_TRUE(holds(kEverything - 2));
  EXPECT_EQ(hand.all().size(), kEverything - 1);
}

// Nothing is deleted in time here.
class LateDeletion : public DeletionSpree {
 protected:
  LateDeletion() : DeletionSpree(options()) {}
  static KeldOptions options() {
    KeldOptions options;
    options.sync.deletionGuard.announced = std::chrono::milliseconds(0);
    return options;
  }
};

TEST_F(LateDeletion, whatWasAskedForLongAgoIsASpreeLikeAnyOther) {
  fill();
  allow("f");
  device.keld.remove("f");
  EXPECT_TRUE(holds(kEverything - 1));
  EXPECT_EQ(hand.all().size(), kEverything);
  confirm(true);
  EXPECT_TRUE(eventually([&] { return hand.paths() == std::vector<std::string>{"kept"}; }));
}

TEST_F(DeletionSpree, nothingThereIsNothingToAllow) {
  Once<NSError> answer("word");
  device.keld.session()->allowDeletionAtURL(device.url("nowhere"), answer.completion());
  EXPECT_TRUE(answer.value<0>().is(QVTessalyErrorDomain, QVErrorNoSuchItem));
}

TEST_F(DeletionSpree, whatIsHeldIsHeldOverARestart) {
  fill();
  device.keld.remove("f");
  ASSERT_TRUE(holds(kEverything - 1));
  device.keld.stop();
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(holds(kEverything - 1));
  EXPECT_EQ(hand.all().size(), kEverything);
  confirm(false);
  EXPECT_TRUE(device.knowsSoon("f/g/1"));
}

TEST_F(DeletionSpree, whatIsDeletedWhileTheDaemonIsOffIsHeldToo) {
  fill();
  device.keld.stop();
  device.keld.remove("f");
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(holds(kEverything - 1));
  EXPECT_EQ(hand.all().size(), kEverything);
}

TEST_F(DeletionSpree, manyInSmallPortionsAreASpreeToo) {
  fill();
  for (int index = 0; index < kDocuments; ++index) {
    device.keld.remove("f/g/" + std::to_string(index));
    if (index % 8 == 0) device.keld.settle();
  }
  ASSERT_TRUE(eventually([&] { return device.transfers().heldDeletions > 0; }));
  device.keld.settle();
  EXPECT_GT(hand.all().size(), kEverything / 2);
}

TEST_F(DeletionSpree, aFewGoAtOnce) {
  fill();
  for (int index = 0; index < 10; ++index) device.keld.remove("f/g/" + std::to_string(index));
  EXPECT_TRUE(eventually([&] { return hand.all().size() == kEverything - 10; }));
  EXPECT_EQ(device.transfers().heldDeletions, 0U);
}

TEST_F(DeletionSpree, afterTheAnswerTheNextFewGoAtOnceAgain) {
  fill();
  device.keld.remove("f/g");
  ASSERT_TRUE(holds(kDocuments + 1));
  confirm(true);
  ASSERT_TRUE(eventually([&] { return hand.all().size() == 3; }));
  device.keld.remove("kept");
  EXPECT_TRUE(leavesCloudSoon("kept"));
}

TEST_F(DeletionSpree, aReplicaThatWasTakenAwayDeletesNothing) {
  device.keld.write("only", "one document");
  device.keld.folder("f");
  ASSERT_FALSE(device.waitForUploads());
  device.keld.stop();
  std::filesystem::rename(device.keld.replica(), device.keld.replica() + "-away");
  device.keld.start();
  device.keld.waitForFirstScan();
  ASSERT_TRUE(holds(2));
  EXPECT_EQ(hand.paths(), (std::vector<std::string>{"f", "only"}));
  confirm(false);
  ASSERT_TRUE(device.knowsSoon("only"));
  EXPECT_EQ(device.contents("only"), "one document");
  device.keld.remove("only");
  EXPECT_TRUE(leavesCloudSoon("only")) << "it is the drive's folder from now on";
}

TEST_F(DeletionSpree, aReplicaThatCameBackIsWhatItWas) {
  device.keld.write("only", "one document");
  ASSERT_FALSE(device.waitForUploads());
  device.keld.stop();
  std::filesystem::rename(device.keld.replica(), device.keld.replica() + "-away");
  device.keld.start();
  device.keld.waitForFirstScan();
  ASSERT_TRUE(holds(1));
  device.keld.stop();
  std::filesystem::remove_all(device.keld.replica());
  std::filesystem::rename(device.keld.replica() + "-away", device.keld.replica());
  device.keld.start();
  device.keld.waitForFirstScan();
  ASSERT_TRUE(holds(0));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.paths(), std::vector<std::string>{"only"});
  EXPECT_EQ(device.read("only"), "one document");
}

TEST_F(DeletionSpree, aReplicaThatIsTakenAwayWhileTheDaemonRunsDeletesNothing) {
  device.keld.write("only", "one document");
  ASSERT_FALSE(device.waitForUploads());
  std::filesystem::rename(device.keld.replica(), device.keld.replica() + "-away");
  const int calls = cloud->count(Call::fetchZoneChanges);
  hand.put("news", "from anna");
  ASSERT_TRUE(eventually([&] { return cloud->count(Call::fetchZoneChanges) > calls; }));
  device.keld.stop();
  EXPECT_TRUE(hand.at("only"));
  std::filesystem::remove_all(device.keld.replica());
  std::filesystem::rename(device.keld.replica() + "-away", device.keld.replica());
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(device.knowsSoon("only"));
  EXPECT_TRUE(device.knowsSoon("news"));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.paths(), (std::vector<std::string>{"news", "only"}));
}

}  // namespace
}  // namespace droxa::keld
