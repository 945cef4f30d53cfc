// In a replica without extended attributes promises stand for documents that aren't here: they are shown as
// their documents.

#include "KeldFixture.h"
#include "keld/contents/ContentsDigest.h"
#include "keld/contents/ContentsStorage.h"
#include "keld/contents/PromiseFile.h"
#include "tests/support/MountedFolder.h"

namespace droxa::keld {

namespace {

constexpr std::int64_t kModified = 1'600'000'000'123'456'789;
const std::string kBytes(5'000, 'b');

KeldOptions withPromises(WatcherKind watcher) {
  KeldOptions options = WatchedBy(watcher);
  options.sync.contents.assume = ContentsCapabilities{false, false, true, true};
  options.sync.contents.spaceToLeave = 0;
  return options;
}

// What the sync does to documents, done by the test.
class PromisedDrive {
 public:
  explicit PromisedDrive(WatcherKind watcher, bool starts = true) : keld(withPromises(watcher), starts) {}

  // Of the root, besides the containers' folders.
  std::vector<std::string> names() {
    std::vector<std::string> all = keld.namesIn(""), names;
    for (std::string &name : all)
      if (name != "Documents" && name != "Desktop") names.push_back(std::move(name));
    return names;
  }
  void openStorage() {
    int error = 0;
    storage_ = ContentsStorage::open(keld.replica(), keld.options().sync.contents, &error);
    ASSERT_TRUE(storage_) << error;
  }
  OwnedDescriptor folder(const std::string &path) {
    return OwnedDescriptor(::open(keld.at(path).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  }
  DocumentMarker marker() const {
    DocumentMarker marker;
    marker.state = MarkerState::dataless;
    marker.recordName = "record";
    marker.contentVersion = "1";
    marker.digest = ContentsDigest::of(kBytes);
    marker.size = kBytes.size();
    marker.modified = kModified;
    return marker;
  }
  void promise(const std::string &name, const std::string &in = "") {
    auto prepared = storage_->preparePlaceholder(marker(), 0640, {0, kModified});
    ASSERT_TRUE(prepared.result.isDone());
    ASSERT_TRUE(storage_->publishNew(prepared.file, folder(in).get(), name).isDone());
    ASSERT_TRUE(std::filesystem::exists(keld.at((in.empty() ? "" : in + "/") + PromiseNameFor(name))));
  }
  void materialise(const std::string &name) {
    const OwnedDescriptor in = folder("");
    auto part = storage_->openPart(marker().digest, kBytes.size());
    ASSERT_TRUE(part.part);
    ASSERT_TRUE(part.part->append(kBytes).isDone());
    ASSERT_TRUE(part.part->finish().isDone());
    const FileFacts facts = storage_->classify(in.get(), name).facts;
    ASSERT_TRUE(
        storage_->materialise(in.get(), name, *part.part, PartUse::consume, marker(), 0640, facts).isDone());
  }
  void evict(const std::string &name) {
    const OwnedDescriptor in = folder("");
    const FileFacts facts = storage_->classify(in.get(), name).facts;
    ASSERT_TRUE(storage_->evict(in.get(), name, facts, marker()).isDone());
  }
  bool isDataless(const std::string &path) {
    const auto record = keld.record(path);
    return record && (record->flags & kDatalessFlag) != 0;
  }
  bool isPresent(const std::string &path) {
    const auto record = keld.record(path);
    return record && (record->flags & kDatalessFlag) == 0;
  }

  KeldFixture keld;

 private:
  std::unique_ptr<ContentsStorage> storage_;
};

}  // namespace

class Promises : public testing::TestWithParam<WatcherKind> {
 protected:
  Promises() : drive(GetParam()), keld(drive.keld) { drive.openStorage(); }
  PromisedDrive drive;
  KeldFixture &keld;
};

INSTANTIATE_TEST_SUITE_P(Watchers, Promises,
                         testing::Values(WatcherKind::best, WatcherKind::inotify, WatcherKind::scan),
                         [](const auto &kind) {
                           return std::string(kind.param == WatcherKind::best      ? "Best"
                                              : kind.param == WatcherKind::inotify ? "Inotify"
                                                                                   : "Scanning");
                         });

TEST_P(Promises, areShownAsTheirDocuments) {
  keld.settle();
  drive.promise("a");
  ASSERT_TRUE(eventually([&] { return keld.knows("a"); }));
  const auto item = keld.item("a");
  EXPECT_EQ(item->fields().filename, "a");
  EXPECT_EQ(item->fields().kind, NSFileProviderItemKind::document);
  EXPECT_EQ(item->fields().documentSize, kBytes.size());
  EXPECT_EQ(item->fields().contentModificationDate, NSDate::dateWithNanosecondsSince1970(kModified));
  EXPECT_EQ(item->fields().permissions, 0640U);
  EXPECT_FALSE(item->fields().isDownloaded);
  EXPECT_EQ(drive.names(), std::vector<std::string>{"a"});
}

TEST_P(Promises, areFoundAtTheURLOfTheDocumentBeforeAnybodyToldOfThem) {
  keld.settle();
  drive.promise("a");
  const auto item = keld.item("a");
  ASSERT_TRUE(item);
  EXPECT_FALSE(item->fields().isDownloaded);
}

TEST_P(Promises, keepTheirDocumentsIdentityWhenItComesAndGoes) {
  drive.promise("a");
  keld.settle();
  const ItemNumber number = keld.number("a");
  ASSERT_NE(number, 0U);
  drive.materialise("a");
  ASSERT_TRUE(eventually([&] { return drive.isPresent("a"); }));
  EXPECT_EQ(keld.number("a"), number);
  keld.settle();
  EXPECT_EQ(drive.names(), std::vector<std::string>{"a"});
  drive.evict("a");
  ASSERT_TRUE(eventually([&] { return drive.isDataless("a"); }));
  keld.settle();
  EXPECT_EQ(keld.number("a"), number);
  EXPECT_EQ(keld.record("a")->facts.size, kBytes.size());
}

TEST_P(Promises, thatAreRenamedAndMovedAreTheSameDocuments) {
  drive.promise("a");
  keld.folder("f");
  keld.settle();
  const ItemNumber number = keld.number("a");
  keld.rename(PromiseNameFor("a"), PromiseNameFor("b"));
  ASSERT_TRUE(eventually([&] { return keld.number("b") == number; }));
  EXPECT_FALSE(keld.knows("a"));
  keld.rename(PromiseNameFor("b"), "f/" + PromiseNameFor("c"));
  ASSERT_TRUE(eventually([&] { return keld.number("f/c") == number; }));
  EXPECT_TRUE(drive.isDataless("f/c"));
}

TEST_P(Promises, thatAreRemovedAreDocumentsThatDied) {
  drive.promise("a");
  keld.settle();
  ASSERT_TRUE(keld.knows("a"));
  keld.remove(PromiseNameFor("a"));
  EXPECT_TRUE(eventually([&] { return !keld.knows("a"); }));
}

TEST_P(Promises, withAShortenedNameAreSeenComingAndGoing) {
  const std::string name = std::string(250, 'x');
  drive.promise(name);
  drive.promise(name + "y");
  keld.settle();
  EXPECT_TRUE(drive.isDataless(name));
  EXPECT_TRUE(drive.isDataless(name + "y"));
  keld.remove(PromiseNameFor(name));
  EXPECT_TRUE(eventually([&] { return !keld.knows(name); }));
  EXPECT_TRUE(keld.knows(name + "y"));
}

TEST_P(Promises, areFoundAgainAtTheNextStart) {
  drive.promise("a");
  drive.promise(std::string(250, 'x'));
  keld.settle();
  const ItemNumber number = keld.number("a");
  keld.stop();
  keld.rename(PromiseNameFor("a"), PromiseNameFor("b"));
  keld.start();
  keld.waitForFirstScan();
  EXPECT_EQ(keld.number("b"), number);
  EXPECT_TRUE(drive.isDataless(std::string(250, 'x')));
  EXPECT_EQ(drive.names().size(), 2U);
}

TEST_P(Promises, whatIsOnlyCalledLikeOneIsNothing) {
  keld.write(".a.droxafault", "no promise");
  keld.write(".b.droxafault", EncodePromise({"b", drive.marker(), 0640, kModified}) + "/");
  keld.settle();
  EXPECT_TRUE(drive.names().empty());
}

TEST(PromisesOnTheDisk, areShownOnAFileSystemWithoutAttributes) {
  PromisedDrive drive(WatcherKind::best, false);
  const MountedFolder mounted(drive.keld.replica(), "ramfs");
  if (!mounted) GTEST_SKIP() << "this process may not mount file systems";
  drive.keld.options().sync.contents.assume.reset();
  drive.keld.folder("");
  drive.openStorage();
  drive.promise("before");
  drive.keld.start();
  drive.keld.settle();
  EXPECT_TRUE(drive.isDataless("before"));
  const ItemNumber number = drive.keld.number("before");
  drive.materialise("before");
  ASSERT_TRUE(eventually([&] { return drive.isPresent("before"); }));
  EXPECT_EQ(drive.keld.number("before"), number);
  drive.evict("before");
  ASSERT_TRUE(eventually([&] { return drive.isDataless("before"); }));
  EXPECT_EQ(drive.keld.number("before"), number);
  drive.keld.stop();
}

TEST(PromisesOnTheDisk, areNoDocumentsWherePlaceholdersStandForThem) {
  KeldFixture keld;
  PromiseFile promise;
  promise.name = "a";
  promise.marker.state = MarkerState::dataless;
  promise.marker.recordName = "record";
  promise.marker.digest = std::string(64, 'b');
  promise.marker.size = 5;
  keld.write(PromiseNameFor("a"), EncodePromise(promise));
  keld.settle();
  EXPECT_EQ(keld.namesIn(""), (std::vector<std::string>{"Desktop", "Documents"}));
}

}  // namespace droxa::keld
