#include <array>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>
#include <utility>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/Materialising.h"
#include "cli/Text.h"
#include "tessaly/QVUbiquitousItems.h"

namespace droxa {

namespace {

constexpr std::size_t kPiece = 256UL * 1024;
constexpr int kMostTries = 5;

// Closes a descriptor at the end of a scope.
class Opened {
 public:
  explicit Opened(int number) : number_(number) {}
  ~Opened() {
    if (number_ >= 0) close(number_);
  }
  Opened(Opened &&other) noexcept : number_(std::exchange(other.number_, -1)) {}
  Opened(const Opened &) = delete;
  Opened &operator=(const Opened &) = delete;
  int number() const { return number_; }

 private:
  int number_;
};

// An open document can't be let go of, but it may have been before it was opened: then it is fetched again.
Opened openMaterialised(CommandContext &context, const ContentsArgument &contents, NSError *error) {
  for (int tries = 0; tries < kMostTries; ++tries) {
    const Materialised here = materialise(context, contents, {});
    *error = here.error;
    if (here.error) return Opened(-1);
    Opened file(open(here.url.path().c_str(), O_RDONLY | O_CLOEXEC));
    if (file.number() < 0 && errno != ENOENT) {
      *error = NSError::errorWithPOSIXCode(errno);
      return Opened(-1);
    }
    if (file.number() >= 0 && !qv_isDataless(here.url)) return file;
  }
  *error = NSError::errorWithPOSIXCode(EBUSY, "something lets go of its contents again and again");
  return Opened(-1);
}

int print(CommandContext &context, const ContentsArgument &contents) {
  if (contents.isFolder) {
    context.err << "droxa: " << escapedText(contents.argument)
                << ": it is a folder; `droxa download` fetches what is in it" << std::endl;
    return kExitFailure;
  }
  NSError error;
  const Opened file = openMaterialised(context, contents, &error);
  if (error) return reportError(context, contents.argument, error);
  std::vector<char> piece(kPiece);
  for (;;) {
    const ssize_t length = read(file.number(), piece.data(), piece.size());
    if (length < 0 && errno == EINTR) continue;
    if (length < 0) return reportError(context, contents.argument, NSError::errorWithPOSIXCode(errno));
    if (length == 0) break;
    // Nobody reads any more: main() ends as any command of a pipe does.
    if (!context.out.write(piece.data(), length)) return kExitFailure;
  }
  context.out.flush();
  return kExitSuccess;
}

}  // namespace

int runCat(CommandContext &context, const std::vector<std::string> &arguments) {
  return forEachContents(context, arguments,
                         [&](const ContentsArgument &contents) { return print(context, contents); });
}

}  // namespace droxa
