#include "tests/support/DaemonConformance.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/FakeDaemonWorld.h"

// The fake daemon answers as the real one must: at once, from a thread of its own, and through its
// connection.

namespace droxa {

namespace {

DaemonWorldMaker maker(const char *name, FakeDaemonWorld::Carry carry) {
  return {name, [carry] { return std::make_unique<FakeDaemonWorld>(carry); }};
}

std::shared_ptr<QVProtocol> fromAnotherThread(const std::shared_ptr<FakeDaemon> &daemon) {
  daemon->replies().answerOnAnotherThread(true);
  return daemon;
}

std::shared_ptr<QVProtocol> throughItsConnection(const std::shared_ptr<FakeDaemon> &daemon) {
  daemon->replies().answerOnAnotherThread(true);
  return FakeDaemonConnection(daemon).remoteObjectProxyWithErrorHandler(
      [](const NSError &error) { ADD_FAILURE() << error.description(); });
}

}  // namespace

INSTANTIATE_TEST_SUITE_P(Fake, DaemonConformance,
                         testing::Values(maker("AtOnce", nullptr),
                                         maker("FromAnotherThread", fromAnotherThread),
                                         maker("ThroughItsConnection", throughItsConnection)),
                         ConformanceName);
INSTANTIATE_TEST_SUITE_P(Fake, DaemonContentsConformance,
                         testing::Values(maker("AtOnce", nullptr),
                                         maker("FromAnotherThread", fromAnotherThread),
                                         maker("ThroughItsConnection", throughItsConnection)),
                         ConformanceName);

}  // namespace droxa
