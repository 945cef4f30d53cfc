#include "tests/keld/KeldFixture.h"
#include "tests/support/ShareCalls.h"

namespace droxa::keld {
namespace {

void expectUnavailable(const NSError &error, const std::string &what) {
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorSharingUnavailable)) << what;
  EXPECT_EQ(error.localizedDescription(), "sharing isn't available") << what;
}

TEST(KeldSharing, eachOperationSaysThatThereIsNone) {
  KeldFixture fixture;
  const auto session = fixture.session();
  for (const ShareCall &call : shareCalls()) {
    int replies = 0;
    call.make(*session, nullptr, [&](const FakeSharing::Answers &values, const NSError &error) {
      ++replies;
      EXPECT_TRUE(sameAnswers(values, {})) << call.name;
      expectUnavailable(error, call.name);
    });
    EXPECT_EQ(replies, 1) << call.name;
  }
  session->checkIfItemIsShareableWithInode(1, [](bool isShareable, const NSError &error) {
    EXPECT_FALSE(isShareable);
    expectUnavailable(error, "the question");
  });
}

}  // namespace
}  // namespace droxa::keld
