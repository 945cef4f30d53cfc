#pragma once

#include <cstdint>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <ostream>
#include <string>

#include "platform/foundation/NSURL.h"
#include "tessaly/QVProtocol.h"

namespace droxa {

// A daemon and the drive that it serves, as the conformance suite needs them: the drive is changed as a
// program changes files, and the daemon is asked through its protocol. A new world has the default,
// documents, desktop and trash containers and the application container `kConformanceContainer`, all empty,
// and somebody is signed in. Thread contract: the test's thread.
class DaemonWorld {
 public:
  virtual ~DaemonWorld() = default;
  virtual std::shared_ptr<QVProtocol> daemon() = 0;

  // The documents folder of a container.
  virtual NSURL documents(const std::string &containerID) = 0;
  virtual void makeFile(const NSURL &url, std::size_t size) = 0;
  // A document whose contents the cloud has and this machine doesn't; false when this world can't make one.
  virtual bool addDatalessDocument(const NSURL & /*url*/, const std::string & /*contents*/) { return false; }
  // Gives a file other contents of that size; its date becomes `seconds` since 1970.
  virtual void changeFile(const NSURL &url, std::size_t size, std::int64_t seconds) = 0;
  virtual void makeFolder(const NSURL &url) = 0;
  virtual void makeAlias(const NSURL &url, const NSURL &target) = 0;  // `target` is in the drive and exists
  virtual void makeSymbolicLink(const NSURL &url, const std::string &target) = 0;
  virtual void rename(const NSURL &from, const NSURL &to) = 0;
  virtual void remove(const NSURL &url) = 0;  // with all that is below
  // Returns when the daemon knows of everything that was done so far.
  virtual void settle() = 0;
};

inline constexpr char kConformanceContainer[] = "org.example.Sketches";

// What a suite is instantiated with:
//   INSTANTIATE_TEST_SUITE_P(Fake, DaemonConformance, testing::Values(DaemonWorldMaker{"Fake",
//   makeFakeWorld}));
struct DaemonWorldMaker {
  std::string name;
  std::function<std::unique_ptr<DaemonWorld>()> make;
};
inline void PrintTo(const DaemonWorldMaker &maker, std::ostream *out) {
  *out << maker.name;
}

}  // namespace droxa
