// Makes the thumbnail of every file of a folder, as keld does: bench_thumbnailer FOLDER. Prints how long it
// took in microseconds, and how many there are.

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

#include "keld/TypeIdentifiers.h"
#include "keld/thumbnails/SandboxedThumbnailer.h"

int main(int argc, char **argv) {
  using namespace droxa;
  using namespace droxa::keld;
  if (argc != 2) {
    std::cerr << "usage: bench_thumbnailer FOLDER\n";
    return 2;
  }
  std::vector<std::string> files;
  for (const auto &entry : std::filesystem::directory_iterator(argv[1]))
    files.push_back(entry.path().string());
  SandboxedThumbnailer thumbnailer;
  const CKCancellation never{};
  std::atomic<std::size_t> next{0};
  std::atomic<std::uint64_t> made{0};
  const auto begin = std::chrono::steady_clock::now();
  std::vector<std::thread> threads;
  for (unsigned index = 0; index < std::clamp(std::thread::hardware_concurrency(), 1U, 4U); ++index)
    threads.emplace_back([&] {
      for (std::size_t file = next++; file < files.size(); file = next++) {
        const OwnedDescriptor contents(::open(files[file].c_str(), O_RDONLY | O_CLOEXEC));
        const auto result = thumbnailer.make(contents.get(), TypeIdentifierForName(files[file]), never);
        if (result.outcome == ThumbnailResult::Outcome::made)
          ++made;
        else
          std::cerr << files[file] << ": " << result.why << "\n";
      }
    });
  for (std::thread &thread : threads) thread.join();
  const auto took = std::chrono::steady_clock::now() - begin;
  std::cout << std::chrono::duration_cast<std::chrono::microseconds>(took).count() << " " << made << "\n";
  return made == files.size() ? 0 : 1;
}
