#pragma once

#include <array>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/EmbeddedCloud.h"
#include "tests/crash/CrashDevice.h"
#include "tests/crash/Model.h"
#include "tests/crash/ReplicaReading.h"
#include "tests/crash/Schedule.h"

namespace droxa::crash {

// Does what a schedule says, as people and their editors would, and tells the model. Thread contract: one
// thread.
class Workload {
 public:
  Workload(std::array<CrashDevice *, 2> devices, std::shared_ptr<CKCloud> cloud, Model &model)
      : devices_(devices), cloud_(std::move(cloud)), model_(model) {}

  void perform(const Step &step);
  // Counts as deleted what came into deleted folders after they had been moved out of the drive.
  void lookAtDeletedFolders();

 private:
  // A document that is open, and the version that it holds, if it is one.
  struct Open {
    int file = -1;
    std::uint64_t inode = 0;
    bool hasContents = false;
    std::optional<VersionName> version;
    ~Open();
  };
  std::unique_ptr<Open> open(const std::string &path, int flags) const;
  std::unique_ptr<Open> read(int file) const;  // which is its own from then on

  void noteWriting(const Open &document, const std::string &path, const VersionName &name);
  void create(CrashDevice &device, const Tree &tree, const Step &step);
  bool editInPlace(CrashDevice &device, const std::string &path, const Step &step);
  bool editByTruncating(CrashDevice &device, const std::string &path, const Step &step);
  bool editByRenamingOver(CrashDevice &device, const std::string &path, const Step &step);
  void editOnBoth(const Step &step);
  void move(CrashDevice &device, const std::string &from, const std::string &folder, const std::string &name);
  void deleteDocument(CrashDevice &device, const std::string &path);
  void deleteFolder(CrashDevice &device, const std::string &path);
  void countAsDeleted(const std::string &path, const std::string &where);
  void download(CrashDevice &device, const std::string &path);
  void evict(CrashDevice &device, const std::string &path);
  void waitForUpload(CrashDevice &device);

  void performOnDocument(const Step &step, CrashDevice &device, const std::string &path, const Tree &tree);
  void performOnFolder(const Step &step, CrashDevice &device, const std::string &path, const Tree &tree);
  bool writeWhole(int file, const std::string &text) const;
  bool cloudHas(const std::string &digest, std::uint64_t size) const;

  const std::array<CrashDevice *, 2> devices_;
  const std::shared_ptr<CKCloud> cloud_;
  Model &model_;
  std::uint64_t temporaries_ = 0;
  std::vector<std::string> deletedFolders_;
};

}  // namespace droxa::crash
