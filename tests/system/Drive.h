#pragma once

#include <memory>
#include <nlohmann/json_fwd.hpp>
#include <string>
#include <vector>

#include "tests/system/Process.h"

namespace droxa::testing {

// A whole drive on a home of its own in a temporary folder: keld, fileproviderd and, on demand, the
// extension. Everything ends and the home is removed with the object. Thread contract: one thread.
class Drive {
 public:
  Drive();  // makes the home; nothing runs yet
  ~Drive();
  Drive(const Drive &) = delete;
  Drive &operator=(const Drive &) = delete;

  const std::string &home() const { return home_; }
  std::string documents() const;  // the folder that is the drive's root
  std::string container(const std::string &identifier) const;
  std::string cache() const { return home_ + "/cache"; }  // the user's, as far as the drive knows

  // Both daemons, and waits until a listing of the root succeeds.
  void start(std::vector<std::string> keldOptions = {});
  void startKeld(std::vector<std::string> options = {});
  void startHost();
  Process &keld() { return *keld_; }
  Process &host() { return *host_; }
  bool hasKeld() const { return keld_ != nullptr; }
  // The extension's process as the host tells it; 0 when none runs.
  pid_t extensionPid();

  // Runs `droxa --home HOME words…` to its end, at most for `deadline`.
  Result droxa(std::vector<std::string> words, std::chrono::milliseconds deadline = 60s);
  // Starts it and leaves it running.
  std::unique_ptr<Process> droxaInBackground(std::vector<std::string> words, const std::string &name);

  // Puts a folder's documents into the cloud that keld is started with by these options; not while it runs.
  void importFolder(const std::string &folder, std::vector<std::string> keldOptions = {});
  // What is at a path of the drive, as `droxa status --json` tells it; an empty object when there is nothing.
  nlohmann::json contents(const std::string &path);

  // The names that `droxa ls` gives for a folder, exactly (separated by NUL on the way).
  std::vector<std::string> names(const std::string &path = "/");
  bool waitForName(const std::string &name, const std::string &path = "/");
  bool waitUntilGone(const std::string &name, const std::string &path = "/");

 private:
  std::vector<std::string> command(std::vector<std::string> words) const;
  std::string home_;
  std::unique_ptr<Process> keld_;
  std::unique_ptr<Process> host_;
  int runs_ = 0;
};

}  // namespace droxa::testing
