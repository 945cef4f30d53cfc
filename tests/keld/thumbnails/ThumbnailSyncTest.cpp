// Thumbnails on the records of the cloud, between two devices.

#include <sys/xattr.h>

#include "keld/sync/CloudImport.h"
#include "tests/keld/sync/FaultyDrive.h"
#include "tests/keld/thumbnails/ScriptedThumbnailer.h"
#include "tests/support/LogLines.h"

namespace droxa::keld {
namespace {

class ThumbnailSync : public testing::Test {
 protected:
  ThumbnailSync() : hand(cloudFolder, "hand"), anna(device("anna", annas)), ben(device("ben", bens)) {}

  KeldOptions device(const std::string &name, const std::shared_ptr<ScriptedThumbnailer> &thumbnailer) const {
    KeldOptions options = DeviceOptions(cloudFolder, name);
    options.sync.thumbnailer = thumbnailer;
    return options;
  }
  CKRecord recordOf(const std::string &path) {
    const auto document = hand.at(path);
    if (!document) return {};
    const CKFetchReply reply = hand.cloud->fetchRecords({RecordID(document->record)}, std::nullopt, {});
    return reply.results.empty() ? CKRecord() : reply.results[0].record;
  }
  // "" when there is none.
  std::string thumbnailOf(const std::string &path) {
    const CKRecord record = recordOf(path);
    const CKAsset *asset = record.get<CKAsset>(kQVRecordKeyThumbnail1024x1024);
    std::string bytes;
    if (!asset) return bytes;
    const NSError error = hand.cloud->readAsset(asset->reference(), 0,
                                                [&](std::span<const std::uint8_t> more) {
                                                  bytes.append(more.begin(), more.end());
                                                  return NSError();
                                                },
                                                nullptr, {});
    EXPECT_FALSE(error) << error.description();
    return bytes;
  }
  bool hasSoon(const std::string &path, const std::string &thumbnail) {
    return eventually([&] { return thumbnailOf(path) == thumbnail; });
  }
  static void sent(Device &device, const std::string &path, const std::string &contents) {
    device.keld.write(path, contents);
    const NSError error = device.waitForUploads(path);
    ASSERT_FALSE(error) << error.description();
  }
  static bool isSettled(Device &device) {
    return eventually([&] { return device.keld.daemon().sync().store().countThumbnails() == 0; });
  }
  // Whether the device's database has the record as the cloud has it.
  bool agreesSoon(Device &device, const std::string &path) {
    return eventually([&] {
      const CKRecord record = recordOf(path);
      const auto row = device.keld.daemon().sync().store().byRecord(record.recordID.recordName);
      return row && row->tag == record.recordChangeTag && !row->hasNewer();
    });
  }

  const TemporaryFolder folder;
  const std::string cloudFolder = folder.path() + "/cloud";
  const std::shared_ptr<ScriptedThumbnailer> annas = std::make_shared<ScriptedThumbnailer>(),
                                             bens = std::make_shared<ScriptedThumbnailer>();
  CloudHand hand;
  Device anna, ben;
};

TEST_F(ThumbnailSync, comesOntoTheRecordAfterTheUpload) {
  sent(anna, "beach.jpg", "sand");
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  EXPECT_EQ(hand.contents("beach.jpg"), "sand");
  EXPECT_TRUE(isSettled(anna));
}

TEST_F(ThumbnailSync, aDocumentOfAnotherTypeHasNone) {
  sent(anna, "notes.txt", "hello");
  EXPECT_EQ(annas->asked("hello"), 0U);
  EXPECT_EQ(anna.keld.daemon().sync().store().countThumbnails(), 0U);
  EXPECT_EQ(thumbnailOf("notes.txt"), "");
}

TEST_F(ThumbnailSync, isWaitedForByNobody) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  EXPECT_TRUE(eventually([&] { return annas->asked("sand") == 1; }));
  sent(anna, "notes.txt", "hello");
  EXPECT_EQ(hand.contents("notes.txt"), "hello");
  EXPECT_EQ(thumbnailOf("beach.jpg"), "");
  annas->hold(false);
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
}

TEST_F(ThumbnailSync, changesWithTheContents) {
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  annas->hold(true);
  sent(anna, "beach.jpg", "sand and sea");
  EXPECT_EQ(thumbnailOf("beach.jpg"), "") << "the save of the contents took it along";
  annas->hold(false);
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of sand and sea"));
}

TEST_F(ThumbnailSync, ofContentsThatChangedMeanwhileIsNotSaved) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(eventually([&] { return annas->asked("sand") == 1; }));
  sent(anna, "beach.jpg", "sand and sea");
  annas->hold(false);
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of sand and sea"));
  EXPECT_TRUE(isSettled(anna));
  EXPECT_EQ(thumbnailOf("beach.jpg"), "thumbnail of sand and sea");
}

