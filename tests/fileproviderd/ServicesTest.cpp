#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "fileproviderd/HostServices.h"
#include "fileproviderd/Services.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "tests/fileproviderd/ScriptedExtension.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa::testing {
namespace {

class ScriptedService final : public FPDService {
 public:
  NSXPCListenerEndpoint endpoint() const override {
    return NSXPCListenerEndpoint(open("/dev/null", O_PATH | O_CLOEXEC));
  }
};

class ServicesTest : public ::testing::Test {
 protected:
  ServicesTest() { extension->services["s d1"] = std::make_shared<ScriptedService>(); }
  struct Answer {
    int calls = 0;
    std::shared_ptr<FPDService> service;
    NSError error;
  };
  Answer open(std::int32_t process, const std::string &name = "s", const std::string &identifier = "d1") {
    Answer answer;
    services->open(name, identifier, process, [&answer](const auto &service, const NSError &error) {
      ++answer.calls;
      answer.service = service;
      answer.error = error;
    });
    EXPECT_EQ(answer.calls, 1);
    return answer;
  }

  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ScriptedConnecting> connecting = std::make_shared<ScriptedConnecting>(extension);
  const std::shared_ptr<Services> services =
      std::make_shared<Services>(std::make_shared<ExtensionCalls>(connecting));
};

TEST_F(ServicesTest, aServiceIsTheExtensionsAndHeldUntilItIsLetGoOf) {
  Answer answer = open(1);
  ASSERT_TRUE(answer.service);
  EXPECT_FALSE(answer.error);
  EXPECT_GE(answer.service->endpoint().descriptor(), 0);
  EXPECT_EQ(extension->asked.take(), "service s d1");
  const std::weak_ptr<FPDService> real = extension->services["s d1"];
  extension->services.clear();
  EXPECT_FALSE(real.expired());
  EXPECT_EQ(services->held(), 1U);
  answer.service = nullptr;
  EXPECT_TRUE(real.expired());
  EXPECT_EQ(services->held(), 0U);
}

TEST_F(ServicesTest, aClientThatAsksForTenThousandIsRefusedAndOthersAreNot) {
  std::vector<std::shared_ptr<FPDService>> kept;
  for (int index = 0; index < 10'000; ++index) {
    const Answer answer = open(7);
    if (!answer.service) {
      EXPECT_TRUE(answer.error.is(NSPOSIXErrorDomain, EMFILE));
      EXPECT_NE(answer.error.description().find("process 7 holds 32 services"), std::string::npos);
      continue;
    }
    kept.push_back(answer.service);
  }
  EXPECT_EQ(kept.size(), Services::kMostOfOneClient);
  EXPECT_EQ(extension->asked.size(), Services::kMostOfOneClient) << "the extension isn't bothered";
  EXPECT_TRUE(open(8).service);
  kept.pop_back();
  EXPECT_TRUE(open(7).service);
}

TEST_F(ServicesTest, allClientsTogetherHaveALimitToo) {
  std::vector<std::shared_ptr<FPDService>> kept;
  for (std::int32_t process = 1; kept.size() < Services::kMost; ++process)
    for (std::size_t own = 0; own < Services::kMostOfOneClient; ++own) kept.push_back(open(process).service);
  const Answer answer = open(1000);
  EXPECT_TRUE(answer.error.is(NSPOSIXErrorDomain, EMFILE));
  EXPECT_NE(answer.error.description().find("clients hold 256 services"), std::string::npos);
  kept.clear();
  EXPECT_EQ(services->held(), 0U);
  EXPECT_TRUE(open(1000).service);
}

TEST_F(ServicesTest, aFailureIsToldAndCountsForNothing) {
  extension->failure = NSError("Domain", 4);
  const Answer answer = open(1, "unknown");
  EXPECT_FALSE(answer.service);
  EXPECT_EQ(answer.error, extension->failure);
  EXPECT_EQ(services->held(), 0U);

  connecting->transportFailures = 2;
  EXPECT_TRUE(open(1).error);
  EXPECT_EQ(services->held(), 0U);
}

TEST_F(ServicesTest, anExtensionThatEndsInTheMiddleIsAskedOnceMore) {
  connecting->transportFailures = 1;
  EXPECT_TRUE(open(1).service);
}

// From the extension to the client, over the host's connection; the client is counted by its process.
TEST_F(ServicesTest, aClientsDeathReleasesItsServicesOfTheExtension) {
  const auto calls = std::make_shared<ExtensionCalls>(connecting);
  const auto control = std::make_shared<ControlService>(calls, std::make_shared<FollowedContainers>(calls),
                                                        std::make_shared<OpenListings>(), "/replica",
                                                        [] { return FPDStatus(); });
  const std::weak_ptr<FPDService> real = extension->services["s d1"];
  {
    ConnectedPair pair;
    pair.serve<FPDControlProtocol>(FPDControlInterface(), control);
    const auto remote = pair.client->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(
        [](const NSError &error) { ADD_FAILURE() << error.description(); });
    std::vector<std::shared_ptr<FPDService>> kept;
    for (std::size_t index = 0; index <= Services::kMostOfOneClient; ++index) {
      Once<std::shared_ptr<FPDService>, NSError> answer("the service");
      remote->listenerEndpointForServiceName("s", "d1", answer.completion());
      ASSERT_TRUE(eventually([&answer] { return answer.calls() == 1; }));
      if (index == Services::kMostOfOneClient) {
        EXPECT_TRUE(answer.value<1>().is(NSPOSIXErrorDomain, EMFILE));
        EXPECT_NE(answer.value<1>().description().find("process " + std::to_string(getpid()) + " holds"),
                  std::string::npos);
        continue;
      }
      ASSERT_TRUE(answer.value<0>()) << answer.value<1>().description();
      EXPECT_GE(answer.value<0>()->endpoint().descriptor(), 0);
      kept.push_back(answer.value<0>());
    }
    extension->services.clear();
    EXPECT_FALSE(real.expired());
  }
  EXPECT_TRUE(eventually([&real] { return real.expired(); }));
}

}  // namespace
}  // namespace droxa::testing
