#pragma once

#include <algorithm>
#include <map>
#include <sys/mman.h>
#include <unistd.h>

#include "platform/cloudkit/CKContainer.h"
#include "platform/cloudkit/EmbeddedCloud.h"
#include "tessaly/QVRecordKeys.h"
#include "tessaly/QVUbiquitousCloudKitContainer.h"
#include "tessaly/QVUserDefaults.h"
#include "tests/extension/ExtensionFixture.h"
#include "tests/platform/EnvironmentVariable.h"
#include "tests/support/FaultyCloud.h"
#include "tests/support/Once.h"

namespace droxa {

inline const CKRecordZoneID kDrive{"drive"};

// What one item was answered.
struct ThumbnailAnswer {
  std::string identifier;
  NSData data;
  std::optional<std::string> contentType;
  NSError error;
};

// The answers of one request, in order. Thread contract: any thread.
class ThumbnailAnswers {
 public:
  NSFileProviderThumbnailHandler handler() {
    return [this](const std::string &identifier, const NSData &data,
                  const std::optional<std::string> &contentType, const NSError &error) {
      EXPECT_FALSE(done.called()) << identifier << " after the completion";
      const Lock lock(mutex_);
      answers_.push_back({identifier, data, contentType, error});
    };
  }
  std::vector<ThumbnailAnswer> all() const {
    const Lock lock(mutex_);
    return answers_;
  }
  // The one answer of the item; the test fails when there isn't exactly one.
  ThumbnailAnswer of(const std::string &identifier) const {
    std::vector<ThumbnailAnswer> found = all();
    std::erase_if(found, [&](const ThumbnailAnswer &answer) { return answer.identifier != identifier; });
    EXPECT_EQ(found.size(), 1U) << identifier;
    return found.empty() ? ThumbnailAnswer() : found[0];
  }

  const Once<NSError> done{"the final completion"};

 private:
  mutable Mutex mutex_;
  std::vector<ThumbnailAnswer> answers_ GUARDED_BY(mutex_);
};

// An extension whose drive's cloud is one of the test's own, with calls that can go wrong, and whose
// applications, icons and thumbnailers are those that the test installs.
class ThumbnailsTest : public ExtensionTest {
 protected:
  using Call = FaultyCloud::Call;
  ThumbnailsTest() {
    EXPECT_FALSE(embedded->saveZone(kDrive, {}));
    registerCloud();
    clear();
  }
  ~ThumbnailsTest() override {
    CKContainer::registerContainer(QVUbiquitousCloudKitContainerIdentifier, nullptr);
    QVUserDefaults::forget();
  }

  std::shared_ptr<EmbeddedCloud> open(const std::string &account) const {
    NSError error;
    auto opened = EmbeddedCloud::open(home.path() + "/cloud", account, "device", &error);
    EXPECT_TRUE(opened) << error.description();
    return opened;
  }
  void registerCloud() const {
    CKContainer::registerContainer(QVUbiquitousCloudKitContainerIdentifier,
                                   [cloud = cloud](NSError *) { return cloud; });
  }
  void setDefaults(const std::string &json) const {
    std::ofstream(home.configuration() + "/defaults.json") << json;
    QVUserDefaults::forget();
  }
  void setLimit(int limit) const {
    setDefaults(R"({"maxRecordCountInFetchRecordsOperation": )" + std::to_string(limit) + "}");
  }

  // A document with a record in the cloud, that has a thumbnail unless it is nullopt.
  std::string addDocument(const std::string &name, std::int64_t size,
                          const std::optional<std::string> &thumbnail, const CKRecordZoneID &zone = kDrive) {
    const QVFileObjectID identifier = daemon.addDatalessDocument(name, static_cast<std::uint64_t>(size));
    CKRecord record;
    record.recordType = "item";
    record.recordID = {"record of " + name, zone};
    record.fields[kQVRecordKeySize] = size;
    if (thumbnail) record.fields[kQVRecordKeyThumbnail1024x1024] = upload(*embedded, *thumbnail);
    const CKModifyReply reply = embedded->modifyRecords({{record}, {}}, {});
    EXPECT_FALSE(reply.error) << reply.error.description();
    resolveTo(identifier, record.recordID);
    return identifier.asString();
  }
  static CKAsset upload(CKCloud &into, const std::string &bytes) {
    const int file = memfd_create("thumbnail", MFD_CLOEXEC);
    EXPECT_EQ(write(file, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
    const CKUploadReply reply = into.uploadAsset(file, bytes.size(), {}, {});
    close(file);
    EXPECT_FALSE(reply.error) << reply.error.description();
    return reply.asset;
  }
  void resolveTo(const QVFileObjectID &identifier, const CKRecordID &recordID) {
    FakeSharing::Answers answers = daemon.sharing().answers();
    answers.recordIDs[identifier] = recordID;
    daemon.sharing().setAnswers(answers);
  }

  static std::string documentsOf(const std::string &containerID) {
    return DroxaProcessHome().replica() + "/" + containerID + "/Documents";
  }

  // Makes the request; waits for its end.
  std::shared_ptr<ThumbnailAnswers> fetch(const std::vector<std::string> &identifiers,
                                          CGSize size = {256, 256}) {
    clear();
    auto answers = std::make_shared<ThumbnailAnswers>();
    progress = extension->fetchThumbnailsForItemIdentifiers(
        identifiers, size, answers->handler(),
        [answers, done = answers->done.completion()](const NSError &error) { done(error); });
    EXPECT_TRUE(answers->done.wait());
    return answers;
  }
  // The lines that thumbnails are about: those of lookups and sections left out.
  Lines told() const {
    Lines lines = logged();
    std::erase_if(lines, [](const std::string &line) {
      return line.find("asked url") != std::string::npos || line.find("] returning") != std::string::npos ||
             line.find("┗") != std::string::npos || line.find("asked properties") != std::string::npos;
    });
    return lines;
  }
  std::size_t count(const std::string &text) const {
    const Lines lines = logged();
    return static_cast<std::size_t>(std::count_if(lines.begin(), lines.end(), [&](const std::string &line) {
      return line.find(text) != std::string::npos;
    }));
  }

  const std::string share = home.path() + "/share";
  const EnvironmentVariable dataHome{"XDG_DATA_HOME", home.path() + "/data"};
  const EnvironmentVariable dataFolders{"XDG_DATA_DIRS", share};
  const EnvironmentVariable configuration{"XDG_CONFIG_HOME", home.path() + "/settings"};
  // Before the cloud of the test takes the place of the home's.
  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
  const std::shared_ptr<EmbeddedCloud> embedded = open("vera");
  const std::shared_ptr<FaultyCloud> cloud = std::make_shared<FaultyCloud>(embedded);
  std::shared_ptr<NSProgress> progress;
};

}  // namespace droxa
