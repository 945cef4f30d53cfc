#pragma once

#include <memory>
#include <string>
#include <vector>

#include "keld/thumbnails/MakerProcess.h"
#include "keld/thumbnails/Thumbnailer.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

struct ThumbnailerOptions {
  std::string program;  // droxa-thumbnailer; "": the one beside this process's own program
  MakerLimits limits;
};

// Makes thumbnails in processes that can do nothing else. A droxa-thumbnailer is started when it is needed,
// kept for the documents that follow, and asked for one thumbnail at a time; each is made by a process of its
// own that the program forks. So contents that take over, crash or block their maker cost their own
// thumbnail. Thread contract: any thread; as many processes as there are calls under way, kept until rest().
class SandboxedThumbnailer final : public Thumbnailer {
 public:
  explicit SandboxedThumbnailer(ThumbnailerOptions options = {});
  ~SandboxedThumbnailer() override;

  bool canMake(const std::string &mimeType) override;
  ThumbnailResult make(int contents, const std::string &mimeType,
                       const CKCancellation &cancellation) override;
  void rest() override;

 private:
  MakerProcess::Outcome run(const MakerProcess::Job &job, int contents, const CKCancellation &cancellation);
  MakerProcess::Outcome runExternal(int contents, const std::string &mimeType,
                                    const CKCancellation &cancellation);
  std::unique_ptr<MakerProcess> take(std::string *problem);
  void putBack(std::unique_ptr<MakerProcess> process);
  void tell(const MakerProcess &process);

  const ThumbnailerOptions options_;
  Mutex mutex_;
  std::vector<std::unique_ptr<MakerProcess>> idle_ GUARDED_BY(mutex_);
  bool isTold_ GUARDED_BY(mutex_) = false;  // which protections there are
};

}  // namespace droxa::keld
