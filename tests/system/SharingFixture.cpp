#include "tests/system/SharingFixture.h"

#include <filesystem>
#include <fstream>
#include <sys/stat.h>
#include <system_error>

namespace droxa::testing {

namespace fs = std::filesystem;

namespace {

std::vector<std::string> clientCommand(const Drive &drive, const std::string &path,
                                       const std::vector<std::string> &words) {
  std::vector<std::string> command = {SHARE_CLIENT, drive.home(), path};
  command.insert(command.end(), words.begin(), words.end());
  return command;
}

bool isDatabase(const std::string &name) {
  return name.find(".sqlite") != std::string::npos;
}

}  // namespace

std::vector<std::string> allSharingEntitlements() {
  return {kSharingProxy, kSharingPrivateInterface, kFolderSharingProxy};
}

std::unique_ptr<Process> startShareClient(const Drive &drive, const std::string &path,
                                          const std::vector<std::string> &words, const std::string &name) {
  return std::make_unique<Process>(clientCommand(drive, path, words), drive.home() + "/output", name);
}

Result runShareClient(const Drive &drive, const std::string &path, const std::vector<std::string> &words) {
  Process process(clientCommand(drive, path, words), drive.home() + "/output", "client");
  const std::optional<int> status = process.wait(120s);
  return {status.value_or(-1), process.output(), process.errors()};
}

bool hasSaid(const Process &process, const std::string &text) {
  return process.output().find(text) != std::string::npos;
}

std::size_t openDescriptors(pid_t process) {
  std::size_t count = 0;
  std::error_code error;
  const fs::path folder = "/proc/" + std::to_string(process) + "/fd";
  for (auto at = fs::directory_iterator(folder, error); !error && at != fs::directory_iterator();
       at.increment(error)) {
    std::error_code gone;
    const fs::path target = fs::read_symlink(at->path(), gone);
    if (!gone && !isDatabase(target.string())) ++count;
  }
  return count;
}

std::size_t fewestDescriptors(pid_t process) {
  std::size_t fewest = openDescriptors(process);
  (void)eventually(
      [&] {
        fewest = std::min(fewest, openDescriptors(process));
        return false;
      },
      500ms);
  return fewest;
}

void expectAtMost(std::size_t descriptors, pid_t process) {
  EXPECT_TRUE(eventually([&] { return openDescriptors(process) <= descriptors; }, kPatience))
      << "process " << process << ": " << openDescriptors(process) << " after " << descriptors;
}

long residentKilobytes(pid_t process) {
  std::ifstream status("/proc/" + std::to_string(process) + "/status");
  for (std::string line; std::getline(status, line);)
    if (line.rfind("VmRSS:", 0) == 0) return std::stol(line.substr(6));
  return 0;
}

void SharingTests::SetUp() {
  if (OwnEtc::whyNot().empty()) OwnEtc::revokeAll();
}

// A program has to be as hard to change as a grant: root's, who this user is in its own namespace.
std::string SharingTests::whyNotEntitled() {
  if (!OwnEtc::whyNot().empty()) return OwnEtc::whyNot();
  struct stat status {};
  for (const std::string &program : {std::string(SHARE_CLIENT), std::string(DROXA_BIN_DIR) + "/droxa"})
    if (stat(program.c_str(), &status) != 0 || status.st_uid != 0 ||
        (status.st_mode & (S_IWGRP | S_IWOTH)) != 0)
      return program + " belongs to somebody else, or others may write it";
  return "";
}

void EntitledSharingTests::SetUp() {
  SharingTests::SetUp();
  if (const std::string why = whyNotEntitled(); !why.empty()) GTEST_SKIP() << why;
}

void SharingTests::entitleClients(const std::vector<std::string> &entitlements) {
  OwnEtc::grant(SHARE_CLIENT, entitlements);
}

void SharingTests::entitleCommand(const std::vector<std::string> &entitlements) {
  OwnEtc::grant(std::string(DROXA_BIN_DIR) + "/droxa", entitlements);
}

nlohmann::json SharingTests::share(Drive &drive, std::vector<std::string> words) {
  words.insert(words.begin(), "share");
  words.emplace_back("--json");
  const Result result = drive.droxa(words, 90s);
  EXPECT_EQ(result.status, 0) << words[1] << " " << words[2] << ": " << result.errors;
  auto json = nlohmann::json::parse(result.output, nullptr, false);
  return json.is_object() ? json : nlohmann::json::object();
}

void SharingTests::expectRefused(Drive &drive, const std::vector<std::string> &words,
                                 const std::string &reason) {
  const Result result = drive.droxa(words, 90s);
  EXPECT_NE(result.status, 0);
  EXPECT_NE(result.status, -1) << "it hung";
  EXPECT_NE(result.errors.find(reason), std::string::npos) << result.errors;
}

void SharingTests::makeDocument(Drive &drive, const std::string &path, const std::string &contents) {
  const fs::path file = drive.documents() + "/" + path;
  fs::create_directories(file.parent_path());
  writeFile(file.string(), contents);
  ASSERT_TRUE(eventually([&] { return drive.droxa({"id", path}).status == 0; }, kPatience)) << path;
}

}  // namespace droxa::testing
