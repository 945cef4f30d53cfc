// The cloud in a folder: transfers beside a plain copy with fsync, small saves, and how soon others hear of
// them.
//   bench_cloud FOLDER [MEGABYTES]
#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <random>
#include <sys/resource.h>
#include <thread>
#include <unistd.h>

#include "platform/cloudkit/EmbeddedCloud.h"

namespace {

using namespace droxa;
using Clock = std::chrono::steady_clock;

double seconds(Clock::time_point since) {
  return std::chrono::duration<double>(Clock::now() - since).count();
}

void require(const NSError &error, const char *what) {
  if (!error) return;
  std::fprintf(stderr, "bench_cloud: %s: %s\n", what, error.description().c_str());
  std::exit(1);
}

int makeFile(const std::string &path, std::size_t megabytes) {
  const int file = open(path.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  std::mt19937_64 random(1);
  std::vector<std::uint64_t> block(1024 * 1024 / 8);
  for (std::size_t i = 0; i < megabytes; ++i) {
    for (std::uint64_t &word : block) word = random();
    if (write(file, block.data(), 1024 * 1024) != 1024 * 1024) std::abort();
  }
  fsync(file);
  return file;
}

// What any way to store the file safely must do: read it, write it, wait for the disk.
void copyFile(int from, const std::string &path, std::size_t megabytes) {
  const int to = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  std::vector<char> block(1024 * 1024);
  for (std::size_t i = 0; i < megabytes; ++i) {
    if (pread(from, block.data(), block.size(), static_cast<off_t>(i * block.size())) < 0) std::abort();
    if (write(to, block.data(), block.size()) < 0) std::abort();
  }
  fsync(to);
  close(to);
}

void report(const char *what, double took, std::size_t megabytes) {
  std::printf("%-34s %8.3f s %8.0f MB/s\n", what, took, static_cast<double>(megabytes) / took);
}

void measureTransfers(EmbeddedCloud &cloud, const std::string &folder, std::size_t megabytes) {
  const std::uint64_t size = megabytes * 1024 * 1024;
  const int file = makeFile(folder + "/file", megabytes);
  auto start = Clock::now();
  copyFile(file, folder + "/copy", megabytes);
  report("plain copy with fsync", seconds(start), megabytes);
  start = Clock::now();
  const CKUploadReply uploaded = cloud.uploadAsset(file, size, {}, {});
  require(uploaded.error, "upload");
  report("upload", seconds(start), megabytes);
  start = Clock::now();
  require(cloud.uploadAsset(file, size, {}, {}).error, "upload");
  report("upload of what is there", seconds(start), megabytes);
  start = Clock::now();
  const auto sink = [](std::span<const std::uint8_t>) { return NSError(); };
  require(cloud.readAsset(uploaded.asset.reference(), 0, sink, {}, {}), "read");
  report("read, verified", seconds(start), megabytes);
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  std::printf("%-34s %8ld KiB\n", "most memory", usage.ru_maxrss);
  close(file);
}

CKRecord makeRecord(const CKRecordZoneID &zone, int number) {
  CKRecord record;
  record.recordType = "Item";
  record.recordID = {"record " + std::to_string(number), zone};
  record.fields["title"] = std::string("title");
  return record;
}

void measureSaves(EmbeddedCloud &cloud, EmbeddedCloud &other) {
  const CKRecordZoneID zone{"bench"};
  require(cloud.saveZone(zone, {}), "zone");
  constexpr int kSaves = 300;
  auto start = Clock::now();
  for (int i = 0; i < kSaves; ++i)
    require(cloud.modifyRecords({{makeRecord(zone, i)}, {}}, {}).error, "save");
  std::printf("%-34s %8.3f ms each\n", "saves of one record", seconds(start) / kSaves * 1000);
  CKModifyRequest batch;
  for (int i = 0; i < 1000; ++i) batch.recordsToSave.push_back(makeRecord(zone, kSaves + i));
  start = Clock::now();
  require(cloud.modifyRecords(batch, {}).error, "save");
  std::printf("%-34s %8.3f ms\n", "a save of 1000 records", seconds(start) * 1000);

  std::atomic<int> told{0};
  NSError error;
  const auto subscription = other.subscribe([&](const std::vector<CKRecordZoneID> &) { ++told; }, &error);
  require(error, "subscribe");
  std::vector<double> waits;
  for (int i = 0; i < 200; ++i) {
    const int before = told;
    require(cloud.modifyRecords({{makeRecord(zone, 2000 + i)}, {}}, {}).error, "save");
    start = Clock::now();
    while (told == before) std::this_thread::sleep_for(std::chrono::microseconds(20));
    waits.push_back(seconds(start) * 1000);
  }
  std::sort(waits.begin(), waits.end());
  std::printf("%-34s %8.3f ms median, %.3f ms 95%%\n", "from a save to another device", waits[100],
              waits[190]);
}

}  // namespace

int main(int count, char **arguments) {
  if (count < 2) {
    std::fprintf(stderr, "usage: bench_cloud FOLDER [MEGABYTES]\n");
    return 2;
  }
  const std::string folder = std::string(arguments[1]) + "/bench-cloud-" + std::to_string(getpid());
  const auto megabytes = static_cast<std::size_t>(count > 2 ? std::atoi(arguments[2]) : 1024);
  std::filesystem::create_directories(folder);
  NSError error;
  const auto one = EmbeddedCloud::open(folder + "/cloud", "bench", "one", &error);
  require(error, "open");
  const auto two = EmbeddedCloud::open(folder + "/cloud", "bench", "two", &error);
  require(error, "open");
  measureTransfers(*one, folder, megabytes);
  measureSaves(*one, *two);
  std::filesystem::remove_all(folder);
  return 0;
}
