// What the sharing operations cost an application, through the service of an item: what bench/bench_sharing
// is made of.
//
// bench_sharing_calls HOME calls COUNT: the round trip of an operation that is refused for want of a
// privilege, and of one that keld answers, each beside a call without any work; all by turns. Without the
// privilege the second one isn't there.
//
// bench_sharing_calls HOME clients COUNT: COUNT connections to as many listeners, each with ten calls
// outstanding: time until all are answered, and what each connection costs the extension's memory.

#include <atomic>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <mutex>
#include <string>
#include <vector>

#include "bench/Acting.h"
#include "platform/foundation/DescriptorLimit.h"
#include "platform/foundation/Paths.h"
#include "platform/xpc/NSXPCListener.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVShareOperationProtocol.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"

namespace droxa::bench {
namespace {

constexpr char kService[] = "com.quorva.Tessaly.private.SharingOperation";
constexpr int kOutstanding = 10;

// A connection to a listener of its own.
std::shared_ptr<NSXPCConnection> connect(RunningDrive &drive) {
  std::shared_ptr<NSXPCConnection> connection;
  drive.host().listenerEndpointForServiceName(
      kService, Acting::root(), [&](const std::shared_ptr<FPDService> &service, const NSError &error) {
        check(service != nullptr, error.description());
        NSError problem;
        connection = NSXPCConnection::connectionWithListenerEndpoint(service->endpoint(), &problem);
        check(connection != nullptr, problem.description());
        connection->setRemoteObjectInterface(QVCXPCSharingOperationInterface());
        connection->resume();
        // The listener goes with the service: not before it has taken the connection.
        const auto remote =
            connection->synchronousRemoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(
                [](const NSError &failure) { fail(failure.description()); });
        remote->copyCurrentUserNameAndDisplayHandleWithReply(
            [](const auto &, const auto &, const auto &, const auto &, const auto &) {});
      });
  return connection;
}

// Whether the daemon answered, or the extension refused.
bool isForwarded(QVShareOperationProtocol &remote) {
  bool forwarded = false;
  remote.startOperation_toProcessSubitemsAtURL(nullptr, NSURL(), 0, 0, [&](const NSError &error) {
    forwarded = !error.is(QVTessalyErrorDomain, QVErrorPrivilegeRequired);
  });
  return forwarded;
}

void measureCalls(RunningDrive &drive, int count) {
  const auto connection = connect(drive);
  const auto remote = connection->synchronousRemoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(
      [](const NSError &failure) { fail(failure.description()); });
  Times times;
  for (int i = 0; i < count; ++i) {
    times.plain.push_back(microseconds([&] { drive.emptyCall(); }));
    times.through.push_back(microseconds([&] { isForwarded(*remote); }));
  }
  std::printf("plain: a call of fileproviderd without any work\n");
  printHead();
  print(isForwarded(*remote) ? "an operation that keld answers" : "an operation that is refused", times);
  connection->invalidate();
}

long residentKilobytes(std::uint32_t process) {
  std::ifstream status("/proc/" + std::to_string(process) + "/status");
  for (std::string line; std::getline(status, line);)
    if (line.rfind("VmRSS:", 0) == 0) return std::atol(line.c_str() + 6);
  return 0;
}

std::uint32_t extensionProcess(RunningDrive &drive) {
  std::uint32_t process = 0;
  drive.host().getStatus([&](const FPDStatus &status) { process = status.extensionProcessIdentifier; });
  return process;
}

void measureClients(RunningDrive &drive, int count) {
  const std::uint32_t extension = extensionProcess(drive);
  const long before = residentKilobytes(extension);
  std::vector<std::shared_ptr<NSXPCConnection>> connections;
  const double connecting = microseconds([&] {
    for (int i = 0; i < count; ++i) connections.push_back(connect(drive));
  });
  std::mutex mutex;
  std::condition_variable answered;
  int left = count * kOutstanding;
  const auto answer = [&](const NSError &) {
    const std::lock_guard lock(mutex);
    if (--left == 0) answered.notify_all();
  };
  const double calling = microseconds([&] {
    for (const auto &connection : connections) {
      const auto remote = connection->remoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(
          [](const NSError &failure) { fail(failure.description()); });
      for (int i = 0; i < kOutstanding; ++i)
        remote->startOperation_toProcessSubitemsAtURL(nullptr, NSURL(), 0, 0, answer);
    }
    std::unique_lock lock(mutex);
    answered.wait(lock, [&] { return left == 0; });
  });
  std::printf(
      "%d clients: connected in %.1f ms; %d calls answered in %.1f ms (%.1f us a call); "
      "%.1f KiB of the extension's memory a client\n",
      count, connecting / 1000, count * kOutstanding, calling / 1000, calling / (count * kOutstanding),
      static_cast<double>(residentKilobytes(extension) - before) / count);
  for (const auto &connection : connections) connection->invalidate();
}

int run(const std::vector<std::string> &words) {
  if (words.size() < 3) fail("HOME, a command and its argument are needed");
  DroxaRaiseDescriptorLimit();
  RunningDrive drive(DroxaHome(words[0]).root());
  (void)drive.itemAtPath("/");  // the extension runs
  const int count = std::atoi(words[2].c_str());
  if (words[1] == "calls")
    measureCalls(drive, count);
  else if (words[1] == "clients")
    measureClients(drive, count);
  else
    fail("no such command: " + words[1]);
  return 0;
}

}  // namespace
}  // namespace droxa::bench

int main(int argc, char **argv) {
  return droxa::bench::run({argv + 1, argv + argc});
}
