#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "bench/RunningDrive.h"

namespace droxa::bench {

// Microseconds of calls that were made by turns: a plain one, and one through all processes.
struct Times {
  std::vector<double> plain, through;
};

double microseconds(const std::function<void()> &work);
double share(std::vector<double> times, double part);  // 0.5: the median
void printHead();
void print(const std::string &what, const Times &times);
void check(bool ok, const std::string &what);  // ends the benchmark with a message unless ok

// A person at the running drive, and a folder beside it for the plain calls. What fails ends the benchmark.
// Thread contract: one thread.
class Acting {
 public:
  using Item = std::shared_ptr<const NSFileProviderItem>;

  Acting(const std::string &home, std::string folder);
  static std::string root() { return NSFileProviderRootContainerItemIdentifier; }

  RunningDrive &drive() { return drive_; }
  std::string plain(const std::string &name) const { return plain_ + "/" + name; }
  // Waits for the action's end; null for a deletion.
  Item act(const FPDActionRequest &request);
  std::string makeFolder(const std::string &name);  // in the root; its identifier
  // Waits until the cloud has what was done, so that one measurement doesn't pay for another.
  void settle();

 private:
  RunningDrive drive_;
  const std::string plain_;
};

}  // namespace droxa::bench
