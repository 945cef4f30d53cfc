// What users note on items, between two devices.

#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

const QVItemMetadata kAll{{"Red", "Work"}, 1'769'860'800'123'456'789, 12};

class MetadataSync : public TwoDevices {
 protected:
  static void note(Device &device, const std::string &path, const QVItemMetadataChange &change) {
    Once<NSError> answer("metadata of " + path);
    device.keld.session()->setMetadataAtURL(device.url(path), change, answer.completion());
    const NSError error = answer.value<0>();
    ASSERT_FALSE(error) << error.description();
  }
  static QVItemMetadata noted(Device &device, const std::string &path) {
    const auto record = device.keld.record(path);
    return record ? record->metadata : QVItemMetadata();
  }
  static bool hasSoon(Device &device, const std::string &path, const QVItemMetadata &metadata) {
    return eventually([&] { return noted(device, path) == metadata; });
  }
  // On the file itself, while no daemon looks.
  static void tag(Device &device, const std::string &path, const char *tag) {
    ASSERT_EQ(QVWriteItemAttributes(device.keld.at(path), {std::vector<std::string>{tag}, {}, {}}), 0);
  }
  static QVItemMetadata tagged(const char *tag) { return {{tag}, 0, 0}; }
};

TEST_F(MetadataSync, ofADocumentReachesTheOtherWithoutItsContents) {
  share("notes.txt", "hello");
  note(anna, "notes.txt", QVItemMetadataChange::to(kAll));
  ASSERT_TRUE(hasSoon(ben, "notes.txt", kAll));
  QVItemMetadata onFile;
  ASSERT_EQ(QVReadItemAttributes(ben.keld.at("notes.txt"), &onFile), 0);
  EXPECT_EQ(onFile, kAll);
  EXPECT_TRUE(ben.isDataless("notes.txt"));
  EXPECT_EQ(ben.contents("notes.txt"), "hello");
  EXPECT_EQ(ben.names(), std::vector<std::string>{"notes.txt"});
}

TEST_F(MetadataSync, staysWhenTheContentsComeAndGo) {
  share("notes.txt", "hello");
  note(anna, "notes.txt", QVItemMetadataChange::to(kAll));
  ASSERT_TRUE(hasSoon(ben, "notes.txt", kAll));
  ASSERT_EQ(ben.contents("notes.txt"), "hello");
  EXPECT_TRUE(hasSoon(ben, "notes.txt", kAll));
  anna.keld.write("notes.txt", "hello again");
  ASSERT_FALSE(anna.waitForUploads());
  EXPECT_TRUE(ben.saysSoon("notes.txt", "hello again"));
  EXPECT_TRUE(hasSoon(ben, "notes.txt", kAll));
  EXPECT_FALSE(ben.waitForUploads());
  EXPECT_EQ(noted(anna, "notes.txt"), kAll);
}

TEST_F(MetadataSync, ofAFolderReachesTheOther) {
  anna.keld.folder("work");
  share("work/notes.txt", "hello");
  note(anna, "work", QVItemMetadataChange::to(kAll));
  EXPECT_TRUE(hasSoon(ben, "work", kAll));
  EXPECT_TRUE(ben.keld.knows("work/notes.txt"));
}

TEST_F(MetadataSync, ofWhatIsNewComesWithIt) {
  ben.keld.stop();
  anna.keld.write("notes.txt", "hello");
  anna.keld.folder("work");
  anna.keld.settle();
  for (const char *path : {"notes.txt", "work"}) note(anna, path, QVItemMetadataChange::to(kAll));
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.start();
  for (const char *path : {"notes.txt", "work"}) EXPECT_TRUE(hasSoon(ben, path, kAll)) << path;
}

TEST_F(MetadataSync, thatIsRemovedIsRemovedThere) {
  share("notes.txt", "hello");
  note(anna, "notes.txt", QVItemMetadataChange::to(kAll));
  ASSERT_TRUE(hasSoon(ben, "notes.txt", kAll));
  note(ben, "notes.txt", QVItemMetadataChange::to({}));
  EXPECT_TRUE(hasSoon(anna, "notes.txt", {}));
}

TEST_F(MetadataSync, thatBothChangedIsTheLastThatWasSaved) {
  share("notes.txt", "hello");
  ben.keld.stop();
  note(anna, "notes.txt", {std::vector<std::string>{"Red"}, {}, {}});
  ASSERT_FALSE(anna.waitForUploads());
  tag(ben, "notes.txt", "Blue");
  ben.keld.start();
  for (Device *device : {&anna, &ben}) {
    EXPECT_TRUE(hasSoon(*device, "notes.txt", tagged("Blue")));
    EXPECT_EQ(device->names(), std::vector<std::string>{"notes.txt"});
    EXPECT_EQ(device->contents("notes.txt"), "hello");
  }
}

TEST_F(MetadataSync, changedOnOneAndContentsOnTheOtherAreBothKept) {
  share("one", "1");
  share("two", "2");
  ASSERT_EQ(ben.contents("one") + ben.contents("two"), "12");
  ben.keld.stop();
  note(anna, "one", {std::vector<std::string>{"Red"}, {}, {}});
  anna.keld.write("two", "from anna");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.write("one", "from ben");
  tag(ben, "two", "Blue");
  ben.keld.start();
  for (Device *device : {&anna, &ben}) {
    EXPECT_TRUE(device->saysSoon("one", "from ben"));
    EXPECT_TRUE(device->saysSoon("two", "from anna"));
    EXPECT_TRUE(hasSoon(*device, "one", tagged("Red")));
    EXPECT_TRUE(hasSoon(*device, "two", tagged("Blue")));
    EXPECT_EQ(device->names(), (std::vector<std::string>{"one", "two"}));
  }
}

class MetadataInTheCloud : public FaultyDrive {};

TEST_F(MetadataInTheCloud, isSavedWithoutContents) {
  sent("a", "contents");
  const int uploads = cloud->count(FaultyCloud::Call::uploadAsset);
  Once<NSError> answer("metadata");
  device.keld.session()->setMetadataAtURL(device.url("a"), QVItemMetadataChange::to(kAll),
                                          answer.completion());
  ASSERT_FALSE(answer.value<0>());
  EXPECT_TRUE(eventually([&] { return hand.at("a")->metadata == kAll; }));
  EXPECT_EQ(cloud->count(FaultyCloud::Call::uploadAsset), uploads);
  EXPECT_EQ(hand.contents("a"), "contents");
}

TEST_F(MetadataInTheCloud, ofADeviceThatDoesNotKnowItIsNone) {
  hand.put("a", "contents");
  ASSERT_TRUE(device.knowsSoon("a"));
  EXPECT_TRUE(device.keld.record("a")->metadata.isEmpty());
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_TRUE(hand.at("a")->metadata->isEmpty());
}

}  // namespace
}  // namespace droxa::keld
