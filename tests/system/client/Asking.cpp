#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <memory>
#include <thread>

#include "tests/system/client/Calls.h"
#include "tests/system/client/Commands.h"
#include "tests/system/client/Service.h"

namespace droxa::testing {

namespace {

constexpr int kOutstanding = 8;
std::atomic<bool> gEnding{false};

void endOnSignal() {
  std::signal(SIGTERM, [](int) { gEnding = true; });
}

void pauseBriefly() {
  std::this_thread::sleep_for(std::chrono::milliseconds(2));
}

void sayOnce(const char *what) {
  static std::atomic<bool> isSaid{false};
  if (isSaid.exchange(true)) return;
  std::printf("%s\n", what);
  std::fflush(stdout);
}

// Calls of all kinds through one connection until it is lost or the program is to end.
void askThrough(const Service &service, Tally &tally, const std::shared_ptr<std::atomic<bool>> &lost) {
  for (int i = 0; !gEnding && !*lost; ++i) {
    while (tally.unanswered() >= kOutstanding && !gEnding) pauseBriefly();
    const auto answer = tally.begin();
    sayOnce("asking");
    const auto remote = service.remote([answer, lost](const NSError &) {
      *lost = true;
      answer();
    });
    makeCall(i % kCalls, *remote, service.url(), [answer](const NSError &) { answer(); });
  }
}

// Whether the cloud has the share with that title; the share, if it answers, is what the next save changes.
bool save(const Service &service, std::optional<CKShare> &share, int number, NSError *error) {
  bool isSaved = false;
  const auto take = [&](const std::optional<CKShare> &answered, const NSError &problem) {
    *error = problem;
    isSaved = answered.has_value() && !problem;
    share = answered;
  };
  const auto remote = service.waitingRemote([&](const NSError &failure) { take(std::nullopt, failure); });
  if (!share)
    remote->startOperation_toCopySharingInfoAtURL(nullptr, service.url(),
                                                  [&](const std::optional<CKShare> &there, const NSURL &,
                                                      const NSError &problem) { take(there, problem); });
  if (!share || *error) return false;
  share->fields[CKShareTitleKey] = std::to_string(number);
  std::printf("tried %d\n", number);
  std::fflush(stdout);
  isSaved = false;
  remote->startOperation_toSaveSharingInfo(nullptr, std::optional<CKShare>(share), take);
  return isSaved;
}

}  // namespace

int runCalls(const ClientArguments &arguments) {
  const auto host = connectToHost(arguments.home);
  const Service service(*host, arguments.path);
  if (service.error()) {
    std::fprintf(stderr, "%s\n", service.error().description().c_str());
    return 1;
  }
  for (int call = 0; call < kCalls; ++call) {
    NSError error;
    const auto take = [&error](const NSError &answered) { error = answered; };
    makeCall(call, *service.waitingRemote(take), service.url(), take);
    std::printf("%s\t%s\t%lld\t%s\n", nameOfCall(call), error ? error.domain().c_str() : "",
                static_cast<long long>(error ? error.code() : 0),
                error ? error.localizedDescription().c_str() : "");
  }
  return 0;
}

int runAsk(const ClientArguments &arguments) {
  endOnSignal();
  const auto host = connectToHost(arguments.home);
  static Tally tally;  // answers may come until the very end
  while (!gEnding) {
    const Service service(*host, arguments.path);
    if (service.error()) {
      pauseBriefly();
      continue;
    }
    askThrough(service, tally, std::make_shared<std::atomic<bool>>(false));
    // The calls under way when it ends by the program's own word have their answers to wait for.
    if (gEnding) return tally.finish();
  }
  return tally.finish();
}

int runWrite(const ClientArguments &arguments) {
  endOnSignal();
  const auto host = connectToHost(arguments.home);
  int number = arguments.count;
  sayOnce("writing");
  while (!gEnding) {
    const Service service(*host, arguments.path);
    std::optional<CKShare> share;
    NSError error = service.error();
    while (!error && !gEnding) {
      if (save(service, share, number, &error)) {
        std::printf("saved %d\n", number);
      } else {
        std::printf("failed %d: %s\n", number, error.description().c_str());
      }
      ++number;
      std::fflush(stdout);
    }
    if (error) pauseBriefly();
  }
  std::printf("ended\n");
  return 0;
}

}  // namespace droxa::testing
