#pragma once

#include <cstdint>
#include <random>
#include <string>

namespace droxa {

// One operation of a storm: several processes work on few paths at once, so that they meet often. A path is
// one below the storm's root, without a slash in front.
struct StormOperation {
  enum class Kind : std::uint8_t { create, import, rename, move, remove };
  Kind kind = Kind::create;
  std::string item;    // what it is done to; for an import, the name that comes in
  std::string folder;  // where to; "" is the root
  std::string name;    // under which name
  // How it went.
  std::int64_t began = 0;
  std::int64_t ended = 0;
  std::int64_t code = 0;  // NSCocoaErrorDomain's; 0: done

  void run(const std::string &root);
  std::string line() const;
  static StormOperation fromLine(const std::string &line);
};

class StormSchedule {
 public:
  explicit StormSchedule(unsigned seed) : random_(seed) {}
  StormOperation next();

 private:
  std::string folder();
  std::string name();
  std::minstd_rand random_;
};

}  // namespace droxa
