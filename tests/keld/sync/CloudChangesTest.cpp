#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

KeldOptions oftenPolling() {
  KeldOptions options;
  options.sync.pollInterval = std::chrono::milliseconds(200);
  return options;
}

class CloudChanges : public FaultyDrive {
 protected:
  CloudChanges() : FaultyDrive(oftenPolling()) {}
  Fault expired() { return failing(CKErrorCode::changeTokenExpired); }
  bool fetches(int more) {
    const int calls = cloud->count(Call::fetchZoneChanges);
    return eventually([&] { return cloud->count(Call::fetchZoneChanges) >= calls + more; });
  }
};

TEST_F(CloudChanges, afterTheTokenHasExpiredEverythingIsFetchedAndDeletionsAreFound) {
  dataless("gone", "1");
  dataless("stays", "2");
  sent("own", "3");
  device.keld.stop();
  hand.remove("gone");
  hand.put("new", "4");
  cloud->onNextCall(Call::fetchZoneChanges, expired());
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(device.knowsSoon("new"));
  EXPECT_TRUE(device.losesSoon("gone"));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_TRUE(device.isDataless("stays"));
  EXPECT_EQ(device.read("own"), "3");
  EXPECT_EQ(hand.paths(), (std::vector<std::string>{"new", "own", "stays"}));
}

TEST_F(CloudChanges, deletionsAreFoundThoughTheFetchOfEverythingIsCutShort) {
  for (int index = 0; index < 250; ++index) hand.put(std::to_string(index), "x");
  ASSERT_TRUE(eventually([&] { return device.names().size() == 250; }));
  device.keld.stop();
  hand.remove("0");
  cloud->onNextCall(Call::fetchZoneChanges, expired());
  cloud->onCall(Call::fetchZoneChanges, 3, hanging());
  device.keld.start();
  ASSERT_TRUE(eventually([&] { return cloud->hanging() > 0; })) << "the second page";
  device.keld.stop();
  cloud->clearFaults();
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(device.losesSoon("0"));
  EXPECT_TRUE(device.keld.knows("249"));
}

TEST_F(CloudChanges, anotherCloudAtTheSamePlaceIsLeftAlone) {
  dataless("far", "1");
  sent("own", "2");
  const std::string away = cloudFolder + "-away";
  std::filesystem::rename(cloudFolder, away);
  CloudHand other(cloudFolder);
  other.put("foreign", "of another cloud");
  device.keld.write("new", "3");
  ASSERT_TRUE(eventually([&] {
    return device.transfers().cloudProblem.find("isn't the cloud") != std::string::npos;
  })) << device.transfers().cloudProblem;
  EXPECT_FALSE(device.transfers().isCloudReachable);
  device.keld.settle();
  EXPECT_EQ(other.paths(), std::vector<std::string>{"foreign"});
  EXPECT_TRUE(device.keld.knows("far"));
  EXPECT_TRUE(device.keld.knows("own"));
  EXPECT_FALSE(device.keld.knows("foreign"));
  device.keld.stop();
  device.keld.start();
  device.keld.waitForFirstScan();
  ASSERT_TRUE(eventually([&] { return !device.transfers().cloudProblem.empty(); }));
  EXPECT_TRUE(device.keld.knows("far"));
  std::filesystem::remove_all(cloudFolder);
  std::filesystem::rename(away, cloudFolder);
  CloudHand back(cloudFolder);
  EXPECT_TRUE(eventually([&] { return back.at("new").has_value(); }));
  EXPECT_EQ(back.paths(), (std::vector<std::string>{"far", "new", "own"}));
  EXPECT_EQ(device.contents("far"), "1");
}

TEST_F(CloudChanges, aCloudThatVanishesAndComesBackLosesNothing) {
  dataless("far", "1");
  sent("own", "2");
  const std::string away = cloudFolder + "-away";
  std::filesystem::rename(cloudFolder, away);
  device.keld.write("new", "3");
  ASSERT_TRUE(eventually([&] { return !device.transfers().isCloudReachable; }));
  EXPECT_TRUE(device.keld.knows("far"));
  const NSError error = device.download("far");
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, 4355)) << error.description();
  std::filesystem::rename(away, cloudFolder);
  EXPECT_TRUE(isInCloudSoon("new"));
  EXPECT_TRUE(eventually([&] { return device.transfers().isCloudReachable; }));
  EXPECT_EQ(device.contents("far"), "1");
}

