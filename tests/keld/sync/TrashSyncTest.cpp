// What is moved, and what is thrown away, between two devices.

#include "tessaly/QVTrashInfo.h"
#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

class TrashSync : public TwoDevices {
 protected:
  static std::string trash(Device &device, const std::string &name) {
    return device.keld.documents(QVUbiquitousTrashContainerID) + "/" + name;
  }
  static std::string noteOf(Device &device, const std::string &name) {
    return device.keld.replica() + "/" + QVUbiquitousTrashContainerID + "/" + QVTrashInfoFolderName + "/" +
           name + QVTrashInfoSuffix;
  }
  static std::optional<QVTrashInfo> note(Device &device, const std::string &name) {
    std::ifstream file(noteOf(device, name), std::ios::binary);
    return QVParseTrashInfo(std::string{std::istreambuf_iterator<char>(file), {}});
  }
  // As the trash operation does it: the note first.
  static void throwAway(Device &device, const std::string &path, const std::string &name) {
    QVTrashInfo info;
    info.path = device.keld.at(path);
    info.deletionDate = "2026-01-31T12:00:00";
    std::filesystem::create_directories(std::filesystem::path(noteOf(device, name)).parent_path());
    std::ofstream(noteOf(device, name), std::ios::binary) << QVEncodeTrashInfo(info);
    std::filesystem::rename(device.keld.at(path), trash(device, name));
  }
  static bool isInTrashSoon(Device &device, const std::string &name) {
    return eventually([&] { return device.keld.knows(trash(device, name)) && note(device, name); });
  }

  CloudHand hand{cloudFolder, "checker"};
};

TEST_F(TrashSync, theOtherKnowsWhereItWas) {
  anna.keld.folder("work");
  share("work/notes.txt", "hello");
  throwAway(anna, "work/notes.txt", "notes.txt");
  ASSERT_TRUE(isInTrashSoon(ben, "notes.txt"));
  EXPECT_TRUE(ben.losesSoon("work/notes.txt"));
  const auto noted = note(ben, "notes.txt");
  EXPECT_EQ(noted->path, ben.keld.at("work/notes.txt"));
  EXPECT_EQ(noted->deletionDate, "2026-01-31T12:00:00");
  ASSERT_TRUE(noted->folder);
  EXPECT_EQ(noted->folder->number(), ben.keld.number("work"));
  EXPECT_EQ(noted->folderInode, ben.keld.record("work")->facts.inode);
}

TEST_F(TrashSync, theNameIsTheOneThatItHadAndNotTheTrashs) {
  share("notes.txt", "hello");
  throwAway(anna, "notes.txt", "notes 2.txt");
  ASSERT_TRUE(isInTrashSoon(ben, "notes 2.txt"));
  EXPECT_EQ(note(ben, "notes 2.txt")->path, ben.keld.at("notes.txt"));
}

TEST_F(TrashSync, theFolderIsFoundUnderItsNewName) {
  anna.keld.folder("work");
  share("work/notes.txt", "hello");
  throwAway(anna, "work/notes.txt", "notes.txt");
  ASSERT_TRUE(isInTrashSoon(ben, "notes.txt"));
  ben.keld.rename("work", "plans");
  ASSERT_TRUE(anna.knowsSoon("plans"));
  EXPECT_EQ(note(ben, "notes.txt")->folder->number(), ben.keld.number("plans"));
}

TEST_F(TrashSync, whatWasMovedThereByHandIsNotedWhereTheCloudKnewIt) {
  anna.keld.folder("work");
  share("work/notes.txt", "hello");
  std::filesystem::rename(anna.keld.at("work/notes.txt"), trash(anna, "notes.txt"));
  ASSERT_TRUE(isInTrashSoon(ben, "notes.txt"));
  EXPECT_EQ(note(ben, "notes.txt")->path, ben.keld.at("work/notes.txt"));
}

TEST_F(TrashSync, whatADeviceSeesInTheTrashFirstIsNotedToo) {
  anna.keld.folder("work");
  share("work/other.txt", "other");
  ben.keld.stop();
  anna.keld.write("work/notes.txt", "hello");
  anna.keld.settle();
  throwAway(anna, "work/notes.txt", "notes.txt");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.start();
  ASSERT_TRUE(isInTrashSoon(ben, "notes.txt"));
  EXPECT_EQ(note(ben, "notes.txt")->path, ben.keld.at("work/notes.txt"));
}

