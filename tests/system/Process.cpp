#include "tests/system/Process.h"

#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <signal.h>
#include <spawn.h>
#include <stdexcept>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

extern char **environ;

namespace droxa::testing {

bool eventually(const std::function<bool()> &condition, std::chrono::milliseconds deadline) {
  const auto end = std::chrono::steady_clock::now() + deadline;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > end) return false;
    std::this_thread::sleep_for(5ms);
  }
  return true;
}

std::string readFile(const std::string &path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

void writeFile(const std::string &path, std::string_view contents) {
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << contents;
  file.close();
  if (!file) throw std::runtime_error("can't write " + path);
}

Process::Process(std::vector<std::string> arguments, std::string outputFolder, std::string name)
    : outputPath_(outputFolder + "/" + name + ".out"), errorPath_(outputFolder + "/" + name + ".err") {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_addopen(&actions, 1, outputPath_.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  posix_spawn_file_actions_addopen(&actions, 2, errorPath_.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  std::vector<char *> list;
  for (std::string &argument : arguments) list.push_back(argument.data());
  list.push_back(nullptr);
  const int error = posix_spawn(&pid_, list[0], &actions, nullptr, list.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) throw std::runtime_error("can't start " + arguments[0]);
}

Process::~Process() {
  if (isRunning()) {
    signal(SIGKILL);
    wait();
  }
}

bool Process::isRunning() {
  return !wait(0ms).has_value();
}

void Process::signal(int number) {
  if (!status_) kill(pid_, number);
}

std::optional<int> Process::wait(std::chrono::milliseconds deadline) {
  eventually(
      [this] {
        if (status_) return true;
        int status = 0;
        if (waitpid(pid_, &status, WNOHANG) != pid_) return false;
        status_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
        return true;
      },
      deadline);
  return status_;
}

std::string Process::output() const {
  return readFile(outputPath_);
}
std::string Process::errors() const {
  return readFile(errorPath_);
}

}  // namespace droxa::testing
