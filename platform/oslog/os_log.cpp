#include "platform/oslog/os_log.h"

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <map>
#include <utility>

#include "platform/foundation/ThreadSafety.h"
#include "platform/oslog/LogOutput.h"

namespace droxa {

// The lines of one capture.
struct OSLogCapture::State {
  Mutex mutex;
  std::vector<OSLogLine> lines GUARDED_BY(mutex);
};

namespace {

constexpr os_log_type_t kLevels[] = {os_log_type_t::debug, os_log_type_t::info, os_log_type_t::normal,
                                     os_log_type_t::error, os_log_type_t::fault};

// The place of a level among the others; the enumeration's values are not in order.
int severity(os_log_type_t type) {
  return static_cast<int>(std::find(std::begin(kLevels), std::end(kLevels), type) - std::begin(kLevels));
}

int thresholdFromEnvironment() {
  const char *name = std::getenv("DROXA_LOG");
  if (!name || !*name) return severity(os_log_type_t::normal);
  for (const os_log_type_t level : kLevels) {
    if (std::string_view(LogLevelName(level)) == name) return severity(level);
  }
  LogOutput(nullptr, os_log_type_t::error,
            "[ERROR] DROXA_LOG=" + std::string(name) + " is none of debug, info, default, error, fault");
  return severity(os_log_type_t::normal);
}

std::atomic<int> &threshold() {
  static std::atomic<int> lowest = thresholdFromEnvironment();
  return lowest;
}

// Neither the handles nor the captures are ever destroyed: threads may log while the process ends.
struct Handles {
  Mutex mutex;
  std::map<std::pair<std::string, std::string>, OSLog> all GUARDED_BY(mutex);
};

Handles &handles() {
  static auto *instance = new Handles;
  return *instance;
}

// The captures that live, the newest last.
struct Captures {
  std::atomic<int> count = 0;  // read without the lock by every call that logs
  Mutex mutex;
  std::vector<OSLogCapture *> all GUARDED_BY(mutex);
};

Captures &captures() {
  static auto *instance = new Captures;
  return *instance;
}

}  // namespace

os_log_t os_log_create(std::string_view subsystem, std::string_view category) {
  Handles &known = handles();
  const Lock lock(known.mutex);
  const auto key = std::make_pair(std::string(subsystem), std::string(category));
  return &known.all.try_emplace(key, OSLog{key.first, key.second}).first->second;
}

void OSLogSetThreshold(os_log_type_t lowest) {
  threshold() = severity(lowest);
}

bool OSLogIsEnabled(os_log_type_t type) {
  return captures().count > 0 || severity(type) >= threshold();
}

OSLogCapture::OSLogCapture() : state_(std::make_shared<State>()) {
  Captures &living = captures();
  const Lock lock(living.mutex);
  living.all.push_back(this);
  ++living.count;
}

OSLogCapture::~OSLogCapture() {
  Captures &living = captures();
  const Lock lock(living.mutex);
  std::erase(living.all, this);
  --living.count;
}

bool OSLogCapture::keep(const OSLogLine &line) {
  if (captures().count == 0) return false;
  std::shared_ptr<State> newest;
  {
    Captures &living = captures();
    const Lock lock(living.mutex);
    if (living.all.empty()) return false;
    newest = living.all.back()->state_;
  }
  const Lock lock(newest->mutex);
  newest->lines.push_back(line);
  return true;
}

std::vector<OSLogLine> OSLogCapture::lines() const {
  const Lock lock(state_->mutex);
  return state_->lines;
}

std::vector<std::string> OSLogCapture::texts() const {
  const Lock lock(state_->mutex);
  std::vector<std::string> texts;
  for (const OSLogLine &line : state_->lines) texts.push_back(line.text);
  return texts;
}

bool OSLogCapture::contains(std::string_view text) const {
  const Lock lock(state_->mutex);
  return std::any_of(state_->lines.begin(), state_->lines.end(),
                     [&](const OSLogLine &line) { return line.text == text; });
}

void OSLogCapture::clear() {
  const Lock lock(state_->mutex);
  state_->lines.clear();
}

void OSLogWrite(os_log_t handle, os_log_type_t type, std::string text) {
  const OSLogLine line{handle, type, std::move(text)};
  if (!OSLogCapture::keep(line)) LogOutput(handle, type, line.text);
}

}  // namespace droxa