// A disk that isn't mounted yet when the daemon starts.
TEST_F(CloudChanges, aCloudThatIsAwayAtTheStartIsFoundWhenItIsBack) {
  Device other(cloudFolder, "carl");
  hand.put("far", "1");
  ASSERT_TRUE(other.knowsSoon("far"));
  other.keld.stop();
  device.keld.stop();
  const std::string away = cloudFolder + "-away";
  std::filesystem::rename(cloudFolder, away);
  other.keld.start();
  other.keld.waitForFirstScan();
  other.keld.write("new", "3");
  ASSERT_TRUE(eventually([&] {
    return other.transfers().cloudProblem.find("there is no cloud in " + cloudFolder) != std::string::npos;
  })) << other.transfers().cloudProblem;
  EXPECT_TRUE(other.keld.knows("far"));
  EXPECT_TRUE(other.download("far").is(NSCocoaErrorDomain, 4355));
  EXPECT_FALSE(std::filesystem::exists(cloudFolder)) << "nothing is made in its place";
  std::filesystem::rename(away, cloudFolder);
  EXPECT_TRUE(isInCloudSoon("new"));
  EXPECT_FALSE(other.download("far"));
  EXPECT_EQ(other.read("far"), "1");
}

TEST_F(CloudChanges, aCloudThatLostEverythingGetsItAgain) {
  dataless("far", "1");
  sent("own", "2");
  device.keld.folder("f");
  sent("f/inside", "3");
  ASSERT_FALSE(hand.cloud->deleteZone(DriveZone(), {}));
  EXPECT_TRUE(isInCloudSoon("own"));
  EXPECT_TRUE(isInCloudSoon("f/inside"));
  EXPECT_EQ(device.read("own"), "2");
  EXPECT_EQ(hand.contents("f/inside"), "3");
}

TEST_F(CloudChanges, aChildBeforeItsParentWaitsForIt) {
  DocumentRecord child;
  child.record = NewRecordName();
  child.name = "child";
  child.parent = NewRecordName();
  child.content = hand.upload("contents");
  hand.save(MakeRecordWithContent(child));
  ASSERT_TRUE(fetches(1));
  DocumentRecord parent;
  parent.record = child.parent;
  parent.name = "parent";
  parent.kind = NSFileProviderItemKind::folder;
  parent.parent = ContainerRecord(QVUbiquitousDefaultContainerID);
  parent.content.mode = 0755;
  cloud->onNextCall(Call::fetchRecords, failing(CKErrorCode::networkFailure));
  hand.save(MakeRecord(parent));
  ASSERT_TRUE(device.knowsSoon("parent/child"));
  EXPECT_EQ(device.contents("parent/child"), "contents");
}

TEST_F(CloudChanges, recordsThatMakeNoSenseAreLeftAlone) {
  DocumentRecord hostile;
  hostile.kind = NSFileProviderItemKind::folder;
  hostile.parent = ContainerRecord(QVUbiquitousDefaultContainerID);
  for (const char *name : {"..", "a/b", ""}) {
    hostile.record = NewRecordName();
    hostile.name = name;
    hand.save(MakeRecord(hostile));
  }
  hostile.record = hostile.parent = NewRecordName();
  hostile.name = "itself";
  hand.save(MakeRecord(hostile));
  dataless("good", "x");
  EXPECT_EQ(device.names(), std::vector<std::string>{"good"});
  EXPECT_TRUE(device.transfers().isCloudReachable);
}

