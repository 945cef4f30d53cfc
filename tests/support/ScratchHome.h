#pragma once

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>

#include "platform/foundation/Paths.h"

namespace droxa {

// A home of its own for a test: the process's home while it lives, empty but for its folders, removed at the
// end. Thread contract: the test's thread.
class ScratchHome final {
 public:
  ScratchHome() : before_(DroxaProcessHome()), root_(makeFolder()) {
    std::string problem;
    if (!DroxaHome(root_).create(&problem)) ADD_FAILURE() << problem;
    DroxaSetProcessHome(DroxaHome(root_));
  }
  ~ScratchHome() {
    DroxaSetProcessHome(before_);
    std::error_code ignored;
    std::filesystem::remove_all(root_, ignored);
  }
  ScratchHome(const ScratchHome &) = delete;
  ScratchHome &operator=(const ScratchHome &) = delete;

  const std::string &root() const { return root_; }
  std::string configuration() const { return DroxaHome(root_).configuration(); }
  std::string replica() const { return DroxaHome(root_).replica(); }

  // Makes a file below the home, with the folders above it. Returns its path.
  std::string write(const std::string &path, const std::string &contents) const {
    const std::string full = root_ + "/" + path;
    std::filesystem::create_directories(std::filesystem::path(full).parent_path());
    std::ofstream(full, std::ios::binary) << contents;
    return full;
  }
  std::string makeFolder(const std::string &path) const {
    std::filesystem::create_directories(root_ + "/" + path);
    return root_ + "/" + path;
  }
  std::string makeSymbolicLink(const std::string &path, const std::string &target) const {
    const std::string full = root_ + "/" + path;
    std::filesystem::create_directories(std::filesystem::path(full).parent_path());
    std::filesystem::create_symlink(target, full);
    return full;
  }

 private:
  static std::string makeFolder() {
    std::string path = std::filesystem::temp_directory_path().string() + "/droxa-test-XXXXXX";
    if (!mkdtemp(path.data())) ADD_FAILURE() << "can't make " << path;
    return path;
  }

  const DroxaHome before_;
  const std::string root_;
};

}  // namespace droxa
