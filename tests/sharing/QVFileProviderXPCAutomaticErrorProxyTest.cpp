#include <gtest/gtest.h>

#include "platform/fileprovider/NSFileProviderError.h"
#include "sharing/QVFileProviderXPCAutomaticErrorProxy.h"
#include "tessaly/QVErrors.h"
#include "tests/sharing/SharingFixture.h"

namespace droxa {
namespace {

using Plain = FPXPCAutomaticErrorProxy<QVProtocol>;

class QVFileProviderXPCAutomaticErrorProxyTest : public SharingTest {
 protected:
  template <class Proxy>
  Proxy make(NSXPCErrorHandler orError = nullptr) const {
    return Proxy(
        [connection = fake.connection](NSXPCErrorHandler handler) -> std::shared_ptr<QVProtocol> {
          return connection->remoteObjectProxyWithErrorHandler(std::move(handler));
        },
        std::move(orError), "test connection", 0);
  }
  struct Answer {
    int calls = 0;
    std::optional<CKShare> share;
    NSError error;
  };
  template <class Proxy>
  Answer ask(const Proxy &proxy) const {
    Answer answer;
    proxy.call(&QVProtocol::createSharingInfoForURL,
               QVShareReply([&answer](const std::optional<CKShare> &share, const NSError &error) {
                 ++answer.calls;
                 answer.share = share;
                 answer.error = error;
               }),
               NSURL());
    return answer;
  }
};

TEST_F(QVFileProviderXPCAutomaticErrorProxyTest, errorsOfTheDaemonStayAsTheyAre) {
  daemon.sharing().setAnswers(wholeAnswers());
  const NSError failure("AnyDomain", 5);
  daemon.replies().failNext("createSharingInfoForURL", failure);
  const Answer answer = ask(make<QVFileProviderXPCAutomaticErrorProxy>());
  EXPECT_EQ(answer.calls, 1);
  EXPECT_TRUE(answer.error.isSameObject(failure));
  EXPECT_EQ(answer.share, wholeAnswers().share);
}

TEST_F(QVFileProviderXPCAutomaticErrorProxyTest, thePlainProxyReplacesErrorsOfDomainsThatClientsDontKnow) {
  daemon.replies().failNext("createSharingInfoForURL", NSError("AnyDomain", 5));
  EXPECT_TRUE(ask(make<Plain>()).error.is(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable));
  const NSError known(NSPOSIXErrorDomain, ENOSPC);
  daemon.replies().failNext("createSharingInfoForURL", known);
  EXPECT_TRUE(ask(make<Plain>()).error.isSameObject(known));
  EXPECT_FALSE(ask(make<Plain>()).error);
}

TEST_F(QVFileProviderXPCAutomaticErrorProxyTest, aFailedConnectionAnswersOnceAndTellsWhoAsksForIt) {
  const NSError lost(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  NSError told;
  fake.connection->setUnreachable(lost);
  const auto proxy =
      make<QVFileProviderXPCAutomaticErrorProxy>([&told](const NSError &error) { told = error; });
  const Answer answer = ask(proxy);
  EXPECT_EQ(answer.calls, 1);
  EXPECT_FALSE(answer.share);
  EXPECT_TRUE(answer.error.isSameObject(lost));
  EXPECT_TRUE(told.isSameObject(lost));
  EXPECT_TRUE(
      capture.contains("[ERROR] test connection failed under a call for process 0: " + lost.description()));
}

TEST_F(QVFileProviderXPCAutomaticErrorProxyTest, worksForEveryCallOfTheDaemonWhoseReplyEndsWithAnError) {
  const auto proxy = make<QVFileProviderXPCAutomaticErrorProxy>();
  int calls = 0;
  proxy.call(&QVProtocol::checkIfItemIsShareableWithInode,
             QVBoolReply([&calls](bool result, const NSError &) {
               EXPECT_TRUE(result);
               ++calls;
             }),
             std::uint64_t{4});
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(daemon.calls(), std::vector<std::string>{"checkIfItemIsShareableWithInode(4)"});
}

}  // namespace
}  // namespace droxa
