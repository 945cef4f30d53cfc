// An application that uses the share operations of an item, as a process of its own:
// system_share_client HOME PATH COMMAND [COUNT [AT ONCE]]
//
//   calls         makes each of the twelve calls and prints its name, and the error's domain, code and text
//   ask           makes calls of all kinds until SIGTERM, also when what it talks to goes away; then waits
//                 for all answers, and fails unless each call had exactly one
//   write COUNT   saves the share of the item with the titles COUNT, COUNT+1, …, until SIGTERM: "tried N"
//                 before, "saved N" once the cloud has it
//   crowd COUNT AT_ONCE  that many processes that connect, call and die, so many at a time
//   hoard COUNT   asks for that many endpoints, tells how many it got, and keeps them
//   deaf COUNT    makes that many calls whose replies it never reads
//   mute COUNT    begins that many operations, and never returns from what it is told of them

#include <cstdlib>
#include <map>
#include <string>

#include "tests/system/client/Commands.h"

int main(int argc, char *argv[]) {
  using namespace droxa::testing;
  const std::map<std::string, int (*)(const ClientArguments &)> commands = {
      {"calls", runCalls}, {"ask", runAsk},   {"write", runWrite}, {"crowd", runCrowd},
      {"hoard", runHoard}, {"deaf", runDeaf}, {"mute", runMute}};
  const auto found = argc > 3 ? commands.find(argv[3]) : commands.end();
  if (found == commands.end()) return 2;
  return found->second(
      {argv[1], argv[2], argc > 4 ? std::atoi(argv[4]) : 0, argc > 5 ? std::atoi(argv[5]) : 1});
}
