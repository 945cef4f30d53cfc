#include "keld/thumbnails/SandboxedThumbnailer.h"

#include <algorithm>
#include <filesystem>
#include <sys/mman.h>
#include <unistd.h>
#include <utility>

#include "keld/thumbnails/ExternalThumbnailers.h"
#include "keld/thumbnails/PngCheck.h"
#include "keld/thumbnails/ThumbnailTypes.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

using Outcome = MakerProcess::Outcome;

std::string programBeside() {
  std::error_code problem;
  const auto folder = std::filesystem::read_symlink("/proc/self/exe", problem).parent_path();
  return (folder / "droxa-thumbnailer").string();
}

OwnedDescriptor inMemory(const std::string &bytes) {
  OwnedDescriptor memory(::memfd_create("thumbnail", MFD_CLOEXEC));
  const auto size = static_cast<ssize_t>(bytes.size());
  if (memory && ::pwrite(memory.get(), bytes.data(), bytes.size(), 0) != size) return OwnedDescriptor();
  return memory;
}

ThumbnailResult refused(std::string why) {
  ThumbnailResult result;
  result.outcome = ThumbnailResult::Outcome::refused;
  result.why = std::move(why);
  return result;
}

// The bytes may be anything: the process that wrote them has read a stranger's document.
ThumbnailResult checked(const std::string &bytes) {
  const auto size = CheckPng(bytes);
  if (!size || std::max(size->width, size->height) > kThumbnailSide)
    return refused("its thumbnail's maker wrote something else than a thumbnail");
  ThumbnailResult result;
  result.png = inMemory(bytes);
  if (!result.png) {
    result.why = "there is no memory for it";
    return result;
  }
  result.outcome = ThumbnailResult::Outcome::made;
  result.size = bytes.size();
  result.width = size->width;
  result.height = size->height;
  return result;
}

}  // namespace

SandboxedThumbnailer::SandboxedThumbnailer(ThumbnailerOptions options)
    : options_([&options] {
        if (options.program.empty()) options.program = programBeside();
        return std::move(options);
      }()) {}

SandboxedThumbnailer::~SandboxedThumbnailer() = default;

bool SandboxedThumbnailer::canMake(const std::string &mimeType) {
  return CanMakeThumbnailOfType(mimeType);
}

ThumbnailResult SandboxedThumbnailer::make(int contents, const std::string &mimeType,
                                           const CKCancellation &cancellation) {
  const auto kind = BuiltInThumbnailMaker(mimeType);
  Outcome outcome;
  if (kind) {
    MakerProcess::Job job;
    job.kind = *kind;
    job.limits = options_.limits;
    outcome = run(job, contents, cancellation);
  } else {
    outcome = runExternal(contents, mimeType, cancellation);
  }
  if (outcome.kind == Outcome::Kind::made) return checked(outcome.text);
  ThumbnailResult result = refused(std::move(outcome.text));
  if (outcome.kind == Outcome::Kind::lost) result.outcome = ThumbnailResult::Outcome::unavailable;
  if (outcome.kind == Outcome::Kind::cancelled) result.outcome = ThumbnailResult::Outcome::cancelled;
  return result;
}

// A program that was kept may have been ended by somebody meanwhile: then a new one is asked, once.
Outcome SandboxedThumbnailer::run(const MakerProcess::Job &job, int contents,
                                  const CKCancellation &cancellation) {
  Outcome outcome;
  for (int attempt = 0; attempt < 2; ++attempt) {
    std::string problem;
    auto process = take(&problem);
    if (!process) return {Outcome::Kind::lost, problem};
    outcome = process->run(job, contents, cancellation);
    putBack(std::move(process));
    if (outcome.kind != Outcome::Kind::lost) break;
  }
  return outcome;
}

// What an installed thumbnailer makes is a picture like any other: the thumbnail is made of that.
Outcome SandboxedThumbnailer::runExternal(int contents, const std::string &mimeType,
                                          const CKCancellation &cancellation) {
  MakerProcess::Job job;
  job.kind = MakerKind::external;
  job.limits = options_.limits;
  job.limits.memoryBytes = std::max(job.limits.memoryBytes, kExternalMemory);
  job.command = ConfinedThumbnailerCommand(mimeType, options_.program);
  if (job.command.empty())
    return {Outcome::Kind::refused, "no thumbnailer for " + mimeType + " is installed"};
  Outcome picture = run(job, contents, cancellation);
  if (picture.kind != Outcome::Kind::made) return picture;
  const OwnedDescriptor memory = inMemory(picture.text);
  if (!memory) return {Outcome::Kind::lost, "there is no memory for it"};
  MakerProcess::Job second;
  second.limits = options_.limits;
  return run(second, memory.get(), cancellation);
}

std::unique_ptr<MakerProcess> SandboxedThumbnailer::take(std::string *problem) {
  {
    const Lock lock(mutex_);
    if (!idle_.empty()) {
      auto process = std::move(idle_.back());
      idle_.pop_back();
      return process;
    }
  }
  auto process = MakerProcess::start(options_.program, problem);
  if (process) tell(*process);
  return process;
}

void SandboxedThumbnailer::putBack(std::unique_ptr<MakerProcess> process) {
  if (!process->isUsable()) return;
  const Lock lock(mutex_);
  idle_.push_back(std::move(process));
}

void SandboxedThumbnailer::rest() {
  std::vector<std::unique_ptr<MakerProcess>> idle;
  const Lock lock(mutex_);
  idle.swap(idle_);
}

void SandboxedThumbnailer::tell(const MakerProcess &process) {
  {
    const Lock lock(mutex_);
    if (std::exchange(isTold_, true)) return;
  }
  if ((process.protections() & kMakerSystemCalls) == 0)
    os_log_error(
        qvc_default_log(),
        "[ERROR] this kernel doesn't filter system calls: thumbnails are made without that protection");
  if ((process.protections() & kMakerFiles) == 0)
    os_log_error(
        qvc_default_log(),
        "[ERROR] this kernel has no rules on files for processes: thumbnails are made without fonts");
}

}  // namespace droxa::keld
