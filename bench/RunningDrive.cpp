#include "bench/RunningDrive.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <future>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/foundation/Paths.h"
#include "tessaly/xpc/QVProtocolInterface.h"

namespace droxa::bench {

void fail(const std::string &what) {
  std::fprintf(stderr, "benchmark: %s\n", what.c_str());
  std::exit(1);
}

namespace {

std::shared_ptr<NSXPCConnection> connect(const std::string &socket, const NSXPCInterface &interface) {
  NSError error;
  std::shared_ptr<NSXPCConnection> connection = NSXPCConnection::connectionWithSocketPath(socket, &error);
  if (!connection) fail("nothing listens at " + socket + "; start the drive first: " + error.description());
  connection->setRemoteObjectInterface(interface);
  connection->resume();
  return connection;
}

void failWith(const NSError &error) {
  fail(error.description());
}

void check(const NSError &error) {
  if (error) failWith(error);
}

}  // namespace

RunningDrive::RunningDrive(const std::string &home) : home_(DroxaHome(home).root()) {
  hostConnection_ = connect(DroxaHome(home).hostSocket(), FPDControlInterface());
  keldConnection_ = connect(DroxaHome(home).daemonSocket(), QVProtocolInterface());
  host_ = hostConnection_->synchronousRemoteObjectProxyWithErrorHandler<FPDControlProtocol>(failWith);
  keld_ = keldConnection_->synchronousRemoteObjectProxyWithErrorHandler<QVProtocol>(failWith);
}

NSFileProviderItemFields RunningDrive::itemAtPath(const std::string &path) {
  NSFileProviderItemFields fields;
  host_->itemAtPath(path, [&](const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error) {
    check(error);
    fields = item->fields();
  });
  return fields;
}

NSFileProviderItemFields RunningDrive::itemForIdentifier(const std::string &identifier) {
  NSFileProviderItemFields fields;
  host_->itemForIdentifier(identifier,
                           [&](const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error) {
                             check(error);
                             fields = item->fields();
                           });
  return fields;
}

std::shared_ptr<NSFileProviderRemoteEnumerator> RunningDrive::enumerator(const std::string &identifier) {
  std::shared_ptr<NSFileProviderRemoteEnumerator> result;
  host_->enumeratorForContainer(
      identifier, [&](const std::shared_ptr<NSFileProviderRemoteEnumerator> &received, const NSError &error) {
        check(error);
        result = received;
      });
  return result;
}

// A received enumerator answers on a thread of its own, and may not answer at all.
NSData RunningDrive::page(NSFileProviderRemoteEnumerator &enumerator, const NSData &page,
                          std::size_t *items) {
  struct Answer {
    NSData next;
    std::size_t count = 0;
    NSError error;
  };
  const auto answer = std::make_shared<std::promise<Answer>>();
  std::future<Answer> future = answer->get_future();
  enumerator.enumerateItems(
      page, [answer](const NSFileProviderItems &received, const NSData &token, const NSError &error) {
        answer->set_value({token, received.size(), error});
      });
  if (future.wait_for(std::chrono::seconds(60)) != std::future_status::ready) fail("a page didn't come");
  const Answer got = future.get();
  check(got.error);
  *items += got.count;
  return got.next;
}

std::string RunningDrive::firstChild(const std::string &folderIdentifier) {
  const auto folder = QVFileObjectID::fileObjectIDWithString(folderIdentifier);
  std::string identifier;
  keld_->enumerateItemsInFolder(folder, 0, 0, 1,
                                [&](const QVQueryItems &items, std::uint64_t, const NSError &error) {
                                  check(error);
                                  if (!items.empty()) identifier = items.front()->itemIdentifier();
                                });
  if (identifier.empty()) fail("the folder has no items");
  return identifier;
}

void RunningDrive::emptyCall() {
  host_->getStatus([](const FPDStatus &) {});
}

void RunningDrive::emptyKeldCall() {
  keld_->currentNotifRankWithReply([](std::uint64_t, const NSError &error) { check(error); });
}

}  // namespace droxa::bench
