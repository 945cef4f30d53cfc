#include "bench/Acting.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <future>
#include <utility>

#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa::bench {
namespace {

constexpr std::chrono::seconds kLongest{600};

struct End {
  Acting::Item item;
  NSError error;
};

}  // namespace

double microseconds(const std::function<void()> &work) {
  const auto begin = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double, std::micro>(std::chrono::steady_clock::now() - begin).count();
}

double share(std::vector<double> times, double part) {
  std::sort(times.begin(), times.end());
  return times[static_cast<std::size_t>(part * static_cast<double>(times.size() - 1))];
}

void printHead() {
  std::printf("%-26s %9s %9s %10s %10s %10s %8s\n", "us", "plain", "99%", "through", "99%", "added", "ratio");
}

void print(const std::string &what, const Times &times) {
  const double plain = share(times.plain, 0.5), through = share(times.through, 0.5);
  std::printf("%-26s %9.1f %9.1f %10.1f %10.1f %10.1f %8.1f\n", what.c_str(), plain, share(times.plain, 0.99),
              through, share(times.through, 0.99), through - plain, through / plain);
  std::fflush(stdout);
}

void check(bool ok, const std::string &what) {
  if (!ok) fail(what);
}

Acting::Acting(const std::string &home, std::string folder) : drive_(home), plain_(std::move(folder)) {
  std::filesystem::create_directories(plain_);
}

Acting::Item Acting::act(const FPDActionRequest &request) {
  std::shared_ptr<FPDAction> action;
  drive_.host().performAction(request, [&](const auto &begun, const NSError &error) {
    check(begun != nullptr, error.description());
    action = begun;
  });
  const auto end = std::make_shared<std::promise<End>>();
  std::future<End> future = end->get_future();
  NSXPCProxyWithErrorHandler<FPDAction>(action, [end](const NSError &error) {
    end->set_value({nullptr, error});
  })->waitWithReply([end](const Item &item, const NSError &error) {
    end->set_value({item, error});
  });
  check(future.wait_for(kLongest) == std::future_status::ready, "an action didn't end");
  const End got = future.get();
  const std::string name = FPDActionName(request.kind);
  check(!got.error, name + ": " + got.error.description());
  check(got.item || request.kind == FPDActionRequest::Kind::deleteItem, name + ": no item came back");
  return got.item;
}

std::string Acting::makeFolder(const std::string &name) {
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::createDirectory;
  request.parentIdentifier = root();
  request.name = name;
  return act(request)->itemIdentifier();
}

void Acting::settle() {
  drive_.keld().waitForUploadAtURL(NSURL(), [](const NSError &error) { check(!error, error.description()); });
}

}  // namespace droxa::bench
