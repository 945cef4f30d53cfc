#pragma once

#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/contents/ContentsDigest.h"
#include "keld/contents/ContentsStorage.h"
#include "keld/contents/PromiseFile.h"

namespace droxa::keld {

// How a test's storage takes its file system to be, whatever it is.
struct StorageKind {
  const char *name;
  ContentsCapabilities capabilities;
};

inline constexpr StorageKind kPlaceholders{"placeholders", {true, true, true, true}};
inline constexpr StorageKind kWithoutLeases{"withoutLeases", {true, true, true, false}};
inline constexpr StorageKind kPromises{"promises", {false, false, true, true}};
inline constexpr StorageKind kPromisesWithoutExchange{"promisesWithoutExchange", {false, false, false, true}};

inline std::string BytesOfLength(std::size_t length, unsigned seed = 1) {
  std::string bytes(length, '\0');
  unsigned state = seed * 2654435761U + 1;
  for (char &byte : bytes) {
    state = state * 1664525U + 1013904223U;
    byte = static_cast<char>('!' + (state >> 24) % 90);
  }
  return bytes;
}

// A replica in a folder of its own, with its storage; what a test does as the user goes past the storage.
class ContentsReplica {
 public:
  static constexpr std::int64_t kDate = 1'600'000'000'123'456'789;

