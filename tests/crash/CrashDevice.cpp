#include "tests/crash/CrashDevice.h"

#include <condition_variable>
#include <filesystem>
#include <signal.h>

#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa::crash {

namespace {

constexpr std::chrono::seconds kLongestCall{90};

// Takes the first answer of those that a call may get, and lets it be waited for.
class Answer {
 public:
  void give(const NSError &error) {
    const Lock lock(mutex_);
    if (!error_) error_ = error;
    given_.notify_all();
  }
  std::optional<NSError> wait() {
    const auto end = std::chrono::steady_clock::now() + kLongestCall;
    Lock lock(mutex_);
    while (!error_)
      if (given_.wait_until(mutex_, end) == std::cv_status::timeout) break;
    return error_;
  }

 private:
  Mutex mutex_;
  std::condition_variable_any given_;
  std::optional<NSError> error_ GUARDED_BY(mutex_);
};

}  // namespace

CrashDevice::CrashDevice(const std::string &folder, std::string name, Model &model)
    : name_(std::move(name)),
      cloud_(folder + "/cloud"),
      home_(folder + "/" + name_),
      outside_(folder + "/outside-" + name_),
      model_(model),
      connection_(std::make_shared<QVDaemonConnectionOverXPC>(home_ + "/run/keld.sock")) {
  std::filesystem::create_directories(documents());
  std::filesystem::create_directories(outside_);
  std::filesystem::create_directories(home_ + "/output");
}

void CrashDevice::start() {
  const std::vector<std::string> words{
      std::string(DROXA_BIN_DIR) + "/keld", "--home", home_, "--cloud", cloud_, "--device", name_};
  process_.reset();
  process_ = std::make_unique<testing::Process>(words, home_ + "/output", "keld" + std::to_string(runs_++));
}

void CrashDevice::kill() {
  if (!process_) return;
  if (const auto status = process_->wait(std::chrono::milliseconds(0)))
    model_.finding(name_ + ": keld ended by itself with " + std::to_string(*status) + ": " +
                   process_->errors());
  process_->signal(SIGKILL);
  process_->wait();
}

NSError CrashDevice::call(const std::string &what, const std::function<void(QVProtocol &, Done)> &start) {
  const auto answer = std::make_shared<Answer>();
  const Done done = [answer](const NSError &error) { answer->give(error); };
  const auto proxy = connection_->remoteObjectProxyWithErrorHandler(done);
  start(*proxy, done);
  const auto given = answer->wait();
  if (given) return *given;
  model_.finding(name_ + ": " + what + " didn't end");
  return NSError::errorWithPOSIXCode(ETIMEDOUT, what);
}

NSError CrashDevice::download(const std::string &path) {
  // The transfer is released, and with it the interest, when the call has ended.
  const auto kept = std::make_shared<std::shared_ptr<QVTransfer>>();
  return call("the download of " + path, [&](QVProtocol &keld, Done done) {
    keld.startDownloadAtURL(NSURL::fileURLWithPath(at(path)), QVDownloadForReader,
                            [kept, done](const std::shared_ptr<QVTransfer> &transfer, const NSError &error) {
                              if (!transfer) return done(error);
                              *kept = transfer;
                              transfer->remoteObjectProxyWithErrorHandler(done)->waitWithReply(done);
                            });
  });
}

NSError CrashDevice::evict(const std::string &path) {
  return call("the eviction of " + path, [&](QVProtocol &keld, Done done) {
    keld.evictItemAtURL(NSURL::fileURLWithPath(at(path)),
                        [done](const QVContentsResult &, const NSError &error) { done(error); });
  });
}

NSError CrashDevice::waitForUpload() {
  return call("the wait for uploads",
              [](QVProtocol &keld, Done done) { keld.waitForUploadAtURL(NSURL(), done); });
}

NSError CrashDevice::confirmDeletions() {
  return call("the word on deletions",
              [](QVProtocol &keld, Done done) { keld.confirmDeletions(true, done); });
}

NSError CrashDevice::transferStatus(QVTransferStatus *status) {
  const auto kept = std::make_shared<QVTransferStatus>();
  const NSError error = call("the transfers' status", [&](QVProtocol &keld, Done done) {
    keld.getTransferStatus([kept, done](const QVTransferStatus &told, const NSError &problem) {
      *kept = told;
      done(problem);
    });
  });
  if (!error) *status = *kept;
  return error;
}

NSError CrashDevice::daemonStatus(QVDaemonStatus *status) {
  const auto kept = std::make_shared<QVDaemonStatus>();
  const NSError error = call("the daemon's status", [&](QVProtocol &keld, Done done) {
    keld.getStatus([kept, done](const QVDaemonStatus &told, const NSError &problem) {
      *kept = told;
      done(problem);
    });
  });
  if (!error) *status = *kept;
  return error;
}

}  // namespace droxa::crash
