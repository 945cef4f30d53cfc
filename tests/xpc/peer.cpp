// The other end of a connection, as a process of its own: serves a host on the socket that it inherits as
// descriptor
// 3. What it does with a call is the call's identifier: "hang" never answers, "exit" ends the process,
// anything else is answered.

#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/xpc/NSXPCConnection.h"

namespace {

class PeerHost final : public droxa::NSFileProviderHostProtocol {
 public:
  void signalEnumerator(const std::string &identifier,
                        droxa::NSFileProviderErrorCompletion completion) override {
    if (identifier == "exit") _exit(0);
    if (identifier == "hang") {
      const std::lock_guard<std::mutex> lock(mutex_);
      hanging_.push_back(std::move(completion));
      return;
    }
    completion({});
  }

 private:
  std::mutex mutex_;
  std::vector<droxa::NSFileProviderErrorCompletion> hanging_;
};

}  // namespace

int main() {
  std::mutex mutex;
  std::condition_variable ended;
  bool over = false;
  const auto connection = droxa::NSXPCConnection::connectionWithDescriptor(3);
  connection->setExportedObject<droxa::NSFileProviderHostProtocol>(droxa::NSFileProviderHostInterface(),
                                                                   std::make_shared<PeerHost>());
  connection->setInvalidationHandler([&] {
    const std::lock_guard<std::mutex> lock(mutex);
    over = true;
    ended.notify_all();
  });
  connection->resume();
  std::unique_lock<std::mutex> lock(mutex);
  ended.wait(lock, [&] { return over; });
  return 0;
}
