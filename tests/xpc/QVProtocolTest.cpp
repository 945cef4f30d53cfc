#include <memory>
#include <vector>

#include "tessaly/xpc/QVProtocolInterface.h"
#include "tests/support/DaemonConformance.h"
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

}  // namespace

INSTANTIATE_TEST_SUITE_P(OverConnection, DaemonConformance,
                         testing::Values(maker("AtOnce", false), maker("FromAnotherThread", true)),
                         ConformanceName);
INSTANTIATE_TEST_SUITE_P(OverConnection, DaemonContentsConformance,
                         testing::Values(maker("AtOnce", false), maker("FromAnotherThread", true)),
                         ConformanceName);

}  // namespace droxa
