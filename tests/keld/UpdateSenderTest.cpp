// What the daemon pushes of real files.

#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

namespace {

class SenderPushes : public testing::Test {
 protected:
  std::shared_ptr<QVItemNotificationSender> watch(const std::string &path,
                                                  const std::shared_ptr<RecordingReceiver> &into,
                                                  std::uint64_t options = QVWatchUpdates | QVWatchDeaths |
                                                                          QVWatchCoalesced) {
    Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
        "sender");
    drive.session()->getItemUpdateSenderWithReceiver(into, answer.completion());
    const auto sender = answer.value<0>();
    Once<NSError> standing("watch of " + path);
    sender->watchItemAtURL(NSURL::fileURLWithPath(drive.at(path)), options, standing.completion());
    EXPECT_EQ(standing.value<0>(), NSError());
    return sender;
  }

  KeldFixture drive;
  const std::shared_ptr<RecordingReceiver> receiver = std::make_shared<RecordingReceiver>();
};

}  // namespace

TEST_F(SenderPushes, watchAFolderThatIsBrandNew) {
  drive.settle();
  drive.folder("new");
  const auto sender = watch("new", receiver);
  drive.write("new/a");
  EXPECT_TRUE(receiver->waitForUpdateOfName("a"));
}

TEST_F(SenderPushes, pushManyChangesOfOneItemAsOneWhileAPushIsUnderWay) {
  drive.folder("f");
  drive.write("f/first");
  drive.write("f/second");
  drive.settle();
  const auto sender = watch("f", receiver);
  receiver->holdReplies();
  drive.write("f/first", "12");
  ASSERT_TRUE(receiver->waitForUpdateOfName("first"));
  for (int size = 2; size < 12; ++size) {
    drive.write("f/second", std::string(static_cast<std::size_t>(size), 'x'));
    drive.settle();
  }
  receiver->releaseReplies();
  ASSERT_TRUE(receiver->waitForUpdateOfName("second"));
  std::size_t pushes = 0;
  for (const auto &item : receiver->items())
    if (item->fields().filename == "second") {
      ++pushes;
      EXPECT_EQ(item->fields().documentSize, 11U);
    }
  EXPECT_EQ(pushes, 1U);
}

TEST_F(SenderPushes, pushAContainersChangeAsTheRoots) {
  drive.settle();
  const auto sender = watch("", receiver);
  std::filesystem::create_directories(drive.replica() + "/org.example.Sketches/Documents");
  EXPECT_TRUE(receiver->waitForUpdateOfName("Sketches"));
  drive.write("Desktop");
  EXPECT_TRUE(receiver->waitForUpdateOfName("Desktop (com.quorva.Tessaly.desktop)"));
}

TEST_F(SenderPushes, pushWhatWentIntoPrivateStorageAsDead) {
  drive.write("a");
  drive.settle();
  const QVFileObjectID a = QVFileObjectID::documentID(drive.number("a"));
  const auto sender = watch("", receiver);
  drive.rename("a", drive.replica() + "/" + QVUbiquitousDefaultContainerID + "/private");
  EXPECT_TRUE(receiver->waitForDeath(a));
}

TEST_F(SenderPushes, ofASubtreeSeeWhatAFolderBringsAlong) {
  drive.folder("f");
  drive.folder("g/inner");
  drive.write("g/inner/deep");
  drive.settle();
  const auto sender =
      watch("f", receiver, QVWatchUpdates | QVWatchDeaths | QVWatchSubtree | QVWatchCoalesced);
  drive.rename("g", "f/g");
  EXPECT_TRUE(receiver->waitForUpdateOfName("deep"));
  const QVFileObjectID deep = QVFileObjectID::documentID(drive.number("f/g/inner/deep"));
  drive.remove("f/g");
  EXPECT_TRUE(receiver->waitForDeath(deep));
}

TEST_F(SenderPushes, endWithTheirSession) {
  drive.settle();
  const auto session = drive.daemon().newSession();
  Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
      "sender");
  session->getItemUpdateSenderWithReceiver(receiver, answer.completion());
  Once<> boostEnded("end of the boost");
  answer.value<0>()->boostPriority(boostEnded.completion());
  EXPECT_EQ(drive.daemon().senders().count(), 1U);
  std::static_pointer_cast<KeldSession>(session)->end();
  EXPECT_TRUE(boostEnded.wait());
  EXPECT_EQ(drive.daemon().senders().count(), 0U);
}

TEST_F(SenderPushes, releaseTheirReceiverWhenInvalidated) {
  drive.settle();
  auto own = std::make_shared<RecordingReceiver>();
  const auto sender = watch("", own);
  const std::weak_ptr<RecordingReceiver> weak = own;
  own.reset();
  EXPECT_FALSE(weak.expired());
  sender->invalidate();
  EXPECT_TRUE(eventually([&] { return weak.expired(); }));
}

}  // namespace droxa::keld
