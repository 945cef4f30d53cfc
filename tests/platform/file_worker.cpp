// Works on files as another process: file_worker LOCKFILE COMMAND ARGUMENT…
//   read PATH, write PATH       takes the access, says "held", and holds it until its input ends
//   count PATH FILE TIMES       adds 1 to the number in FILE so often, each time under a write of PATH

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <string>
#include <vector>

#include "platform/foundation/NSFileCoordinator.h"

namespace {

using namespace droxa;

std::unique_ptr<NSFileAccess> take(const std::string &path, bool isWriting) {
  NSError error;
  auto access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {{NSURL::fileURLWithPath(path), isWriting}}, nullptr, &error);
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

}  // namespace

int main(int argc, char **argv) {
  const std::vector<std::string> arguments(argv + 1, argv + argc);
  if (arguments.size() < 3) return 2;
  NSFileCoordinator::setDefaultForTesting(std::make_shared<NSFileCoordinator>(arguments[0]));
  const std::string &command = arguments[1];
  if (command == "read" || command == "write") return hold(arguments[2], command == "write");
  if (command == "count") return count(arguments[2], arguments.at(3), std::stoi(arguments.at(4)));
  return 2;
}
