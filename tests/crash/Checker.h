#pragma once

#include <array>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "platform/cloudkit/CKCloud.h"
#include "tests/crash/CrashDevice.h"
#include "tests/crash/Model.h"
#include "tests/crash/ReplicaReading.h"

namespace droxa::crash {

// Compares both replicas, both devices' databases and the cloud with the model when all has settled, by code
// that shares nothing with the daemon's. Each deviation is a finding of the model. Thread contract: one
// thread.
class Checker {
 public:
  Checker(std::array<CrashDevice *, 2> devices, std::shared_ptr<CKCloud> cloud, Model &model)
      : devices_(devices), cloud_(std::move(cloud)), model_(model) {}

  // Both daemons run, and nothing is under way.
  void check();

 private:
  void checkDataless(CrashDevice &device, const Tree &tree);
  void checkContents(CrashDevice &device, const Tree &tree);
  void checkNames(CrashDevice &device, const Tree &tree);
  void checkDatabases(CrashDevice &device);
  void checkItemDatabase(CrashDevice &device, const Tree &tree);
  void checkSyncDatabase(CrashDevice &device, const Tree &tree);
  void checkCloud(const Tree &tree);
  void finding(const CrashDevice &device, const std::string &text);

  const std::array<CrashDevice *, 2> devices_;
  const std::shared_ptr<CKCloud> cloud_;
  Model &model_;
  std::vector<std::string> found_;  // in one device's databases
};

// What two trees differ in, a line each; "" when they are alike. Contents aren't looked at.
std::string Difference(const Tree &one, const Tree &other);

}  // namespace droxa::crash
