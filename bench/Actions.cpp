// What the framework's operations on files cost beside the plain system calls, a thousand items each:
// coordination, the hidden places, and the way over the pool. One operation after the other.
//
//   bench_actions [Google Benchmark's options]; the files are made in $TMPDIR

#include <algorithm>
#include <benchmark/benchmark.h>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <future>
#include <iostream>
#include <map>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/fileprovider/FPURLOperations.h"

namespace droxa::bench {
namespace {

namespace fs = std::filesystem;
constexpr int kItems = 1000;

void check(bool ok, const std::string &what) {
  if (ok) return;
  std::cerr << "bench_actions: " << what << "\n";
  std::exit(1);
}

// Three folders, removed at the end: "in" with a thousand documents of 4 KiB, and "out", empty.
class Place {
 public:
  Place() {
    std::string name = fs::temp_directory_path() / "droxa-bench-XXXXXX";
    check(mkdtemp(name.data()) != nullptr, "no temporary folder");
    root_ = name;
    fs::create_directory(in());
    fs::create_directory(out());
    for (int i = 0; i < kItems; ++i) std::ofstream(item(in(), i)) << std::string(4096, 'x');
  }
  ~Place() { fs::remove_all(root_); }
  Place(const Place &) = delete;
  Place &operator=(const Place &) = delete;
  std::string in() const { return root_ + "/in"; }
  std::string out() const { return root_ + "/out"; }
  static std::string item(const std::string &folder, int i) { return folder + "/" + std::to_string(i); }

 private:
  std::string root_;
};

using Begin = std::function<void(FPURLCompletion)>;

void await(const Begin &begin) {
  std::promise<NSError> answer;
  begin([&](const NSURL & /*url*/, const NSError &error) { answer.set_value(error); });
  const NSError error = answer.get_future().get();
  check(!error, error.description());
}

NSURL url(const std::string &path) {
  return NSURL::fileURLWithPath(path);
}

std::string other(int i) {
  return "other " + std::to_string(i);
}

void plainRename(const Place &place, int i) {
  check(::rename(Place::item(place.in(), i).c_str(), (place.in() + "/" + other(i)).c_str()) == 0, "rename");
}
void fpRename(const Place &place, int i) {
  await([&](FPURLCompletion done) {
    fp_renameWithNewName(url(Place::item(place.in(), i)), other(i), std::move(done));
  });
}
void plainMove(const Place &place, int i) {
  check(::rename(Place::item(place.in(), i).c_str(), Place::item(place.out(), i).c_str()) == 0, "rename");
}
void fpMove(const Place &place, int i) {
  await([&](FPURLCompletion done) {
    fp_reparentUnderFolder_withNewName(url(Place::item(place.in(), i)), url(place.out()), std::nullopt,
                                       std::move(done));
  });
}
void plainCreate(const Place &place, int i) {
  check(mkdir(Place::item(place.out(), i).c_str(), 0777) == 0, "mkdir");
}
void fpCreate(const Place &place, int i) {
  await([&](FPURLCompletion done) {
    fp_createSubFolder(url(place.out()), std::to_string(i), std::move(done));
  });
}
void plainDelete(const Place &place, int i) {
  check(unlink(Place::item(place.in(), i).c_str()) == 0, "unlink");
}
void fpDelete(const Place &place, int i) {
  await([&](const FPURLCompletion &done) {
    fp_deleteWithCompletionHandler(url(Place::item(place.in(), i)),
                                   [done](const NSError &error) { done({}, error); });
  });
}
// The bytes, and what a copy that is to be the same has to set.
void plainImport(const Place &place, int i) {
  const int from = open(Place::item(place.in(), i).c_str(), O_RDONLY | O_CLOEXEC);
  const int to = open(Place::item(place.out(), i).c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
  struct stat status {};
  check(fstat(from, &status) == 0, "stat");
  check(copy_file_range(from, nullptr, to, nullptr, static_cast<std::size_t>(status.st_size), 0) ==
            status.st_size,
        "copy");
  const timespec times[2] = {status.st_atim, status.st_mtim};
  check(fchmod(to, status.st_mode & 07777U) == 0 && futimens(to, times) == 0, "attributes");
  close(to);
  close(from);
}
void fpImport(const Place &place, int i) {
  await([&](FPURLCompletion done) {
    fp_importUnderFolder(url(Place::item(place.in(), i)), url(place.out()), std::move(done));
  });
}

using Step = void (*)(const Place &, int);

void run(benchmark::State &state, Step step) {
  while (state.KeepRunning()) {
    state.PauseTiming();
    {
      const Place place;
      state.ResumeTiming();
      for (int i = 0; i < kItems; ++i) step(place, i);
      state.PauseTiming();
    }
    state.ResumeTiming();
  }
  state.counters["each"] =
      benchmark::Counter(kItems, benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// The usual table, and below it how often the plain calls would fit into each operation: the fastest of both,
// which other work on the machine disturbs least.
class Ratios final : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run> &runs) override {
    ConsoleReporter::ReportRuns(runs);
    for (const Run &run : runs) {
      if (run.run_type == Run::RT_Aggregate) continue;
      const double time = run.GetAdjustedRealTime();
      const std::string name = run.run_name.function_name;
      const auto [best, isNew] = best_.try_emplace(name, time);
      if (!isNew) best->second = std::min(best->second, time);
    }
  }
  void Finalize() override {
    for (const auto &[name, time] : best_) {
      const auto plain = best_.find("plain_" + name);
      if (plain != best_.end()) GetOutputStream() << name << " ratio " << time / plain->second << "\n";
    }
  }

 private:
  std::map<std::string, double> best_;
};

void registerPair(const std::string &name, Step plain, Step coordinated) {
  for (const auto &[full, step] : {std::pair{"plain_" + name, plain}, std::pair{name, coordinated}}) {
    benchmark::RegisterBenchmark(full.c_str(), run, step)
        ->Unit(benchmark::kMillisecond)
        ->UseRealTime()
        ->Iterations(1)
        ->Repetitions(7);
  }
}

}  // namespace
}  // namespace droxa::bench

int main(int argc, char **argv) {
  using namespace droxa::bench;
  registerPair("rename", plainRename, fpRename);
  registerPair("reparent", plainMove, fpMove);
  registerPair("createSubFolder", plainCreate, fpCreate);
  registerPair("delete", plainDelete, fpDelete);
  registerPair("import", plainImport, fpImport);
  benchmark::Initialize(&argc, argv);
  Ratios ratios;
  benchmark::RunSpecifiedBenchmarks(&ratios);
}
