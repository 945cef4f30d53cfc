// crash_suite [KILLS] [SEED]: as many kills as asked for, checked every 25 and at the end.

#include <cstdio>
#include <cstdlib>
#include <random>

#include "tests/crash/CrashRun.h"

int main(int argc, char **argv) {
  droxa::crash::CrashOptions options;
  options.kills = argc > 1 ? std::strtoull(argv[1], nullptr, 10) : 200;
  options.seed = argc > 2 ? std::strtoull(argv[2], nullptr, 10) : std::random_device()();
  if (argc > 3) options.checkEvery = std::strtoull(argv[3], nullptr, 10);
  options.isVerbose = true;
  std::printf("seed %llu\n", static_cast<unsigned long long>(options.seed));
  std::fflush(stdout);
  const droxa::crash::CrashReport report = droxa::crash::RunCrashes(options);
  std::printf("%s\n%zu findings\n", report.summary.c_str(), report.findings.size());
  for (const std::string &finding : report.findings) std::printf("  %s\n", finding.c_str());
  if (!report.folder.empty()) std::printf("left behind: %s\n", report.folder.c_str());
  return report.findings.empty() ? 0 : 1;
}
