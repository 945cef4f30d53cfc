// A client of the sharing operations, as a process of its own. The endpoint is descriptor 3. It makes the
// call that its argument says and tells the outcome by its exit status:
//   "privilege"  0: done, 26: refused for want of a privilege, 1: anything else
//   "hang"       says "called" on its standard output once the call is with the daemon, and waits to be
//   killed
//   "read"       opens the document that it is given by its descriptor and prints what is in it

#include <atomic>
#include <condition_variable>
#include <cstdio>
#include <mutex>
#include <string>
#include <unistd.h>

#include "platform/xpc/NSXPCListener.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVShareOperationProtocol.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"

namespace {

using namespace droxa;

class Operation final : public QVOperationClient {
 public:
  void progressCallbackWithTopic(const std::string &, const NSUserInfo &) override {}
  void setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy, const NSUserInfo &) override {
    remote_ = std::move(proxy);
    std::puts("called");
    std::fflush(stdout);
  }
  void invalidate() override {}

 private:
  std::shared_ptr<QVCancellable> remote_;
};

int statusOf(const NSError &error) {
  if (!error) return 0;
  return error.is(QVTessalyErrorDomain, QVErrorPrivilegeRequired) ? 26 : 1;
}

int printContents(const std::shared_ptr<const FPSandboxingURLWrapper> &wrapper, const NSError &error) {
  if (!wrapper || wrapper->descriptor() < 0) return error ? statusOf(error) : 1;
  char buffer[256];
  const ssize_t count = pread(wrapper->descriptor(), buffer, sizeof buffer, 0);
  if (count < 0) return 1;
  std::fwrite(buffer, 1, static_cast<std::size_t>(count), stdout);
  std::fflush(stdout);
  return 0;
}

}  // namespace

int main(int argc, char *argv[]) {
  const std::string what = argc > 1 ? argv[1] : "";
  NSError error;
  const auto connection = NSXPCConnection::connectionWithListenerEndpoint(NSXPCListenerEndpoint(3), &error);
  if (!connection) return 2;
  connection->setRemoteObjectInterface(QVCXPCSharingOperationInterface());
  connection->resume();
  const auto remote = connection->remoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(
      [](const NSError &) { _exit(3); });
  const NSURL url = NSURL::fileURLWithPath("/replica/a");
  if (what == "hang") {
    remote->startOperation_toCopySharingInfoAtURL(std::make_shared<Operation>(), url,
                                                  [](const auto &, const auto &, const auto &) { _exit(4); });
  } else if (what == "read") {
    remote->startOperation_toCopyDocumentURLForRecordID(
        nullptr, CKRecordID{"record", {"zone"}}, true,
        [](const auto &wrapper, const NSError &problem) { _exit(printContents(wrapper, problem)); });
  } else {
    remote->createSharingInfoForURL(url,
                                    [](const auto &, const NSError &problem) { _exit(statusOf(problem)); });
  }
  for (;;) pause();
}
