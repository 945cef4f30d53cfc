#include "tests/crash/Checker.h"

#include <filesystem>
#include <regex>
#include <thread>
#include <utility>

namespace droxa::crash {

namespace {
constexpr std::chrono::seconds kLongestWriting{10};
}  // namespace

std::string Difference(const Tree &one, const Tree &other) {
  std::string lines;
  const auto describe = [](const Entry &entry) {
    return entry.isFolder ? std::string("a folder") : std::to_string(entry.size) + " bytes";
  };
  for (const auto &[path, entry] : one) {
    const auto found = other.find(path);
    if (found == other.end())
      lines += "only on the first: " + path + ", " + describe(entry) + "\n";
    else if (describe(found->second) != describe(entry))
      lines += path + ": " + describe(entry) + " and " + describe(found->second) + "\n";
  }
  for (const auto &[path, entry] : other)
    if (one.count(path) == 0) lines += "only on the second: " + path + ", " + describe(entry) + "\n";
  return lines;
}

void Checker::finding(const CrashDevice &device, const std::string &text) {
  model_.finding(device.name() + ": " + text);
}

void Checker::check() {
  for (CrashDevice *device : devices_) checkDataless(*device, ReadTree(device->documents()));
  for (CrashDevice *device : devices_)
    if (const NSError error = device->download(""))
      finding(*device, "can't download all: " + error.description());
  std::array<Tree, 2> trees;
  for (std::size_t index = 0; index < 2; ++index) {
    CrashDevice &device = *devices_.at(index);
    trees.at(index) = ReadTree(device.documents());
    checkContents(device, trees.at(index));
    checkNames(device, trees.at(index));
    checkDatabases(device);
  }
  const std::string difference = Difference(trees[0], trees[1]);
  if (!difference.empty()) model_.finding("the trees differ:\n" + difference);
  for (const auto &[path, entry] : trees[0]) {
    if (entry.isFolder || trees[1].count(path) == 0) continue;
    if (ReadAll(devices_[0]->at(path)) != ReadAll(devices_[1]->at(path)))
      model_.finding(path + " has other contents on each device");
  }
  checkCloud(trees[0]);
}

// The daemon writes down what it has just done a moment later.
void Checker::checkDatabases(CrashDevice &device) {
  const auto end = std::chrono::steady_clock::now() + kLongestWriting;
  for (;;) {
    found_.clear();
    const Tree tree = ReadTree(device.documents());
    checkItemDatabase(device, tree);
    checkSyncDatabase(device, tree);
    if (found_.empty() || std::chrono::steady_clock::now() > end) break;
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
  }
  for (const std::string &text : std::exchange(found_, {})) finding(device, text);
}

// --- Files.

void Checker::checkDataless(CrashDevice &device, const Tree &tree) {
  const CKCallContext context = CKCallContext::withTimeout(std::chrono::seconds(120));
  for (const auto &[path, entry] : tree) {
    if (!entry.isDataless()) continue;
    const CKAssetPresence presence = cloud_->hasAsset({entry.mark->size, entry.mark->digest}, context);
    if (!presence.isPresent) finding(device, path + " is dataless, and the cloud doesn't have it");
    if (entry.size != entry.mark->size) finding(device, path + " has another size than its mark says");
  }
}

void Checker::checkContents(CrashDevice &device, const Tree &tree) {
  std::set<VersionName> found;
  for (const auto &[path, entry] : tree) {
    if (entry.isFolder) continue;
    if (entry.isDataless()) {
      finding(device, path + " is still dataless after its download");
      continue;
    }
    const auto text = ReadAll(device.at(path));
    const auto version = text ? ReadDocumentText(*text) : std::nullopt;
    if (!version) {
      finding(device, path + " (" + std::to_string(text ? text->size() : 0) +
                          " bytes) is truncated or mixed: " + (text ? text->substr(0, 60) : "unreadable"));
      continue;
    }
    found.insert(*version);
    if (entry.mark && entry.mark->digest != TextDigest(*text))
      finding(device, path + " isn't what its mark says");
  }
  for (const VersionName &expected : model_.mustExist()) {
    if (found.count(expected) > 0) continue;
    std::string text = "lost: " + expected.description() + "\n" + model_.history(expected.document);
    for (const VersionName &other : found)
      if (other.document == expected.document)
        text += "    found: version " + std::to_string(other.version) + "\n";
    finding(device, text);
  }
}

void Checker::checkNames(CrashDevice &device, const Tree &tree) {
  static const std::regex known(R"((document|folder|saving) \d+( \(conflict, [^()]*\))*(\.txt)?)");
  for (const auto &[path, entry] : tree) {
    const std::string name = path.substr(path.rfind('/') == std::string::npos ? 0 : path.rfind('/') + 1);
    if (!std::regex_match(name, known)) finding(device, path + " is nothing that the workload made");
    if (name.compare(0, 6, "saving") == 0 && name.find("conflict") == std::string::npos)
      finding(device, path + " was a temporary file");
  }
  for (const auto &entry : std::filesystem::directory_iterator(device.documents() + "/.."))
    if (entry.path().filename() != "Documents")
      finding(device, "beside the documents lies " + entry.path().filename().string());
}

// --- The cloud.

void Checker::checkCloud(const Tree &tree) {
  struct Item {
    std::string parent, name;
    std::uint64_t size = 0;
    std::string digest;
    bool isFolder = false;
  };
  const CKCallContext context = CKCallContext::withTimeout(std::chrono::seconds(120));
  std::map<std::string, Item> items;
  CKServerChangeToken token;
  for (bool more = true; more;) {
    const CKZoneChanges page =
        cloud_->fetchZoneChanges({"drive", CKCurrentUserDefaultName}, token, std::nullopt, 500, context);
    if (page.error) return model_.finding("the cloud can't be read: " + page.error.description());
    for (const CKRecord &record : page.changedRecords) {
      Item &item = items[record.recordID.recordName];
      if (const auto *parent = record.get<std::string>("parent")) item.parent = *parent;
      if (const auto *name = record.get<std::string>("name")) item.name = *name;
      if (const auto *kind = record.get<std::int64_t>("kind")) item.isFolder = *kind == 1;
      if (const auto *content = record.get<CKAsset>("content")) {
        item.size = content->reference().size;
        item.digest = content->reference().sha256;
      }
    }
    token = page.token;
    more = page.moreComing;
  }
  Tree cloud;
  for (const auto &[record, item] : items) {
    std::string path = item.name;
    std::string parent = item.parent;
    for (int depth = 0; items.count(parent) > 0 && depth < 100; ++depth) {
      path = items[parent].name + "/" + path;
      parent = items[parent].parent;
    }
    if (parent != "container:com.quorva.Tessaly.default") {
      model_.finding("the cloud's record of " + path + " is below nothing: " + parent);
      continue;
    }
    if (cloud.count(path) > 0) model_.finding("the cloud has " + path + " twice");
    cloud[path].isFolder = item.isFolder;
    cloud[path].size = item.size;
    const auto there = tree.find(path);
    if (there != tree.end() && there->second.mark && !item.isFolder &&
        there->second.mark->digest != item.digest)
      model_.finding("the cloud has other contents of " + path + " than its mark says");
    if (there != tree.end() && there->second.mark && there->second.mark->record != record)
      model_.finding("the mark of " + path + " names another record than the cloud");
  }
  const std::string difference = Difference(tree, cloud);
  if (!difference.empty()) model_.finding("the first device and the cloud differ:\n" + difference);
}

}  // namespace droxa::crash
