#include <gtest/gtest.h>

#include "extension/HostedExtension.h"
#include "extension/HostedService.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/foundation/NSFileManager.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

// Accepts everybody and exports nothing.
class ScriptedSource final : public NSFileProviderServiceSource, public NSXPCListenerDelegate {
 public:
  explicit ScriptedSource(std::string name) : name_(std::move(name)) {}
  ~ScriptedSource() override {
    if (listener_) listener_->invalidate();
  }
  std::string serviceName() const override { return name_; }
  std::optional<NSXPCListenerEndpoint> makeListenerEndpointAndReturnError(NSError *error) override {
    if (failure) {
      *error = failure;
      return std::nullopt;
    }
    listener_ = NSXPCListener::anonymousListener(error);
    listener_->setDelegate(delegate);
    listener_->resume();
    return listener_->endpoint();
  }
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &,
                                         const std::shared_ptr<NSXPCConnection> &) override {
    return false;
  }

  NSError failure;
  std::weak_ptr<NSXPCListenerDelegate> delegate;

 private:
  const std::string name_;
  std::shared_ptr<NSXPCListener> listener_;
};

using Service = std::shared_ptr<FPDService>;

class HostedServiceTest : public testing::Test {
 protected:
  std::shared_ptr<ScriptedSource> addSource(const std::string &name) {
    auto source = std::make_shared<ScriptedSource>(name);
    source->delegate = source;
    principal->sources.push_back(source);
    return source;
  }
  static bool canConnect(const NSXPCListenerEndpoint &endpoint) {
    const auto connection = NSXPCConnection::connectionWithListenerEndpoint(endpoint, nullptr);
    if (connection) connection->invalidate();
    return connection != nullptr;
  }

  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  const std::shared_ptr<HostedExtension> extension = std::make_shared<HostedExtension>(principal);
};

TEST_F(HostedServiceTest, theSourceOfThatNameMakesTheEndpoint) {
  addSource("one");
  addSource("two");
  Once<Service, NSError> answer("the service");
  extension->listenerEndpointForServiceName("two", "d1", answer.completion());
  ASSERT_TRUE(answer.value<0>());
  EXPECT_TRUE(canConnect(answer.value<0>()->endpoint()));
  EXPECT_EQ(principal->log.calls(), std::vector<std::string>{"services d1"});
}

TEST_F(HostedServiceTest, aServiceThatIsntOfferedIsNamedInTheError) {
  addSource("one");
  Once<Service, NSError> answer("the service");
  extension->listenerEndpointForServiceName("three", "d1", answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSCocoaErrorDomain, NSFeatureUnsupportedError));
  EXPECT_EQ(answer.value<1>().localizedDescription(), "there is no service three on the item d1");
}

TEST_F(HostedServiceTest, anEndpointThatCantBeMadeIsAnError) {
  addSource("one")->failure = NSError(NSPOSIXErrorDomain, EMFILE);
  Once<Service, NSError> answer("the service");
  extension->listenerEndpointForServiceName("one", "d1", answer.completion());
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSPOSIXErrorDomain, EMFILE));
}

TEST_F(HostedServiceTest, overAConnectionTheSourceLivesAsLongAsTheHostHoldsTheService) {
  std::weak_ptr<ScriptedSource> source = addSource("one");
  ConnectedPair pair;
  pair.serve<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(), extension);
  const auto remote = pair.client->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
      [](const NSError &error) { ADD_FAILURE() << error.description(); });
  Service held;
  {
    Once<Service, NSError> answer("the service");
    remote->listenerEndpointForServiceName("one", "d1", answer.completion());
    ASSERT_TRUE(eventually([&answer] { return answer.calls() == 1; }));
    held = answer.value<0>();
  }
  ASSERT_TRUE(held);
  principal->sources.clear();
  EXPECT_FALSE(source.expired());
  const NSXPCListenerEndpoint endpoint = held->endpoint();
  EXPECT_TRUE(canConnect(endpoint));
  held = nullptr;
  EXPECT_TRUE(eventually([&source] { return source.expired(); }));
  EXPECT_TRUE(eventually([&endpoint] { return !canConnect(endpoint); }));
}

TEST_F(HostedServiceTest, theSourceGoesWithAHostThatDies) {
  std::weak_ptr<ScriptedSource> source = addSource("one");
  Service held;
  {
    ConnectedPair pair;
    pair.serve<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(), extension);
    Once<Service, NSError> answer("the service");
    pair.client->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>([](const NSError &) {})
        ->listenerEndpointForServiceName("one", "d1", answer.completion());
    ASSERT_TRUE(eventually([&answer] { return answer.calls() == 1; }));
    held = answer.value<0>();
    principal->sources.clear();
  }
  EXPECT_TRUE(eventually([&source] { return source.expired(); }));
  EXPECT_TRUE(eventually([&held] { return !canConnect(held->endpoint()); }));
}

}  // namespace
}  // namespace droxa
