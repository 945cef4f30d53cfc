#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tests/crash/DocumentText.h"

namespace droxa::crash {

// What the workload did and what it was promised. A version must be found at the end unless a later one was
// written on top of exactly it, or a file that held exactly it was deleted.
// Thread contract: any thread.
class Model {
 public:
  // A version that is about to be written, in the place of `parent`; `where` is for people.
  VersionName begin(std::optional<VersionName> parent, std::uint64_t length, const std::string &where);
  // The version's text is on the disk: written and synced.
  void acknowledge(const VersionName &version);
  void deleted(const VersionName &version, const std::string &where);

  std::optional<VersionName> byDigest(const std::string &digest) const;
  std::vector<VersionName> mustExist() const;
  std::string history(std::uint64_t document) const;  // for people: a line for each version

  // What was promised and not kept. Each is one line.
  void finding(const std::string &text);
  std::vector<std::string> findings() const;

  void note(const std::string &what);  // for people, with the time
  std::string notes() const;
  void count(const char *what);
  std::map<std::string, std::uint64_t> counts() const;

 private:
  struct Version {
    std::optional<VersionName> parent;
    std::string digest;
    std::string history;
    bool isAcknowledged = false, isSuperseded = false, isDeleted = false;
  };
  mutable Mutex mutex_;
  std::map<VersionName, Version> versions_ GUARDED_BY(mutex_);
  std::map<std::string, VersionName> digests_ GUARDED_BY(mutex_);
  std::map<std::uint64_t, std::uint64_t> newest_ GUARDED_BY(mutex_);  // by document
  std::uint64_t lastDocument_ GUARDED_BY(mutex_) = 0;
  std::string notes_ GUARDED_BY(mutex_);
  std::vector<std::string> findings_ GUARDED_BY(mutex_);
  std::map<std::string, std::uint64_t> counts_ GUARDED_BY(mutex_);
};

}  // namespace droxa::crash