TEST_F(ThumbnailSync, staysWhenTheDocumentIsRenamed) {
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  anna.keld.rename("beach.jpg", "sea.jpg");
  EXPECT_TRUE(hasSoon("sea.jpg", "thumbnail of sand"));
  EXPECT_EQ(annas->asked("sand"), 1U);
}

TEST_F(ThumbnailSync, makesTheOtherDeviceFetchNothing) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  sent(anna, "read.jpg", "foam");
  ASSERT_TRUE(ben.knowsSoon("beach.jpg") && ben.knowsSoon("read.jpg"));
  ASSERT_EQ(ben.contents("read.jpg"), "foam");
  annas->hold(false);
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  ASSERT_TRUE(hasSoon("read.jpg", "thumbnail of foam"));
  EXPECT_TRUE(agreesSoon(ben, "beach.jpg"));
  EXPECT_TRUE(agreesSoon(ben, "read.jpg"));
  EXPECT_TRUE(ben.isDataless("beach.jpg"));
  EXPECT_EQ(ben.transfers().downloads.active + ben.transfers().downloads.queued, 0U);
  EXPECT_EQ(ben.read("read.jpg"), "foam");
  EXPECT_EQ(ben.names(), (std::vector<std::string>{"beach.jpg", "read.jpg"}));
  EXPECT_EQ(bens->asked("foam"), 0U) << "the other device has made it";
}

TEST_F(ThumbnailSync, isNoConflictWithWhatTheOtherDeviceWrites) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(ben.knowsSoon("beach.jpg"));
  ASSERT_EQ(ben.contents("beach.jpg"), "sand");
  ben.keld.stop();
  annas->hold(false);
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  ben.keld.write("beach.jpg", "ben was here");
  ben.keld.start();
  ben.keld.waitForFirstScan();
  const NSError error = ben.waitForUploads();
  EXPECT_FALSE(error) << error.description();
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of ben was here"));
  EXPECT_EQ(ben.names(), std::vector<std::string>{"beach.jpg"});
  EXPECT_EQ(anna.contents("beach.jpg"), "ben was here");
  EXPECT_EQ(anna.names(), std::vector<std::string>{"beach.jpg"});
}

TEST_F(ThumbnailSync, bringsNothingBackThatTheOtherDeviceDeleted) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(ben.knowsSoon("beach.jpg"));
  ASSERT_TRUE(eventually([&] { return ben.status("beach.jpg").upload == QVUploadState::inCloud; }));
  ben.keld.stop();
  annas->hold(false);
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  ASSERT_TRUE(std::filesystem::remove(ben.keld.at("beach.jpg")));
  ben.keld.start();
  EXPECT_TRUE(eventually([&] { return !hand.at("beach.jpg"); }));
  EXPECT_TRUE(anna.losesSoon("beach.jpg"));
  EXPECT_FALSE(ben.exists("beach.jpg"));
}

TEST_F(ThumbnailSync, isOfTheContentsThatTheOtherDeviceWroteLast) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(eventually([&] { return annas->asked("sand") == 1; }));
  ASSERT_TRUE(ben.knowsSoon("beach.jpg"));
  ASSERT_EQ(ben.contents("beach.jpg"), "sand");
  sent(ben, "beach.jpg", "ben was here");
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of ben was here"));
  ASSERT_TRUE(eventually([&] { return anna.read("beach.jpg") == "ben was here"; }));
  annas->hold(false);
  EXPECT_TRUE(agreesSoon(anna, "beach.jpg"));
  EXPECT_EQ(thumbnailOf("beach.jpg"), "thumbnail of ben was here");
  EXPECT_EQ(anna.names(), std::vector<std::string>{"beach.jpg"});
}

TEST_F(ThumbnailSync, isMadeAfterARestartInBetween) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(eventually([&] { return annas->asked("sand") == 1; }));
  anna.keld.stop();
  EXPECT_EQ(thumbnailOf("beach.jpg"), "");
  annas->hold(false);
  anna.keld.start();
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  EXPECT_EQ(annas->asked("sand"), 2U);
  EXPECT_TRUE(isSettled(anna));
}

