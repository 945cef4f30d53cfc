#pragma once

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>

namespace droxa {

// A folder of the test's own, removed with all that is in it.
class TemporaryFolder {
 public:
  TemporaryFolder() {
    std::string name = std::filesystem::path(::testing::TempDir()) / "droxa-XXXXXX";
    path_ = mkdtemp(name.data()) ? name : "";
    EXPECT_FALSE(path_.empty()) << "no temporary folder in " << ::testing::TempDir();
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder &) = delete;
  TemporaryFolder &operator=(const TemporaryFolder &) = delete;

  const std::string &path() const { return path_; }

  // Makes a file, and the folders above it that are missing.
  void write(const std::string &name, const std::string &contents) const {
    const std::filesystem::path file = path_ + "/" + name;
    std::filesystem::create_directories(file.parent_path());
    std::ofstream(file, std::ios::binary) << contents;
  }

 private:
  std::string path_;
};

}  // namespace droxa