TEST_F(TrashSync, aFolderThatTheCloudTellsOfLaterIsFound) {
  ben.keld.stop();
  anna.keld.folder("work");
  anna.keld.write("work/notes.txt", "hello");
  ASSERT_FALSE(anna.waitForUploads());
  throwAway(anna, "work/notes.txt", "notes.txt");
  ASSERT_FALSE(anna.waitForUploads());
  anna.keld.rename("work", "plans");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.start();
  ASSERT_TRUE(isInTrashSoon(ben, "notes.txt"));
  EXPECT_TRUE(eventually([&] { return note(ben, "notes.txt")->path == ben.keld.at("plans/notes.txt"); }));
}

TEST_F(TrashSync, aFolderGoesAndComesBackWithAllThatIsInIt) {
  anna.keld.folder("work");
  share("work/notes.txt", "hello");
  throwAway(anna, "work", "work");
  ASSERT_TRUE(isInTrashSoon(ben, "work"));
  EXPECT_TRUE(ben.knowsSoon(trash(ben, "work/notes.txt")));
  EXPECT_EQ(note(ben, "work")->path, ben.keld.at("work"));
  std::filesystem::rename(trash(ben, "work"), ben.keld.at("work"));
  ASSERT_TRUE(anna.knowsSoon("work/notes.txt"));
  EXPECT_EQ(anna.contents("work/notes.txt"), "hello");
  EXPECT_TRUE(anna.losesSoon(trash(anna, "work")));
  const auto record = hand.at("work");
  ASSERT_TRUE(record);
  const CKFetchReply reply = hand.cloud->fetchRecords({RecordID(record->record)}, std::nullopt, {});
  ASSERT_EQ(reply.results.size(), 1U);
  for (const char *key : {kRecordKeyPutBackParent, kRecordKeyPutBackName, kRecordKeyTrashed})
    EXPECT_EQ(reply.results.front().record.fields.count(key), 0U) << key;
}

class Moves : public TrashSync {
 protected:
  // How many records were saved or deleted since the last time.
  std::size_t changedRecords() {
    std::size_t changed = 0;
    for (bool more = true; more;) {
      const CKZoneChanges page = hand.cloud->fetchZoneChanges(DriveZone(), token_, std::nullopt, 500, {});
      EXPECT_FALSE(page.error) << page.error.description();
      changed += page.changedRecords.size() + page.deletedRecords.size();
      token_ = page.token;
      more = page.moreComing;
    }
    return changed;
  }

 private:
  CKServerChangeToken token_;
};

TEST_F(Moves, aFolderWith500DocumentsIsOneRecord) {
  constexpr int kDocuments = 500;
  anna.keld.folder("work");
  anna.keld.folder("archive");
  for (int index = 0; index < kDocuments; ++index) anna.keld.write("work/" + std::to_string(index), "x");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(ben.knowsSoon("work/" + std::to_string(kDocuments - 1)));
  ASSERT_FALSE(ben.waitForUploads());
  ASSERT_GE(changedRecords(), static_cast<std::size_t>(kDocuments) + 2);
  anna.keld.rename("work", "archive/work");
  ASSERT_TRUE(ben.knowsSoon("archive/work/0"));
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_FALSE(ben.waitForUploads());
  EXPECT_EQ(changedRecords(), 1U);
  throwAway(anna, "archive/work", "work");
  ASSERT_TRUE(ben.knowsSoon(trash(ben, "work/0")));
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_FALSE(ben.waitForUploads());
  EXPECT_EQ(changedRecords(), 1U);
}

TEST_F(Moves, aDocumentWhoseContentsAreElsewhereMovesAcrossContainers) {
  share("notes.txt", "hello");
  ASSERT_TRUE(ben.isDataless("notes.txt"));
  const std::string there = ben.keld.documents(QVUbiquitousDesktopContainerID) + "/notes.txt";
  std::filesystem::rename(ben.keld.at("notes.txt"), there);
  ASSERT_TRUE(anna.knowsSoon(anna.keld.documents(QVUbiquitousDesktopContainerID) + "/notes.txt"));
  EXPECT_TRUE(anna.losesSoon("notes.txt"));
  EXPECT_EQ(ben.contents(there), "hello");
}

}  // namespace
}  // namespace droxa::keld
