#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace droxa::testing {

using namespace std::chrono_literals;

// Waits until `condition` holds; false when the deadline passed first.
bool eventually(const std::function<bool()> &condition, std::chrono::milliseconds deadline = 20s);

// A child process, its standard output and error collected in a file each. Killed and reaped by the
// destructor. Thread contract: one thread.
class Process {
 public:
  // `arguments[0]` is the program's path.
  Process(std::vector<std::string> arguments, std::string outputFolder, std::string name);
  ~Process();
  Process(const Process &) = delete;
  Process &operator=(const Process &) = delete;

  pid_t pid() const { return pid_; }
  bool isRunning();
  void signal(int number);
  // The exit status (128 + signal for a killed one); nullopt when it still runs at the deadline.
  std::optional<int> wait(std::chrono::milliseconds deadline = 30s);
  std::string output() const;
  std::string errors() const;

 private:
  pid_t pid_ = -1;
  std::optional<int> status_;
  const std::string outputPath_;
  const std::string errorPath_;
};

struct Result {
  int status = -1;  // -1: still running at the deadline, and killed
  std::string output;
  std::string errors;
};

std::string readFile(const std::string &path);
void writeFile(const std::string &path, std::string_view contents);

}  // namespace droxa::testing
