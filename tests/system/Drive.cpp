#include "tests/system/Drive.h"

#include <algorithm>
#include <filesystem>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <signal.h>
#include <stdlib.h>

namespace droxa::testing {

namespace {

std::string program(const std::string &name) {
  return std::string(DROXA_BIN_DIR) + "/" + name;
}

std::string makeTemporaryHome() {
  std::string path = std::filesystem::temp_directory_path().string() + "/droxa-system-XXXXXX";
  if (!mkdtemp(path.data())) throw std::runtime_error("can't make a temporary folder");
  return path;
}

}  // namespace

Drive::Drive() : home_(makeTemporaryHome()) {
  std::filesystem::create_directories(documents());
  std::filesystem::create_directories(home_ + "/output");
}

Drive::~Drive() {
  host_.reset();
  keld_.reset();
  // The extension ends by itself when its host has gone; what it held may be removed under it.
  std::error_code ignored;
  std::filesystem::remove_all(home_, ignored);
}

std::string Drive::container(const std::string &identifier) const {
  return home_ + "/replica/" + identifier + "/Documents";
}
std::string Drive::documents() const {
  return container("com.quorva.Tessaly.default");
}

std::vector<std::string> Drive::command(std::vector<std::string> words) const {
  words.insert(words.begin(), {program("droxa"), "--home", home_});
  return words;
}

void Drive::startKeld(std::vector<std::string> options) {
  options.insert(options.begin(), {program("keld"), "--home", home_});
  keld_.reset();
  keld_ = std::make_unique<Process>(options, home_ + "/output", "keld" + std::to_string(runs_++));
}

void Drive::startHost() {
  host_.reset();
  setenv("XDG_CACHE_HOME", cache().c_str(), 1);  // the host writes there, for the desktop
  host_ = std::make_unique<Process>(std::vector<std::string>{program("fileproviderd"), "--home", home_},
                                    home_ + "/output", "host" + std::to_string(runs_++));
}

void Drive::start(std::vector<std::string> keldOptions) {
  startKeld(std::move(keldOptions));
  startHost();
  ASSERT_TRUE(eventually([this] { return droxa({"ls"}).status == 0; }, 60s))
      << droxa({"ls"}).errors << keld_->errors() << host_->errors();
}

Result Drive::droxa(std::vector<std::string> words, std::chrono::milliseconds deadline) {
  Process process(command(std::move(words)), home_ + "/output", "droxa" + std::to_string(runs_++));
  const std::optional<int> status = process.wait(deadline);
  return {status.value_or(-1), process.output(), process.errors()};
}

std::unique_ptr<Process> Drive::droxaInBackground(std::vector<std::string> words, const std::string &name) {
  return std::make_unique<Process>(command(std::move(words)), home_ + "/output", name);
}

void Drive::importFolder(const std::string &folder, std::vector<std::string> keldOptions) {
  keldOptions.insert(keldOptions.begin(), {program("keld"), "--home", home_, "--import", folder});
  Process import(keldOptions, home_ + "/output", "import" + std::to_string(runs_++));
  ASSERT_EQ(import.wait(120s), 0) << import.errors();
}

nlohmann::json Drive::contents(const std::string &path) {
  auto json = nlohmann::json::parse(droxa({"status", "--json", path}).output, nullptr, false);
  return json.is_discarded() ? nlohmann::json::object() : json;
}

pid_t Drive::extensionPid() {
  const Result status = droxa({"status", "--json"});
  const auto json = nlohmann::json::parse(status.output, nullptr, false);
  if (json.is_discarded() || !json["extension"].is_object()) return 0;
  return json["extension"].value("process", 0);
}

std::vector<std::string> Drive::names(const std::string &path) {
  const Result result = droxa({"ls", "-0", path});
  EXPECT_EQ(result.status, 0) << result.errors;
  std::vector<std::string> names;
  std::size_t start = 0;
  for (std::size_t end; (end = result.output.find('\0', start)) != std::string::npos; start = end + 1)
    names.push_back(result.output.substr(start, end - start));
  return names;
}

bool Drive::waitForName(const std::string &name, const std::string &path) {
  return eventually([&] {
    const std::vector<std::string> all = names(path);
    return std::find(all.begin(), all.end(), name) != all.end();
  });
}

bool Drive::waitUntilGone(const std::string &name, const std::string &path) {
  return eventually([&] {
    const std::vector<std::string> all = names(path);
    return std::find(all.begin(), all.end(), name) == all.end();
  });
}

}  // namespace droxa::testing
