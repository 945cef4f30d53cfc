#include "tests/crash/Model.h"

namespace droxa::crash {

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
  version.history = where + (parent ? " on " + parent->description() : "");
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
  version.history += "; deleted: " + where;
}

std::optional<VersionName> Model::byDigest(const std::string &digest) const {
  const Lock lock(mutex_);
  const auto known = digests_.find(digest);
  if (known == digests_.end()) return std::nullopt;
  return known->second;
}

std::vector<Model::Expected> Model::mustExist() const {
  const Lock lock(mutex_);
  std::vector<Expected> expected;
  for (const auto &[name, version] : versions_)
    if (version.isAcknowledged && !version.isSuperseded && !version.isDeleted)
      expected.push_back({name, version.digest, version.history});
  return expected;
}

std::string Model::history(const VersionName &name) const {
  const Lock lock(mutex_);
  const auto known = versions_.find(name);
  return known == versions_.end() ? "never written" : known->second.history;
}

void Model::finding(const std::string &text) {
  const Lock lock(mutex_);
  findings_.push_back(text);
}

std::vector<std::string> Model::findings() const {
  const Lock lock(mutex_);
  return findings_;
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
