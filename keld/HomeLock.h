#pragma once

#include <memory>
#include <string>

namespace droxa::keld {

// Makes sure that one daemon serves a home: a locked file that tells the process identifier. The lock goes
// with the process, however it ends. Thread contract: immutable.
class HomeLock {
 public:
  // Null with `problem` naming who has it, or what went wrong.
  static std::unique_ptr<HomeLock> take(const std::string &path, std::string *problem);
  ~HomeLock();
  HomeLock(const HomeLock &) = delete;
  HomeLock &operator=(const HomeLock &) = delete;

 private:
  explicit HomeLock(int descriptor) : descriptor_(descriptor) {}
  const int descriptor_;
};

}  // namespace droxa::keld
