#include "tests/crash/Model.h"

#include <array>
#include <cstdio>
#include <ctime>

namespace droxa::crash {

namespace {

// To be found in the daemons' logs.
std::string timeOfDay() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME, &now);
  tm parts{};
  ::localtime_r(&now.tv_sec, &parts);
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%02d:%02d:%02d.%03ld ", parts.tm_hour, parts.tm_min, parts.tm_sec,
                now.tv_nsec / 1'000'000);
  return text.data();
}

}  // namespace

VersionName Model::begin(std::optional<VersionName> parent, std::uint64_t length, const std::string &where) {
  VersionName name;
  {
    const Lock lock(mutex_);
    name.document = parent ? parent->document : ++lastDocument_;
    name.version = ++newest_[name.document];
  }
  const std::string digest = TextDigest(DocumentText(name, length));
  const Lock lock(mutex_);
  Version &version = versions_[name];
  version.parent = parent;
  version.digest = digest;
  version.history = timeOfDay() + where + (parent ? ", on version " + std::to_string(parent->version) : "");
  digests_[digest] = name;
  return name;
}

void Model::acknowledge(const VersionName &name) {
  const Lock lock(mutex_);
  Version &version = versions_.at(name);
  version.isAcknowledged = true;
  if (version.parent) versions_.at(*version.parent).isSuperseded = true;
}

void Model::deleted(const VersionName &name, const std::string &where) {
  const Lock lock(mutex_);
  Version &version = versions_.at(name);
  version.isDeleted = true;
  version.history += "; " + timeOfDay() + where;
}

std::optional<VersionName> Model::byDigest(const std::string &digest) const {
  const Lock lock(mutex_);
  const auto known = digests_.find(digest);
  if (known == digests_.end()) return std::nullopt;
  return known->second;
}

std::vector<VersionName> Model::mustExist() const {
  const Lock lock(mutex_);
  std::vector<VersionName> expected;
  for (const auto &[name, version] : versions_)
    if (version.isAcknowledged && !version.isSuperseded && !version.isDeleted) expected.push_back(name);
  return expected;
}

std::string Model::history(std::uint64_t document) const {
  const Lock lock(mutex_);
  std::string lines;
  for (const auto &[name, version] : versions_)
    if (name.document == document)
      lines += "    version " + std::to_string(name.version) + ": " + version.history +
               (version.isAcknowledged ? "\n" : " (not finished)\n");
  return lines;
}

void Model::finding(const std::string &text) {
  const Lock lock(mutex_);
  findings_.push_back(text);
}

std::vector<std::string> Model::findings() const {
  const Lock lock(mutex_);
  return findings_;
}

void Model::note(const std::string &what) {
  const Lock lock(mutex_);
  notes_ += timeOfDay() + what + "\n";
}

std::string Model::notes() const {
  const Lock lock(mutex_);
  return notes_;
}

void Model::count(const char *what) {
  const Lock lock(mutex_);
  ++counts_[what];
}

std::map<std::string, std::uint64_t> Model::counts() const {
  const Lock lock(mutex_);
  return counts_;
}

}  // namespace droxa::crash
