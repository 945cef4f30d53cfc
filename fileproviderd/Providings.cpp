#include "fileproviderd/Providings.h"

#include <optional>
#include <utility>
#include <vector>

namespace droxa {

namespace {

constexpr int kAttempts = 2;

}  // namespace

// Thread contract: any thread.
class Providings::Client final : public FPDProviding {
 public:
  Client(std::shared_ptr<Providings> providings, std::string path, std::uint64_t number)
      : providings_(std::move(providings)), path_(std::move(path)), number_(number) {}
  ~Client() override { cancel(); }
  Client(const Client &) = delete;
  Client &operator=(const Client &) = delete;

  void waitWithReply(NSFileProviderErrorCompletion completion) override {
    NSError error;
    {
      const Lock held(lock_);
      if (!outcome_) {
        waiting_.push_back(std::move(completion));
        return;
      }
      error = *outcome_;
    }
    completion(error);
  }
  void getProgress(FPDProgressCompletion completion) override {
    providings_->askForProgress(path_, completion);
  }
  void cancel() override {
    if (end(NSError(NSCocoaErrorDomain, NSUserCancelledError))) providings_->leave(path_, number_);
  }
  // False when it has ended before.
  bool end(const NSError &error) {
    std::vector<NSFileProviderErrorCompletion> answered;
    {
      const Lock held(lock_);
      if (outcome_) return false;
      outcome_ = error;
      answered.swap(waiting_);
    }
    for (const NSFileProviderErrorCompletion &completion : answered) completion(error);
    return true;
  }

 private:
  const std::shared_ptr<Providings> providings_;
  const std::string path_;
  const std::uint64_t number_;
  Mutex lock_;
  std::optional<NSError> outcome_ GUARDED_BY(lock_);
  std::vector<NSFileProviderErrorCompletion> waiting_ GUARDED_BY(lock_);
};

Providings::Providings(std::shared_ptr<ExtensionCalls> calls) : calls_(std::move(calls)) {}

std::shared_ptr<FPDProviding> Providings::start(const NSURL &url, std::uint64_t readingOptions) {
  const std::string &path = url.path();
  std::shared_ptr<Client> client;
  bool isFirst = false;
  {
    const Lock held(lock_);
    client = std::make_shared<Client>(shared_from_this(), path, ++lastClient_);
    Entry &entry = entries_[path];
    isFirst = !entry.url;
    if (isFirst) entry.url = url;
    entry.readingOptions |= readingOptions;
    entry.clients[lastClient_] = client;
  }
  if (isFirst) begin(path);
  return client;
}

std::size_t Providings::pathsUnderWay() const {
  const Lock held(lock_);
  return entries_.size();
}

void Providings::begin(const std::string &path) {
  NSURL url;
  std::uint64_t options = 0;
  {
    const Lock held(lock_);
    url = entries_.at(path).url;
    options = entries_.at(path).readingOptions;
  }
  calls_->startProvidingItemAtURL(
      url, options, [self = shared_from_this(), path](const auto &providing, const NSError &error) {
        self->begun(path, providing, error);
      });
}

void Providings::begun(const std::string &path, const std::shared_ptr<FPDProviding> &providing,
                       const NSError &error) {
  if (!providing) return ended(path, error);
  bool isCancelled = false;
  {
    const Lock held(lock_);
    Entry &entry = entries_.at(path);
    entry.providing = providing;
    isCancelled = entry.isCancelled;
  }
  if (isCancelled) providing->cancel();
  const auto self = shared_from_this();
  NSXPCProxyWithErrorHandler<FPDProviding>(providing, [self, path](const NSError &failure) {
    self->cutOff(path, failure);
  })->waitWithReply([self, path](const NSError &outcome) { self->ended(path, outcome); });
}

void Providings::cutOff(const std::string &path, const NSError &error) {
  std::shared_ptr<FPDProviding> released;
  bool isStartedAgain = false;
  {
    const Lock held(lock_);
    Entry &entry = entries_.at(path);
    released.swap(entry.providing);
    isStartedAgain = !entry.isCancelled && isConnectionGone(error) && ++entry.ends < kAttempts;
  }
  if (isStartedAgain) return begin(path);
  ended(path, calls_->cutOffError(error));
}

void Providings::ended(const std::string &path, const NSError &error) {
  std::map<std::uint64_t, std::weak_ptr<Client>> told;
  std::shared_ptr<FPDProviding> released;
  bool isWantedAgain = false;
  {
    const Lock held(lock_);
    Entry &entry = entries_.at(path);
    released.swap(entry.providing);
    // Who came after the last one had gone has waited for this.
    isWantedAgain = entry.isCancelled && !entry.clients.empty();
    entry.isCancelled = false;
    entry.ends = 0;
    if (!isWantedAgain) {
      told.swap(entry.clients);
      entries_.erase(path);
    }
  }
  if (isWantedAgain) return begin(path);
  for (const auto &[number, weak] : told)
    if (const auto client = weak.lock()) client->end(error);
}

void Providings::leave(const std::string &path, std::uint64_t client) {
  std::shared_ptr<FPDProviding> cancelled;
  {
    const Lock held(lock_);
    const auto found = entries_.find(path);
    if (found == entries_.end() || found->second.clients.erase(client) == 0) return;
    if (!found->second.clients.empty()) return;
    found->second.isCancelled = true;
    cancelled = found->second.providing;
  }
  if (cancelled) cancelled->cancel();
}

void Providings::askForProgress(const std::string &path, const FPDProgressCompletion &completion) {
  std::shared_ptr<FPDProviding> providing;
  {
    const Lock held(lock_);
    if (const auto found = entries_.find(path); found != entries_.end()) providing = found->second.providing;
  }
  if (!providing) return completion(0, -1);
  NSXPCProxyWithErrorHandler<FPDProviding>(providing, [completion](const NSError &) {
    completion(0, -1);
  })->getProgress(completion);
}

}  // namespace droxa
