// A thumbnailer whose maker was taken over: it does what the contents say. What it manages to do although it
// mustn't, it says.

#include <array>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <map>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "keld/thumbnails/maker/Serving.h"

namespace droxa::keld {
namespace {

std::string told(const MakerJob &job) {
  std::array<char, 4096> text{};
  const ssize_t count = ::pread(job.contents, text.data(), text.size(), 0);
  return {text.data(), static_cast<std::size_t>(count < 0 ? 0 : count)};
}

[[noreturn]] void spin() {
  volatile bool goesOn = true;
  while (goesOn) {
  }
  std::abort();
}

[[noreturn]] void hang() {
  for (;;) ::sleep(1000);
}

std::string allocate() {
  std::vector<std::string> hoard;
  for (;;) hoard.emplace_back(std::size_t{16} << 20, 'x');
}

[[noreturn]] void writeForEver(int output) {
  const std::string bytes(1 << 16, 'T');
  while (::write(output, bytes.data(), bytes.size()) > 0) {
  }
  hang();
}

std::string reportOf(bool isDone, const char *what) {
  return std::string(isDone ? "could " : "could not ") + what;
}

bool canFork() {
  const pid_t child = ::fork();
  if (child == 0) _exit(0);
  if (child > 0) ::waitpid(child, nullptr, 0);
  return child > 0;
}

bool canExecute() {
  std::string program = "/bin/true";
  std::array<char *, 2> words{program.data(), nullptr};
  ::execv(program.c_str(), words.data());
  return false;  // otherwise there is nobody left to say so
}

bool canConnect() {
  return ::socket(AF_INET, SOCK_STREAM, 0) >= 0 || ::socket(AF_UNIX, SOCK_STREAM, 0) >= 0;
}

bool canOpen(const std::string &path, int flags) {
  return ::open(path.c_str(), flags | O_CLOEXEC, 0600) >= 0;
}

std::string obey(const MakerJob &job) {
  const std::string order = told(job);
  const std::size_t space = order.find(' ');
  const std::string verb = order.substr(0, space);
  const std::string object = space == std::string::npos ? "" : order.substr(space + 1);
  if (verb == "spin") spin();
  if (verb == "hang") hang();
  if (verb == "allocate") return allocate();
  if (verb == "write") writeForEver(job.output);
  if (verb == "crash") ::raise(SIGSEGV), __builtin_trap();
  if (verb == "exit") _exit(0);
  if (verb == "print") return object;
  if (verb == "refuse") throw MakerRefusal(object);
  if (verb == "fork") throw MakerRefusal(reportOf(canFork(), "fork"));
  if (verb == "execute") throw MakerRefusal(reportOf(canExecute(), "execute"));
  if (verb == "connect") throw MakerRefusal(reportOf(canConnect(), "connect"));
  if (verb == "kill") throw MakerRefusal(reportOf(::kill(::getppid(), SIGKILL) == 0, "kill"));
  if (verb == "read") throw MakerRefusal(reportOf(canOpen(object, O_RDONLY), "read"));
  if (verb == "create") throw MakerRefusal(reportOf(canOpen(object, O_WRONLY | O_CREAT), "create"));
  throw MakerRefusal("unknown order");
}

}  // namespace
}  // namespace droxa::keld

int main() {
  return droxa::keld::ServeThumbnails(droxa::keld::kMakerSocket, &droxa::keld::obey);
}