TEST_F(ThumbnailSync, thatCannotBeMadeIsToldOnceAndNotTriedAgain) {
  const OSLogCapture log;
  sent(anna, "trap.jpg", "hostile contents");
  EXPECT_TRUE(isSettled(anna));
  anna.keld.stop();
  anna.keld.start();
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  EXPECT_EQ(annas->asked("hostile contents"), 1U);
  EXPECT_EQ(hand.contents("trap.jpg"), "hostile contents");
  EXPECT_EQ(thumbnailOf("trap.jpg"), "");
  std::vector<std::string> told;
  for (const std::string &line : logLines(log))
    if (line.find("no thumbnail") != std::string::npos) told.push_back(line);
  ASSERT_EQ(told.size(), 1U);
  EXPECT_NE(told[0].find("trap.jpg has no thumbnail: it is hostile"), std::string::npos) << told[0];
  sent(anna, "trap.jpg", "harmless now");
  EXPECT_TRUE(hasSoon("trap.jpg", "thumbnail of harmless now"));
}

TEST_F(ThumbnailSync, ofADeletedDocumentIsForgotten) {
  annas->hold(true);
  sent(anna, "beach.jpg", "sand");
  ASSERT_TRUE(eventually([&] { return annas->asked("sand") == 1; }));
  anna.keld.remove("beach.jpg");
  ASSERT_TRUE(eventually([&] { return !hand.at("beach.jpg"); }));
  annas->hold(false);
  EXPECT_TRUE(isSettled(anna));
  sent(anna, "notes.txt", "hello");
  EXPECT_FALSE(hand.at("beach.jpg"));
}

TEST_F(ThumbnailSync, manyAreMadeOfAFewAtATime) {
  for (int number = 0; number < 100; ++number)
    anna.keld.write("beach" + std::to_string(number) + ".jpg", "sand" + std::to_string(number));
  EXPECT_TRUE(eventually([&] { return anna.keld.number("beach99.jpg") != 0; }));
  ASSERT_FALSE(anna.waitForUploads());
  EXPECT_TRUE(hasSoon("beach99.jpg", "thumbnail of sand99"));
  EXPECT_TRUE(isSettled(anna));
  for (const char *number : {"0", "50", "98"})
    EXPECT_EQ(thumbnailOf("beach" + std::string(number) + ".jpg"), "thumbnail of sand" + std::string(number));
}

// An import's documents are dataless: their thumbnails are made of the files that they came from.
TEST_F(ThumbnailSync, ofImportedDocumentsAreMadeOfTheirSources) {
  const std::string source = folder.path() + "/source";
  folder.write("source/beach.jpg", "sand");
  folder.write("source/deep/sea.jpg", "water");
  folder.write("source/deep/notes.txt", "hello");
  folder.write("source/changed.jpg", "before");
  anna.keld.stop();
  std::vector<WantedThumbnail> noted;
  {
    SyncStore store(DroxaHome(anna.keld.home().root()).state() + "/sync.sqlite");
    NSError error;
    const auto cloud = EmbeddedCloud::open(cloudFolder, AccountKeeper::localUserName(), "anna", &error);
    ASSERT_TRUE(cloud) << error.description();
    const ImportReport report =
        ImportIntoCloud(*cloud, source, {}, nullptr, [&](const std::vector<WantedThumbnail> &wanted) {
          for (const WantedThumbnail &each : wanted) store.wantThumbnail(each);
        });
    EXPECT_FALSE(report.error) << report.error.description();
    EXPECT_EQ(report.documents, 4U);
    EXPECT_EQ(store.countThumbnails(), 3U);
  }
  folder.write("source/changed.jpg", "afterwards");
  anna.keld.start();
  EXPECT_TRUE(hasSoon("beach.jpg", "thumbnail of sand"));
  EXPECT_TRUE(hasSoon("deep/sea.jpg", "thumbnail of water"));
  EXPECT_TRUE(isSettled(anna));
  EXPECT_EQ(thumbnailOf("changed.jpg"), "") << "that file has other contents now";
  EXPECT_EQ(annas->asked("afterwards"), 0U);
  EXPECT_TRUE(anna.isDataless("beach.jpg"));
}

}  // namespace
}  // namespace droxa::keld
