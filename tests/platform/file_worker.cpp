// Works on files as another process: file_worker LOCKFILE COMMAND ARGUMENT…
//   read PATH, write PATH       takes the access, says "held", and holds it until its input ends
//   count PATH FILE TIMES       adds 1 to the number in FILE so often, each time under a write of PATH
//   delete-as USER PATH…        deletes them as that user
//   import-delete SOURCE FOLDER imports the source and deletes the copy, again and again
//   move ITEM A B               moves the item between the two folders, again and again
//   rename FOLDER A B           gives an item of the folder the two names in turn, again and again
//   create-delete FOLDER NAME   makes a folder and deletes it, again and again
//   storm ROOT SEED TIMES       so many random operations below ROOT; says of each when it began and ended,
//   what it was
//                               and how it ended
// Those that go on for ever say "." when they have begun.

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <iostream>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/foundation/NSFileCoordinator.h"
#include "tests/platform/StormOperation.h"

namespace {

using namespace droxa;
using Arguments = std::vector<std::string>;

NSURL url(const std::string &path) {
  return NSURL::fileURLWithPath(path);
}

std::unique_ptr<NSFileAccess> take(const std::string &path, bool isWriting) {
  NSError error;
  auto access =
      NSFileCoordinator::defaultCoordinator()->coordinateAccess({{url(path), isWriting}}, nullptr, &error);
  if (!access) std::cerr << error.description() << "\n";
  return access;
}

int hold(const std::string &path, bool isWriting) {
  const auto access = take(path, isWriting);
  if (!access) return 1;
  std::cout << "held" << std::endl;
  std::string rest;
  while (std::getline(std::cin, rest)) continue;
  return 0;
}

int count(const std::string &path, const std::string &file, int times) {
  for (int i = 0; i < times; ++i) {
    const auto access = take(path, true);
    if (!access) return 1;
    long number = 0;
    std::ifstream(file) >> number;
    std::ofstream(file) << number + 1;
  }
  return 0;
}

int deleteAs(const Arguments &arguments) {
  const auto user = static_cast<uid_t>(std::stoul(arguments.at(0)));
  if (setgid(user) != 0 || setuid(user) != 0) return 2;
  for (std::size_t i = 1; i < arguments.size(); ++i) {
    const NSError error = FPDelete(url(arguments[i]), nullptr).error;
    if (error) std::cerr << error.description() << "\n";
    if (error) return 1;
  }
  return 0;
}

// Ends only when a step fails.
int forEver(const std::vector<std::function<FPOutcome()>> &steps) {
  std::cout << "." << std::endl;
  while (true) {
    for (const auto &step : steps) {
      const NSError error = step().error;
      if (error) std::cerr << error.description() << "\n";
      if (error) return 1;
    }
  }
}

int loop(const std::string &command, const Arguments &a) {
  if (command == "import-delete") {
    const NSURL copy = url(a.at(1)).URLByAppendingPathComponent(url(a[0]).lastPathComponent());
    return forEver(
        {[&] { return FPImport(url(a[0]), url(a[1]), nullptr); }, [&] { return FPDelete(copy, nullptr); }});
  }
  if (command == "move") {
    const auto step = [&](const std::string &from, const std::string &to) {
      return FPReparent(url(from).URLByAppendingPathComponent(a[0]), url(to), std::nullopt, false, nullptr);
    };
    return forEver({[&] { return step(a.at(1), a.at(2)); }, [&] { return step(a[2], a[1]); }});
  }
  if (command == "rename") {
    const NSURL folder = url(a.at(0));
    const auto step = [&](const std::string &from, const std::string &to) {
      return FPRename(folder.URLByAppendingPathComponent(from), to, nullptr);
    };
    return forEver({[&] { return step(a.at(1), a.at(2)); }, [&] { return step(a[2], a[1]); }});
  }
  if (command == "create-delete") {
    const NSURL made = url(a.at(0)).URLByAppendingPathComponent(a.at(1));
    return forEver({[&] { return FPCreateSubFolder(url(a[0]), a[1], nullptr); },
                    [&] { return FPDelete(made, nullptr); }});
  }
  return 2;
}

int storm(const std::string &root, unsigned seed, int times) {
  StormSchedule schedule(seed);
  for (int i = 0; i < times; ++i) {
    StormOperation operation = schedule.next();
    operation.run(root);
    std::cout << operation.line() << std::endl;
  }
  return 0;
}

}  // namespace

int main(int argc, char **argv) {
  Arguments arguments(argv + 1, argv + argc);
  if (arguments.size() < 3) return 2;
  NSFileCoordinator::setDefaultForTesting(std::make_shared<NSFileCoordinator>(arguments[0]));
  const std::string command = arguments[1];
  arguments.erase(arguments.begin(), arguments.begin() + 2);
  if (command == "read" || command == "write") return hold(arguments[0], command == "write");
  if (command == "count") return count(arguments[0], arguments.at(1), std::stoi(arguments.at(2)));
  if (command == "delete-as") return deleteAs(arguments);
  if (command == "storm") {
    return storm(arguments[0], static_cast<unsigned>(std::stoul(arguments.at(1))),
                 std::stoi(arguments.at(2)));
  }
  return loop(command, arguments);
}
