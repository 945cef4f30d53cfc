#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

#include "keld/FolderReading.h"
#include "keld/thumbnails/maker/MakerProtocol.h"
#include "platform/cloudkit/CKCallContext.h"

namespace droxa::keld {

// A running droxa-thumbnailer (MakerProtocol.h): owns the process, which ends with it. Thread contract: one
// thread at a time.
class MakerProcess {
 public:
  struct Job {
    MakerKind kind = MakerKind::image;
    MakerLimits limits;
    std::vector<std::string> command;  // of an external maker; reads the contents from descriptor 3
  };
  struct Outcome {
    enum class Kind : std::uint8_t { made, refused, lost, cancelled };  // lost: the program itself is gone
    Kind kind = Kind::lost;
    std::string text;  // the bytes that were made, or why there are none
  };

  // Null, with the reason, when the program isn't there or doesn't say hello.
  static std::unique_ptr<MakerProcess> start(const std::string &program, std::string *problem);
  ~MakerProcess();
  MakerProcess(const MakerProcess &) = delete;
  MakerProcess &operator=(const MakerProcess &) = delete;

  Outcome run(const Job &job, int contents, const CKCancellation &cancellation);
  // Whether it can take another job.
  bool isUsable() const { return isUsable_; }
  std::uint32_t protections() const { return protections_; }
  pid_t process() const { return process_; }

 private:
  using Clock = std::chrono::steady_clock;
  enum class Wait : std::uint8_t { ready, tooLate, cancelled };

  MakerProcess(pid_t process, OwnedDescriptor socket) : process_(process), socket_(std::move(socket)) {}
  bool hear(std::string *problem);
  bool send(const Job &job, int contents, OwnedDescriptor output);
  std::optional<Outcome> readAll(int pipe, const Job &job, Clock::time_point until,
                                 const CKCancellation &cancellation, std::string *text);
  std::optional<MakerReply> reply(Clock::time_point until, const CKCancellation &cancellation);
  static Wait waitFor(int descriptor, Clock::time_point until, const CKCancellation &cancellation);

  const pid_t process_;
  const OwnedDescriptor socket_;
  std::uint32_t protections_ = 0;
  bool isUsable_ = true;
};

}  // namespace droxa::keld
