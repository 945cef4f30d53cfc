#pragma once

#include <condition_variable>
#include <map>
#include <string>
#include <sys/mman.h>
#include <unistd.h>
#include <vector>

#include "keld/thumbnails/Thumbnailer.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// Makes "thumbnail of <contents>" of JPEG documents, refuses those whose contents begin with "hostile", and
// can be held up. Thread contract: any thread.
class ScriptedThumbnailer final : public Thumbnailer {
 public:
  bool canMake(const std::string &mimeType) override { return mimeType == "image/jpeg"; }

  ThumbnailResult make(int contents, const std::string &, const CKCancellation &cancellation) override {
    std::string text(4096, '\0');
    const ssize_t count = ::pread(contents, text.data(), text.size(), 0);
    text.resize(count < 0 ? 0 : static_cast<std::size_t>(count));
    {
      const Lock lock(mutex_);
      ++asked_[text];
    }
    while (isHeld() && !cancellation.isCancelled())
      (void)cancellation.waitUntil(std::chrono::steady_clock::now() + std::chrono::milliseconds(5));
    ThumbnailResult result;
    result.outcome = ThumbnailResult::Outcome::cancelled;
    if (cancellation.isCancelled()) return result;
    result.outcome = ThumbnailResult::Outcome::refused;
    result.why = "it is hostile";
    if (text.rfind("hostile", 0) == 0) return result;
    const std::string made = "thumbnail of " + text;
    result.outcome = ThumbnailResult::Outcome::made;
    result.png = OwnedDescriptor(::memfd_create("thumbnail", MFD_CLOEXEC));
    result.size = made.size();
    if (::pwrite(result.png.get(), made.data(), made.size(), 0) < 0) result = ThumbnailResult();
    return result;
  }

  void hold(bool isHeld) {
    const Lock lock(mutex_);
    isHeld_ = isHeld;
  }
  bool isHeld() {
    const Lock lock(mutex_);
    return isHeld_;
  }
  unsigned asked(const std::string &contents) {
    const Lock lock(mutex_);
    return asked_[contents];
  }

 private:
  Mutex mutex_;
  bool isHeld_ GUARDED_BY(mutex_) = false;
  std::map<std::string, unsigned> asked_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
