#pragma once

#include <linux/filter.h>
#include <vector>

#include "keld/thumbnails/maker/MakerProtocol.h"

namespace droxa::keld {

// What keeps a maker's process from doing anything but reading its contents and writing its thumbnail:
// limits, no new privileges, a filter of system calls, and rules on files. Worked out once, then put on by
// each process. Where the kernel doesn't have one of them the others hold; without rules on files no file can
// be opened at all. Thread contract: one thread.
class Sandbox {
 public:
  Sandbox();
  ~Sandbox();
  Sandbox(const Sandbox &) = delete;
  Sandbox &operator=(const Sandbox &) = delete;

  std::uint32_t protections() const { return protections_; }

  // Both in the process that is to be confined, and for good. False: what should hold doesn't, and the
  // process is to end. The limits stay over an exec.
  static bool applyLimits(const MakerLimits &limits);
  bool confine() const;

 private:
  void makeFileRules();
  void makeFilter();

  std::uint32_t protections_ = 0;
  int fileRules_ = -1;
  std::vector<sock_filter> filter_;
};

}  // namespace droxa::keld