  explicit ContentsReplica(const StorageKind &kind = kPlaceholders, std::string below = {})
      : path_(makeFolder(below)) {
    settings_.assume = kind.capabilities;
    settings_.spaceToLeave = 0;
    settings_.hooks.beforeExchange = [this] { run(hooks.beforeExchange); };
    settings_.hooks.afterExchange = [this] { run(hooks.afterExchange); };
    settings_.hooks.beforePunch = [this] { run(hooks.beforePunch); };
    settings_.hooks.afterPunch = [this] { run(hooks.afterPunch); };
    std::filesystem::create_directories(path_ + "/folder");
    folder_ = OwnedDescriptor(::open((path_ + "/folder").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    reopen();
  }
  ~ContentsReplica() {
    storage_.reset();
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  ContentsReplica(const ContentsReplica &) = delete;
  ContentsReplica &operator=(const ContentsReplica &) = delete;

  void reopen() {
    int error = 0;
    storage_.reset();
    storage_ = ContentsStorage::open(path_, settings_, &error);
    ASSERT_EQ(error, 0);
  }
  ContentsStorage &storage() const { return *storage_; }
  ContentsSettings &settings() { return settings_; }
  int folder() const { return folder_.get(); }
  const std::string &root() const { return path_; }
  std::string path(const std::string &name) const { return path_ + "/folder/" + name; }

  DocumentMarker markerOf(const std::string &bytes, const std::string &version = "1") const {
    DocumentMarker marker;
    marker.state = MarkerState::dataless;
    marker.recordName = "record";
    marker.contentVersion = version;
    marker.digest = ContentsDigest::of(bytes);
    marker.size = bytes.size();
    marker.modified = kDate;
    return marker;
  }
  DocumentLook look(const std::string &name) const { return storage_->classify(folder(), name); }

  // As the cloud's side does it.
  ContentsResult publishPlaceholder(const std::string &name, const std::string &bytes,
                                    std::uint32_t mode = 0640) const {
    auto prepared = storage_->preparePlaceholder(markerOf(bytes), mode, {0, kDate});
    if (!prepared.result.isDone()) return prepared.result;
    return storage_->publishNew(prepared.file, folder(), name);
  }
  std::unique_ptr<PartFile> finishedPart(const std::string &bytes) const {
    auto opened = storage_->openPart(ContentsDigest::of(bytes), bytes.size());
    if (!opened.part) return nullptr;
    if (!opened.part->isFinished()) {
      EXPECT_TRUE(opened.part->append(std::string_view(bytes).substr(opened.part->length())).isDone());
      EXPECT_TRUE(opened.part->finish().isDone());
    }
    return std::move(opened.part);
  }
  ContentsResult fill(const std::string &name, const std::string &bytes, std::uint32_t mode = 0640) const {
    const auto part = finishedPart(bytes);
    if (!part) return ContentsResult::failed(ContentsOutcome::busy);
    return storage_->materialise(folder(), name, *part, PartUse::consume, markerOf(bytes), mode,
                                 look(name).facts);
  }
  void publishPresent(const std::string &name, const std::string &bytes) const {
    ASSERT_TRUE(publishPlaceholder(name, bytes).isDone());
    ASSERT_TRUE(fill(name, bytes).isDone());
  }
  PreparedFile preparedContents(const std::string &bytes, const std::string &version = "2") const {
    const auto part = finishedPart(bytes);
    auto prepared = storage_->prepareContents(*part, PartUse::consume, markerOf(bytes, version), 0640);
    EXPECT_TRUE(prepared.result.isDone());
    return std::move(prepared.file);
  }

  // As the user does it.
  void write(const std::string &name, const std::string &bytes) const {
    std::ofstream(path(name), std::ios::binary | std::ios::trunc) << bytes;
  }
  void writeAt(const std::string &name, off_t offset, const std::string &bytes) const {
    const OwnedDescriptor file(::open(path(name).c_str(), O_WRONLY | O_CLOEXEC));
    ASSERT_TRUE(static_cast<bool>(file));
    ASSERT_EQ(::pwrite(file.get(), bytes.data(), bytes.size(), offset), static_cast<ssize_t>(bytes.size()));
  }
  std::string read(const std::string &name) const { return readFile(path(name)); }
  bool exists(const std::string &name) const { return ::access(path(name).c_str(), F_OK) == 0; }
  static std::string readFile(const std::string &path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  std::size_t count(const std::string &storageFolder) const {
    const std::filesystem::directory_iterator begin(path_ + "/" + kContentsStorageName + "/" + storageFolder);
    return static_cast<std::size_t>(std::distance(begin, {}));
  }
  // Nothing but parts may be left behind by an operation that has ended.
  void expectTidy() const { EXPECT_EQ(count("temporary"), 0U); }

  ContentsHooks hooks;  // each is called once

 private:
  static void run(std::function<void()> &hook) {
    if (const auto once = std::exchange(hook, nullptr)) once();
  }
  static std::string makeFolder(const std::string &below) {
    std::string path =
        (below.empty() ? std::filesystem::temp_directory_path().string() : below) + "/droxa-contents-XXXXXX";
    if (!mkdtemp(path.data())) ADD_FAILURE() << "can't make " << path;
    return path;
  }

  const std::string path_;
  ContentsSettings settings_;
  OwnedDescriptor folder_;
  std::unique_ptr<ContentsStorage> storage_;
};

// For suites that hold in every form.
class EachStorageKind : public testing::TestWithParam<StorageKind> {
 protected:
  ContentsReplica replica_{GetParam()};
  bool hasPlaceholders() const { return GetParam().capabilities.form() == DatalessForm::placeholder; }
};

inline std::string StorageKindName(const testing::TestParamInfo<StorageKind> &info) {
  return info.param.name;
}

inline void PrintTo(ContentsOutcome outcome, std::ostream *stream) {
  static constexpr const char *kNames[] = {"done",  "nameTaken", "folderGone",    "gone", "changedMeanwhile",
                                           "inUse", "noSpace",   "wrongContents", "busy", "error"};
  *stream << kNames[static_cast<int>(outcome)];
}

inline void PrintTo(DocumentClass kind, std::ostream *stream) {
  static constexpr const char *kNames[] = {"missing",       "notADocument", "plain",    "present",
                                           "edited",        "dataless",     "evicting", "overwritten",
                                           "partlyWritten", "unreadable"};
  *stream << kNames[static_cast<int>(kind)];
}

}  // namespace droxa::keld
