// droxa-thumbnailer makes keld's thumbnails, each in a process that can do nothing else.

#include <cstring>
#include <iostream>
#include <sys/socket.h>

#include "keld/thumbnails/maker/Makers.h"

namespace droxa::keld {
namespace {

std::string make(const MakerJob &job) {
  return job.kind == MakerKind::page ? MakePageThumbnail(job) : MakeImageThumbnail(job);
}

bool isSocket(int descriptor) {
  int type = 0;
  socklen_t size = sizeof type;
  return ::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &size) == 0;
}

int run(int argc, char **argv) {
  if (argc > 3 && std::strcmp(argv[1], "--print") == 0) return PrintFileOf(argv + 3, argv[2]);
  if (argc != 1 || !isSocket(kMakerSocket)) {
    std::cerr << "droxa-thumbnailer is started by keld; it does nothing by itself\n";
    return 2;
  }
  if (!PrepareImageMaker()) {
    std::cerr << "droxa-thumbnailer: the image library can't be set up\n";
    return 1;
  }
  return ServeThumbnails(kMakerSocket, &make);
}

}  // namespace
}  // namespace droxa::keld

int main(int argc, char **argv) {
  return droxa::keld::run(argc, argv);
}
