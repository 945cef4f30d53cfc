#pragma once

#include <algorithm>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "keld/sync/DocumentRecord.h"
#include "tests/keld/sync/TwoDevices.h"
#include "tests/support/FaultyCloud.h"

namespace droxa::keld {

// What another device does with the cloud, without a daemon. Paths are below the default container's
// documents folder. Thread contract: the test's thread.
class CloudHand {
 public:
  explicit CloudHand(const std::string &cloudFolder, const std::string &device = "anna") {
    NSError error;
    cloud = EmbeddedCloud::open(cloudFolder, AccountKeeper::localUserName(), device, &error);
    EXPECT_TRUE(cloud) << error.description();
    EXPECT_FALSE(cloud->saveZone(DriveZone(), {}));
  }

  // Makes the document, or gives it other contents. Returns its record's name.
  std::string put(const std::string &path, const std::string &contents) {
    DocumentRecord document = at(path).value_or(made(path));
    document.kind = NSFileProviderItemKind::document;
    document.content = upload(contents);
    save(MakeRecordWithContent(document));
    return document.record;
  }
  std::string folder(const std::string &path) { return putKind(path, NSFileProviderItemKind::folder, ""); }
  std::string link(const std::string &path, const std::string &target) {
    return putKind(path, NSFileProviderItemKind::symbolicLink, target);
  }
  // Saves the record that `change` makes of the one at the path.
  void change(const std::string &path, const std::function<void(DocumentRecord &)> &change) {
    auto document = at(path);
    ASSERT_TRUE(document) << path;
    change(*document);
    save(MakeRecord(*document));
  }
  void remove(const std::string &path) {
    const auto document = at(path);
    ASSERT_TRUE(document) << path;
    CKModifyRequest request;
    request.recordsToDelete.push_back({RecordID(document->record), ""});
    EXPECT_FALSE(cloud->modifyRecords(request, {}).error);
  }
  void save(const CKRecord &record) {
    CKModifyRequest request;
    request.recordsToSave.push_back(record);
    const CKModifyReply reply = cloud->modifyRecords(request, {});
    EXPECT_FALSE(reply.error) << reply.error.description();
  }

  // All that the cloud has, by path.
  std::multimap<std::string, DocumentRecord> all() {
    std::map<std::string, DocumentRecord> byRecord;
    CKServerChangeToken token;
    for (bool more = true; more;) {
      const CKZoneChanges page = cloud->fetchZoneChanges(DriveZone(), token, std::nullopt, 500, {});
      if (CKErrorIs(page.error, CKErrorCode::zoneNotFound)) return {};
      EXPECT_FALSE(page.error) << page.error.description();
      for (const CKRecord &record : page.changedRecords)
        if (const auto document = ReadRecord(record)) byRecord[document->record] = *document;
      token = page.token;
      more = page.moreComing;
    }
    std::multimap<std::string, DocumentRecord> byPath;
    for (const auto &[name, document] : byRecord) {
      std::string path = document.name;
      std::string parent = document.parent;
      for (int depth = 0; depth < 100 && byRecord.count(parent) != 0; ++depth) {
        path = byRecord[parent].name + "/" + path;
        parent = byRecord[parent].parent;
      }
      byPath.emplace(path, document);
    }
    return byPath;
  }
  std::vector<std::string> paths() {
    std::vector<std::string> paths;
    for (const auto &[path, document] : all()) paths.push_back(path);
    return paths;
  }
  std::optional<DocumentRecord> at(const std::string &path) {
    const auto everything = all();
    const auto found = everything.find(path);
    if (found == everything.end()) return std::nullopt;
    return found->second;
  }
  std::string contents(const std::string &path) {
    const auto document = at(path);
    std::string bytes;
    if (!document) return "nothing is there";
    const NSError error = cloud->readAsset({document->content.size, document->content.digest}, 0,
                                           [&](std::span<const std::uint8_t> more) {
                                             bytes.append(more.begin(), more.end());
                                             return NSError();
                                           },
                                           nullptr, {});
    EXPECT_FALSE(error) << error.description();
    return bytes;
  }
  ContentVersion upload(const std::string &contents) {
    const TemporaryFolder folder;
    std::ofstream(folder.path() + "/asset", std::ios::binary) << contents;
    const int file = ::open((folder.path() + "/asset").c_str(), O_RDONLY | O_CLOEXEC);
    const CKUploadReply reply = cloud->uploadAsset(file, contents.size(), nullptr, {});
    ::close(file);
    EXPECT_FALSE(reply.error) << reply.error.description();
    const CKAssetReference asset = reply.asset.reference();
    return {asset.size, 1'700'000'000'000'000'000, asset.sha256, 0644};
  }

