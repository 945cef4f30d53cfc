#pragma once

#include <functional>
#include <stdexcept>
#include <string>

#include "keld/thumbnails/maker/MakerProtocol.h"

namespace droxa::keld {

struct MakerJob {
  MakerKind kind = MakerKind::image;
  MakerLimits limits;
  int contents = -1;
  int output = -1;  // the pipe; for a maker that writes itself, as only tests' do
};

// There is no thumbnail of these contents; the text says why.
class MakerRefusal : public std::runtime_error {
  using std::runtime_error::runtime_error;
};

// The PNG of the contents; throws MakerRefusal. Runs confined, in a process that does nothing else.
using Maker = std::function<std::string(const MakerJob &job)>;

// Serves the socket until keld goes: each job in a process forked for it, which is confined before it looks
// at the contents. The libraries are loaded and set up by then, so that a job costs a fork. Answers the exit
// status. Thread contract: the program's only thread; none may have been started before.
int ServeThumbnails(int socket, const Maker &maker);

}  // namespace droxa::keld
