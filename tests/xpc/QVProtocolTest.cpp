#include <future>
#include <memory>
#include <vector>

#include "tessaly/xpc/QVProtocolInterface.h"
#include "tests/support/DaemonConformance.h"
#include "tests/support/FakeDaemon.h"
#include "tests/support/FakeDaemonWorld.h"
#include "tests/xpc/ConnectedPair.h"

// The daemon's protocol through a connection: the suite that the daemons themselves have to pass.

namespace droxa {
namespace {

// Carries a daemon over a connection that is never ended: pushes and invalidations that are under way at a
// test's end are answered, as the fake daemon expects.
std::shared_ptr<QVProtocol> overConnection(const std::shared_ptr<FakeDaemon> &daemon,
                                           bool answerFromAnotherThread) {
  daemon->replies().answerOnAnotherThread(answerFromAnotherThread);
  static auto *const pairs = new std::vector<std::unique_ptr<ConnectedPair>>;
  pairs->push_back(std::make_unique<ConnectedPair>());
  pairs->back()->serve<QVProtocol>(QVProtocolInterface(), daemon);
  return pairs->back()->client->remoteObjectProxyWithErrorHandler<QVProtocol>(
      [](const NSError &error) { ADD_FAILURE() << error.description(); });
}

DaemonWorldMaker maker(const char *name, bool answerFromAnotherThread) {
  return {name, [answerFromAnotherThread] {
            return std::make_unique<FakeDaemonWorld>(
                [answerFromAnotherThread](const std::shared_ptr<FakeDaemon> &daemon) {
                  return overConnection(daemon, answerFromAnotherThread);
                });
          }};
}

// What is asked about sharing and records: every argument and every value of the replies crosses.
struct SharingQuestions : testing::Test {
  SharingQuestions() {
    FakeSharing::Answers answers;
    answers.isShared = true;
    answers.isSharedByItself = true;
    answers.sharedFolderName = "Plans\n\xff";
    answers.url = NSURL::fileURLWithPath("/drive/Shared/Plans");
    answers.recordIDs = {{document(7), record}, {document(8), record}};
    daemon->sharing().setAnswers(answers);
  }
  static QVFileObjectID document(std::uint64_t number) { return QVFileObjectID::documentID(number); }

  const std::shared_ptr<FakeDaemon> daemon = FakeDaemon::make("/drive");
  const std::shared_ptr<QVProtocol> far = overConnection(daemon, true);
  const CKRecordID record{"a record", {"documents", "anna"}};
};

TEST_F(SharingQuestions, howAnItemIsSharedCrosses) {
  std::promise<std::string> told;
  far->getShareOptionsOfItemIdentifier(
      "i12", [&](bool isShared, bool byOthers, bool byItself, const std::optional<std::string> &name,
                 const NSError &error) {
        told.set_value(std::to_string(isShared) + std::to_string(byOthers) + std::to_string(byItself) +
                       name.value_or("nil") + error.description());
      });
  EXPECT_EQ(told.get_future().get(), "101Plans\n\xff" + NSError().description());
  EXPECT_EQ(daemon->calls(), std::vector<std::string>{"getShareOptionsOfItemIdentifier(i12)"});
}

TEST_F(SharingQuestions, aRefreshAndItsErrorCross) {
  daemon->replies().failNext("refreshSharingStateForItemIdentifier", qvc_errorNoSuchItem("i9"));
  std::promise<NSError> told;
  far->refreshSharingStateForItemIdentifier("i9", [&](const NSError &error) { told.set_value(error); });
  EXPECT_TRUE(told.get_future().get().is(QVTessalyErrorDomain, QVErrorNoSuchItem));
}

TEST_F(SharingQuestions, anAcceptedShareTellsWhereItIs) {
  std::promise<NSURL> told;
  far->acceptShareWithURL(NSURL::URLWithString("droxa-share:abc"),
                          [&](const NSURL &url, const NSError &) { told.set_value(url); });
  EXPECT_EQ(told.get_future().get().path(), "/drive/Shared/Plans");
  EXPECT_EQ(daemon->calls(), std::vector<std::string>{"acceptShareWithURL(droxa-share:abc)"});
}

TEST_F(SharingQuestions, recordsAreToldForWhatHasOne) {
  std::promise<std::map<QVFileObjectID, CKRecordID>> told;
  far->resolveFileObjectIDsToContentRecordIDs(
      {document(7), document(9)}, [&](const auto &recordIDs, const NSError &) { told.set_value(recordIDs); });
  EXPECT_EQ(told.get_future().get(), (std::map<QVFileObjectID, CKRecordID>{{document(7), record}}));
}

TEST_F(SharingQuestions, theFolderOfAContainerIsToldAndSoIsItsAbsence) {
  std::promise<NSURL> there;
  far->getContainerURLForID("com.quorva.Tessaly.documents", true,
                            [&](const NSURL &url, const NSError &) { there.set_value(url); });
  std::promise<NSError> absent;
  far->getContainerURLForID("org.example.none", false,
                            [&](const NSURL &, const NSError &error) { absent.set_value(error); });
  EXPECT_TRUE(absent.get_future().get().is(QVTessalyErrorDomain, QVErrorNoSuchItem));
  EXPECT_EQ(there.get_future().get().path(), "/drive/com.quorva.Tessaly.documents/Documents");
}

}  // namespace

INSTANTIATE_TEST_SUITE_P(OverConnection, DaemonConformance,
                         testing::Values(maker("AtOnce", false), maker("FromAnotherThread", true)),
                         ConformanceName);
INSTANTIATE_TEST_SUITE_P(OverConnection, DaemonContentsConformance,
                         testing::Values(maker("AtOnce", false), maker("FromAnotherThread", true)),
                         ConformanceName);

}  // namespace droxa