  std::shared_ptr<EmbeddedCloud> cloud;

 private:
  DocumentRecord made(const std::string &path) {
    DocumentRecord document;
    const std::size_t slash = path.rfind('/');
    document.record = NewRecordName();
    document.name = path.substr(slash + 1);
    document.parent = ContainerRecord(QVUbiquitousDefaultContainerID);
    document.content.mode = 0755;
    if (slash != std::string::npos) {
      const auto parent = at(path.substr(0, slash));
      EXPECT_TRUE(parent) << path;
      if (parent) document.parent = parent->record;
    }
    return document;
  }
  std::string putKind(const std::string &path, NSFileProviderItemKind kind, const std::string &target) {
    DocumentRecord document = made(path);
    document.kind = kind;
    document.target = target;
    save(MakeRecord(document));
    return document.record;
  }
};

// Ben's device on a cloud that goes wrong as a test says, and anna's hand in the same cloud.
class FaultyDrive : public testing::Test {
 protected:
  using Call = FaultyCloud::Call;
  using Fault = FaultyCloud::Fault;

  explicit FaultyDrive(KeldOptions options = {})
      : hand(cloudFolder),
        cloud(std::make_shared<FaultyCloud>(open())),
        device(withCloud(std::move(options))) {}

  // A document that ben has without its contents.
  void dataless(const std::string &path, const std::string &contents) {
    hand.put(path, contents);
    ASSERT_TRUE(device.knowsSoon(path));
    ASSERT_TRUE(eventually([&] { return device.status(path).upload == QVUploadState::inCloud; }));
  }
  // One that he made himself and has sent.
  void sent(const std::string &path, const std::string &contents) {
    device.keld.write(path, contents);
    const NSError error = device.waitForUploads(path);
    ASSERT_FALSE(error) << error.description();
  }
  bool isInCloudSoon(const std::string &path) {
    return eventually([&] { return hand.at(path).has_value(); });
  }
  bool leavesCloudSoon(const std::string &path) {
    return eventually([&] { return !hand.at(path).has_value(); });
  }
  static Fault failing(CKErrorCode code) {
    Fault fault;
    fault.error = CKErrorMake(code, "it fails");
    return fault;
  }
  static Fault hanging() {
    Fault fault;
    fault.hangs = true;
    return fault;
  }
  std::shared_ptr<CKCloud> open() {
    NSError error;
    auto opened = EmbeddedCloud::open(cloudFolder, AccountKeeper::localUserName(), "ben", &error);
    EXPECT_TRUE(opened) << error.description();
    return opened;
  }
  KeldOptions withCloud(KeldOptions options) {
    options.sync.cloud = cloud;
    return options;
  }
  std::vector<std::string> conflictCopies() {
    std::vector<std::string> found;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(device.keld.at("")))
      if (entry.path().filename().string().find("(conflict, ") != std::string::npos)
        found.push_back(entry.path().filename().string());
    return found;
  }

  const TemporaryFolder folder;
  const std::string cloudFolder = folder.path() + "/cloud";
  CloudHand hand;
  const std::shared_ptr<FaultyCloud> cloud;
  Device device;
};

}  // namespace droxa::keld
