#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// A host whose one operation does what the test says. The simplest exported object there is.
// Thread contract: any thread.
class ScriptedHost final : public NSFileProviderHostProtocol {
 public:
  using Script = std::function<void(const std::string &, const NSFileProviderErrorCompletion &)>;

  explicit ScriptedHost(Script script, std::function<void()> released = nullptr)
      : script_(std::move(script)), released_(std::move(released)) {}
  ~ScriptedHost() override {
    if (released_) released_();
  }

  void signalEnumerator(const std::string &identifier, NSFileProviderErrorCompletion completion) override {
    script_(identifier, completion);
  }

  // Answers every call with nil.
  static std::shared_ptr<ScriptedHost> answering() {
    return std::make_shared<ScriptedHost>(
        [](const std::string &, const NSFileProviderErrorCompletion &completion) { completion({}); });
  }

 private:
  const Script script_;
  const std::function<void()> released_;
};

// A host that answers nobody, and keeps the replies.
// Thread contract: any thread.
class SilentHost final : public NSFileProviderHostProtocol {
 public:
  void signalEnumerator(const std::string &, NSFileProviderErrorCompletion completion) override {
    const std::lock_guard<std::mutex> lock(mutex_);
    replies_.push_back(std::move(completion));
  }
  std::size_t calls() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return replies_.size();
  }
  std::vector<NSFileProviderErrorCompletion> take() {
    const std::lock_guard<std::mutex> lock(mutex_);
    return std::exchange(replies_, {});
  }

 private:
  mutable std::mutex mutex_;
  std::vector<NSFileProviderErrorCompletion> replies_;
};

}  // namespace droxa
