// What this device knows of shares without asking, and how it comes to know.

#include "tests/keld/sharing/SharingDrive.h"

namespace droxa::keld {
namespace {

class KnownSharesTest : public SharingDrive {
 protected:
  bool optionsBecome(const std::string &path, const Options &wanted) {
    return eventually([&] { return options(path) == wanted; });
  }
  // As another device of Anna's does it, which this one hears of by the feed alone.
  CKShare sharedElsewhere(const std::string &path) {
    const CKShare share = CKShare::shareWithRootRecordID(recordOf(path));
    CKModifyRequest request;
    request.recordsToSave.push_back(share.record());
    const CKModifyReply reply = open("anna", "other")->modifyRecords(request, {});
    EXPECT_FALSE(reply.error) << reply.error.description();
    return share;
  }
  NSError shareable(const std::string &path) {
    Once<bool, NSError> answer("shareable " + path);
    session()->checkIfItemIsShareableWithInode(device.keld.number(path), answer.completion());
    EXPECT_EQ(answer.value<0>(), !answer.value<1>());
    return answer.value<1>();
  }
  std::tuple<NSURL, NSError> container(const std::string &identifier, bool recreates) {
    Once<NSURL, NSError> answer("container " + identifier);
    session()->getContainerURLForID(identifier, recreates, answer.completion());
    return answer.values();
  }
};

TEST_F(KnownSharesTest, aSharedFolderAndAllBelowItAreShownAsShared) {
  sentFolder("Plans/deep");
  sentDocument("Plans/deep/a");
  sentDocument("letter");
  EXPECT_FALSE(device.keld.item("Plans")->fields().isShared);
  const auto before = device.keld.item("Plans")->fields().changeRank;
  shared("Plans");
  for (const char *path : {"Plans", "Plans/deep", "Plans/deep/a"}) EXPECT_TRUE(isShown(path, true)) << path;
  EXPECT_FALSE(device.keld.item("letter")->fields().isShared);
  EXPECT_GT(device.keld.item("Plans")->fields().changeRank, before);
  device.keld.rename("letter", "Plans/letter");
  ASSERT_TRUE(device.knowsSoon("Plans/letter"));
  EXPECT_TRUE(isShown("Plans/letter", true));
}

TEST_F(KnownSharesTest, aShareOfAnotherDeviceComesWithTheFeedAndGoesWithIt) {
  sentFolder("Plans");
  sentDocument("Plans/a");
  const CKShare share = sharedElsewhere("Plans");
  EXPECT_TRUE(isShown("Plans", true));
  EXPECT_TRUE(isShown("Plans/a", true));
  CKModifyRequest request;
  request.recordsToDelete.push_back({share.recordID, ""});
  ASSERT_FALSE(open("anna", "other")->modifyRecords(request, {}).error);
  EXPECT_TRUE(isShown("Plans", false));
  EXPECT_TRUE(isShown("Plans/a", false));
}

TEST_F(KnownSharesTest, optionsAreAnsweredOffline) {
  sentFolder("Plans/deep");
  sentDocument("Plans/deep/a");
  shared("Plans");
  shared("Plans/deep/a");
  cloud->onEveryCall(failing(CKErrorCode::networkUnavailable));
  EXPECT_TRUE(optionsBecome("Plans", {true, false, true, "Plans"}));
  EXPECT_TRUE(optionsBecome("Plans/deep", {true, false, false, "Plans"}));
  EXPECT_TRUE(optionsBecome("Plans/deep/a", {true, false, true, "Plans"}));
  device.keld.write("letter");
  ASSERT_TRUE(device.knowsSoon("letter"));
  EXPECT_TRUE(optionsBecome("letter", {false, false, false, std::nullopt}));
}

TEST_F(KnownSharesTest, optionsOfWhatIsntThereAreErrors) {
  const auto errorOf = [&](const std::string &identifier) {
    Once<bool, bool, bool, std::optional<std::string>, NSError> answer("options");
    session()->getShareOptionsOfItemIdentifier(identifier, answer.completion());
    EXPECT_FALSE(answer.value<0>());
    return answer.value<4>();
  };
  EXPECT_TESSALY_ERROR(errorOf("d123456"), QVErrorNoSuchItem);
  EXPECT_TESSALY_ERROR(errorOf("what"), QVErrorInvalidArgument);
}

TEST_F(KnownSharesTest, sharesSurviveARestartAndANewItemDatabase) {
  sentFolder("Plans");
  sentDocument("Plans/a");
  shared("Plans");
  ASSERT_TRUE(isShown("Plans", true));
  device.keld.stop();
  for (const char *suffix : {"", "-wal", "-shm"})
    std::filesystem::remove(device.keld.databasePath() + suffix);
  device.keld.start();
  ASSERT_TRUE(device.knowsSoon("Plans/a"));
  EXPECT_TRUE(isShown("Plans/a", true));
}

TEST_F(KnownSharesTest, refreshingAsksTheCloud) {
  sentFolder("Plans");
  const auto identifier =
      FileObjectID(device.keld.number("Plans"), NSFileProviderItemKind::folder).asString();
  const auto refresh = [&](const std::string &asked) {
    Once<NSError> answer("refresh");
    session()->refreshSharingStateForItemIdentifier(asked, answer.completion());
    return answer.value<0>();
  };
  EXPECT_FALSE(refresh(identifier)) << "it isn't shared";
  sharedElsewhere("Plans");
  EXPECT_FALSE(refresh(identifier));
  EXPECT_TRUE(options("Plans").isShared);
  EXPECT_TESSALY_ERROR(refresh("i999999"), QVErrorNoSuchItem);
  cloud->onEveryCall(Call::fetchZoneChanges, failing(CKErrorCode::serviceUnavailable));
  EXPECT_CLOUD_ERROR(refresh(identifier), serviceUnavailable);
}

TEST_F(KnownSharesTest, foldersInTheCloudMayBeShared) {
  sentFolder("Plans");
  EXPECT_FALSE(shareable("Plans"));
  EXPECT_TESSALY_ERROR(shareable(""), QVErrorNotShareable);
  EXPECT_TESSALY_ERROR(shareable("nothing"), QVErrorNoSuchItem);
  cloud->onEveryCall(Call::modifyRecords, failing(CKErrorCode::networkUnavailable));
  device.keld.folder("New");
  ASSERT_TRUE(device.knowsSoon("New"));
  const NSError error = shareable("New");
  EXPECT_TESSALY_ERROR(error, QVErrorNotShareable);
  EXPECT_NE(error.localizedDescription().find("cloud"), std::string::npos);
}

TEST_F(KnownSharesTest, documentsAreResolvedToTheirRecords) {
  sentFolder("Plans");
  sentDocument("letter");
  const auto document = QVFileObjectID::documentID(device.keld.number("letter"));
  const auto plans = QVFileObjectID::folderOrAliasID(device.keld.number("Plans"));
  Once<std::map<QVFileObjectID, CKRecordID>, NSError> answer("records");
  session()->resolveFileObjectIDsToContentRecordIDs({document, plans, QVFileObjectID::documentID(999999)},
                                                    answer.completion());
  EXPECT_FALSE(answer.value<1>());
  EXPECT_EQ(answer.value<0>(), (std::map<QVFileObjectID, CKRecordID>{{document, recordOf("letter")}}));
}

TEST_F(KnownSharesTest, containersAreFoundAndMade) {
  const auto [known, none] = container(QVUbiquitousDefaultContainerID, false);
  EXPECT_EQ(known, url("")) << none.description();
  EXPECT_TESSALY_ERROR(std::get<1>(container("org.example.writer", false)), QVErrorNoSuchItem);
  const auto [made, error] = container("org.example.writer", true);
  ASSERT_FALSE(error) << error.description();
  EXPECT_EQ(made.path(), device.keld.documents("org.example.writer"));
  EXPECT_TRUE(std::filesystem::is_directory(made.path()));
  EXPECT_TRUE(device.keld.daemon().containers()->byID("org.example.writer"));
  for (const char *wrong : {"", "..", "plain", "a.b/c", ".hidden.x"})
    EXPECT_TESSALY_ERROR(std::get<1>(container(wrong, true)), QVErrorInvalidArgument);
}

}  // namespace
}  // namespace droxa::keld