TEST_F(CloudChanges, datesOfAnyYearArrive) {
  for (const std::int64_t date : {std::int64_t{0}, std::int64_t{-1'000'000'001}, INT64_MIN, INT64_MAX}) {
    DocumentRecord odd;
    odd.record = NewRecordName();
    odd.name = "date " + std::to_string(date);
    odd.parent = ContainerRecord(QVUbiquitousDefaultContainerID);
    odd.content = hand.upload("contents");
    odd.content.modified = date;
    hand.save(MakeRecordWithContent(odd));
    ASSERT_TRUE(device.knowsSoon(odd.name));
    EXPECT_EQ(device.contents(odd.name), "contents");
  }
}

// Disabled: the link gets a second record here, of the same name.
TEST_F(CloudChanges, aLinkThatPointsElsewhereNowFollows) {
  hand.link("link", "one");
  ASSERT_TRUE(device.knowsSoon("link"));
  hand.change("link", [](DocumentRecord &link) { link.target = "two"; });
  ASSERT_TRUE(eventually([&] {
    std::error_code ignored;
    return std::filesystem::read_symlink(device.keld.at("link"), ignored) == "two";
  }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_TRUE(eventually([&] { return hand.paths() == std::vector<std::string>{"link"}; }));
  EXPECT_EQ(hand.at("link")->target, "two");
}

TEST_F(CloudChanges, aNewerVersionThatCouldNotBeFetchedIsTriedAgain) {
  sent("a", "base");
  cloud->onCall(Call::readAsset, 1, failing(CKErrorCode::networkFailure));
  hand.put("a", "newer");
  EXPECT_TRUE(eventually([&] { return device.read("a") == "newer"; }));
}

TEST_F(CloudChanges, aFolderDeletedThereWithANewDocumentHereLives) {
  hand.folder("f");
  hand.put("f/old", "x");
  ASSERT_TRUE(device.knowsSoon("f/old"));
  device.keld.stop();
  hand.remove("f/old");
  hand.remove("f");
  device.keld.write("f/new", "contents");
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_TRUE(isInCloudSoon("f/new"));
  EXPECT_EQ(device.read("f/new"), "contents");
  EXPECT_TRUE(device.losesSoon("f/old"));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.paths(), (std::vector<std::string>{"f", "f/new"}));
}

TEST_F(CloudChanges, aFolderDeletedHereWithANewDocumentThereComesBack) {
  device.keld.folder("f");
  sent("f/old", "x");
  device.keld.stop();
  device.keld.remove("f");
  hand.put("f/new", "contents");
  device.keld.start();
  device.keld.waitForFirstScan();
  ASSERT_TRUE(eventually([&] { return device.keld.knows("f/new") || !hand.at("f"); }));
  EXPECT_FALSE(device.waitForUploads());
  // Whatever becomes of the folder, the document that nobody deleted is somewhere.
  std::vector<std::string> kept;
  for (const auto &[path, document] : hand.all())
    if (document.name == "new") kept.push_back(path);
  EXPECT_EQ(kept.size(), 1U);
  EXPECT_TRUE(device.knowsSoon("f/new"));
  EXPECT_EQ(device.contents("f/new"), "contents");
}

TEST_F(CloudChanges, twoRecordsOfOneNameAreBothThere) {
  for (const char *contents : {"one", "two"}) {
    DocumentRecord twin;
    twin.record = NewRecordName();
    twin.name = "twin.txt";
    twin.parent = ContainerRecord(QVUbiquitousDefaultContainerID);
    twin.content = hand.upload(contents);
    twin.content.mode = 0644;
    hand.save(MakeRecordWithContent(twin));
  }
  ASSERT_TRUE(eventually([&] { return device.names().size() == 2; }));
  std::vector<std::string> found;
  for (const std::string &name : device.names()) {
    ASSERT_TRUE(device.knowsSoon(name));
    found.push_back(device.contents(name));
  }
  std::sort(found.begin(), found.end());
  EXPECT_EQ(found, (std::vector<std::string>{"one", "two"}));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.all().size(), 2U);
}

TEST_F(TwoDevices, foldersMovedIntoEachOtherEndAlikeOnBoth) {
  anna.keld.folder("A");
  anna.keld.folder("B");
  share("A/in a", "a");
  share("B/in b", "b");
  ben.keld.stop();
  anna.keld.rename("A", "B/A");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.rename("B", "A/B");
  ben.keld.start();
  ben.keld.waitForFirstScan();
  const auto tree = [](Device &device) {
    std::vector<std::string> paths;
    const std::string root = device.keld.at("");
    for (const auto &entry : std::filesystem::recursive_directory_iterator(root))
      paths.push_back(entry.path().string().substr(root.size() + 1));
    std::sort(paths.begin(), paths.end());
    return paths;
  };
  const auto isAlike = [&] {
    return tree(anna) == tree(ben) && tree(anna).size() == 4 && !anna.waitForUploads() &&
           !ben.waitForUploads();
  };
  ASSERT_TRUE(eventually([&] { return isAlike() && isAlike(); }));
  CloudHand hand(cloudFolder);
  EXPECT_EQ(hand.paths(), tree(anna));
}

TEST_F(TwoDevices, documentsOfOneNameMadeAtOnceAreBothKept) {
  anna.keld.write("plan.txt", "anna's plan");
  ben.keld.write("plan.txt", "ben's own plan");
  ASSERT_TRUE(eventually([&] { return anna.names().size() == 2 && ben.names() == anna.names(); }));
  std::vector<std::string> found;
  for (const std::string &name : ben.names()) {
    ASSERT_TRUE(ben.knowsSoon(name));
    found.push_back(ben.contents(name));
  }
  std::sort(found.begin(), found.end());
  EXPECT_EQ(found, (std::vector<std::string>{"anna's plan", "ben's own plan"}));
}

}  // namespace
}  // namespace droxa::keld
