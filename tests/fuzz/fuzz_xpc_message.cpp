// A peer's bytes, sent to a connection that exports an extension: whatever they are, the connection ends when
// the peer has closed, and the process goes on. The input's first byte says how much of a real client's bytes
// comes before the rest of the input.

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdlib>
#include <mutex>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/foundation/NSFileManager.h"
#include "platform/oslog/os_log.h"
#include "platform/xpc/NSXPCConnection.h"

namespace {

using namespace droxa;

class Enumerator final : public NSFileProviderRemoteEnumerator {
 public:
  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override {
    completion({}, page, NSError());
  }
  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override {
    completion({}, {"d1"}, anchor, false, NSError());
  }
  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override { completion(NSData()); }
  void invalidate() override {}
};

class Providing final : public FPDProviding {
 public:
  void waitWithReply(NSFileProviderErrorCompletion completion) override { completion({}); }
  void cancel() override {}
};

class Action final : public FPDAction {
 public:
  void waitWithReply(NSFileProviderItemCompletion completion) override { completion(nullptr, {}); }
  void getProgress(FPDProgressCompletion completion) override { completion(0, -1); }
  void cancel() override {}
};

class Extension final : public NSFileProviderExtensionProtocol {
 public:
  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override {
    NSFileProviderItemFields fields;
    fields.itemIdentifier = identifier;
    completion(std::make_shared<NSFileProviderPlainItem>(fields), NSError());
  }
  void URLForItemIdentifier(const std::string &identifier, NSFileProviderURLCompletion completion) override {
    completion(NSURL::fileURLWithPath("/" + identifier));
  }
  void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) override {
    completion(url.path());
  }
  void enumeratorForContainer(const std::string &, NSFileProviderEnumeratorCompletion completion) override {
    completion(std::make_shared<Enumerator>(), NSError());
  }
  void startProvidingItemAtURL(const NSURL &, std::uint64_t, FPDProvidingCompletion completion) override {
    completion(std::make_shared<Providing>(), NSError());
  }
  void stopProvidingItemAtURL(const NSURL &, NSFileProviderErrorCompletion completion) override {
    completion({});
  }
  void itemChangedAtURL(const NSURL &, NSFileProviderErrorCompletion completion) override { completion({}); }
  void providePlaceholderAtURL(const NSURL &, NSFileProviderErrorCompletion completion) override {
    completion({});
  }
  void movingItemAtURL(const NSURL &, const NSURL &, NSFileProviderMovingCompletion completion) override {
    completion(true, {});
  }
  void performAction(const FPDActionRequest &request, FPDActionCompletion completion) override {
    if (const NSError error = FPDActionRequestError(request)) return completion(nullptr, error);
    completion(std::make_shared<Action>(), NSError());
  }
  void listenerEndpointForServiceName(const std::string &, const std::string &,
                                      FPDServiceCompletion completion) override {
    completion(nullptr, NSError(NSCocoaErrorDomain, NSFeatureUnsupportedError));
  }
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &, CGSize,
                                         FPDThumbnailsCompletion completion) override {
    completion(nullptr, NSError(NSCocoaErrorDomain, NSFeatureUnsupportedError));
  }
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &,
                                           NSFileProviderItemCompletion completion) override {
    completion(nullptr, NSError(NSCocoaErrorDomain, NSFeatureUnsupportedError));
  }
};

struct Ended {
  std::mutex mutex;
  std::condition_variable condition;
  bool ended = false;
};

// What a real client writes before it has had any answer.
std::vector<std::uint8_t> recordClient() {
  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
  const auto client = NSXPCConnection::connectionWithDescriptor(ends[0]);
  client->setRemoteObjectInterface(NSFileProviderExtensionInterface());
  client->resume();
  const auto proxy =
      client->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>([](const NSError &) {});
  proxy->itemForIdentifier("d1", [](const std::shared_ptr<const NSFileProviderItem> &, const NSError &) {});
  proxy->identifierForItemAtURL(NSURL::fileURLWithPath("/a"), [](const std::optional<std::string> &) {});
  proxy->enumeratorForContainer(
      "i1", [](const std::shared_ptr<NSFileProviderRemoteEnumerator> &, const NSError &) {});
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::rename;
  request.identifier = "d1";
  request.name = "a";
  proxy->performAction(request, [](const std::shared_ptr<FPDAction> &, const NSError &) {});
  std::vector<std::uint8_t> bytes;
  pollfd poller{ends[1], POLLIN, 0};
  while (poll(&poller, 1, 200) == 1) {
    std::uint8_t buffer[4096];
    const ssize_t count = read(ends[1], buffer, sizeof buffer);
    if (count <= 0) break;
    bytes.insert(bytes.end(), buffer, buffer + count);
  }
  client->invalidate();
  close(ends[1]);
  return bytes;
}

void sendAll(int socket, const std::uint8_t *bytes, std::size_t size) {
  while (size > 0) {
    const ssize_t count = send(socket, bytes, size, MSG_NOSIGNAL);
    if (count <= 0) return;
    bytes += count;
    size -= static_cast<std::size_t>(count);
  }
}

// Takes what is written to the peer, so that nobody waits for room.
void drain(int socket) {
  std::uint8_t buffer[4096];
  while (recv(socket, buffer, sizeof buffer, MSG_DONTWAIT) > 0) {
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size) {
  static const std::vector<std::uint8_t> recorded = recordClient();
  static OSLogCapture *const quiet = new OSLogCapture();
  quiet->clear();

  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
  const auto ended = std::make_shared<Ended>();
  const auto connection = NSXPCConnection::connectionWithDescriptor(ends[0]);
  connection->setExportedObject<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(),
                                                                 std::make_shared<Extension>());
  connection->setInvalidationHandler([ended] {
    const std::lock_guard<std::mutex> lock(ended->mutex);
    ended->ended = true;
    ended->condition.notify_all();
  });
  connection->resume();

  if (size > 0) {
    sendAll(ends[1], recorded.data(), recorded.size() * data[0] / 255);
    sendAll(ends[1], data + 1, size - 1);
  }
  shutdown(ends[1], SHUT_WR);
  std::unique_lock<std::mutex> lock(ended->mutex);
  for (int wait = 0; !ended->ended; ++wait) {
    if (wait > 500) std::abort();  // a peer that closed must end its connection
    ended->condition.wait_for(lock, std::chrono::milliseconds(10));
    drain(ends[1]);
  }
  close(ends[1]);
  return 0;
}
