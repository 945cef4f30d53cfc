// What a scan makes of what is there.

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

TEST(Scan, takesAnyName) {
  const std::vector<std::string> names{"new\nline",
                                       "\xff\xfe invalid",
                                       std::string(255, 'n'),
                                       ".hidden",
                                       "..double",
                                       "...",
                                       "-rf",
                                       " ",
                                       "a%20b",
                                       "\x01"};
  KeldFixture drive({}, false);
  drive.folder("before");
  for (const std::string &name : names) drive.write("before/" + name);
  drive.start();
  drive.folder("after");
  for (const std::string &name : names) drive.write("after/" + name);
  drive.settle();
  std::vector<std::string> sorted = names;
  std::sort(sorted.begin(), sorted.end());
  EXPECT_EQ(drive.namesIn("before"), sorted);
  EXPECT_EQ(drive.namesIn("after"), sorted);
  for (const std::string &name : names) {
    Once<NSURL, NSError> url("URL");
    drive.session()->getURLForFileObjectID(QVFileObjectID::documentID(drive.number("after/" + name)),
                                           url.completion());
    EXPECT_EQ(url.value<0>().path(), drive.at("after/" + name));
  }
}

TEST(Scan, neverFollowsALink) {
  KeldFixture drive({}, false);
  const std::string outside = drive.home().makeFolder("outside");
  drive.home().write("outside/secret", "x");
  std::filesystem::create_symlink(outside, drive.at("link"));
  std::filesystem::create_symlink("..", drive.at("up"));
  drive.start();
  drive.settle();
  EXPECT_EQ(drive.record("link")->facts.kind, NSFileProviderItemKind::symbolicLink);
  EXPECT_FALSE(drive.knows("link/secret"));
  EXPECT_FALSE(drive.record("up")->isFolder());
}

TEST(Scan, tellsAliasesFromOtherLinks) {
  KeldFixture drive;
  drive.folder("f");
  drive.write("f/target");
  drive.settle();
  std::filesystem::create_symlink("f/target", drive.at("relative"));
  std::filesystem::create_symlink(drive.at("f"), drive.at("absolute"));
  std::filesystem::create_symlink("/etc", drive.at("foreign"));
  drive.settle();
  EXPECT_EQ(drive.item("relative")->fields().kind, NSFileProviderItemKind::alias);
  EXPECT_EQ(drive.item("absolute")->fields().kind, NSFileProviderItemKind::alias);
  EXPECT_TRUE(drive.item("absolute")->fileObjectID().isFolderOrAliasID());
  EXPECT_EQ(drive.item("foreign")->fields().kind, NSFileProviderItemKind::symbolicLink);
  EXPECT_TRUE(drive.item("foreign")->fileObjectID().isDocumentID());
}

TEST(Scan, passesOverWhatIsNoDocument) {
  KeldFixture drive({}, false);
  ASSERT_EQ(::mkfifo(drive.at("pipe").c_str(), 0600), 0);
  drive.write("document");
  drive.start();
  ASSERT_EQ(::mkfifo(drive.at("pipe2").c_str(), 0600), 0);
  drive.settle();
  EXPECT_FALSE(drive.knows("pipe"));
  EXPECT_FALSE(drive.knows("pipe2"));
  EXPECT_TRUE(drive.knows("document"));
}

TEST(Scan, goesDeeperThanAPathMayBeLong) {
  KeldFixture drive({}, false);
  const std::string name(200, 'd');
  int folder = ::open(drive.at("").c_str(), O_PATH | O_DIRECTORY);
  for (int depth = 0; depth < 40; ++depth) {
    ASSERT_EQ(::mkdirat(folder, name.c_str(), 0700), 0);
    const int next = ::openat(folder, name.c_str(), O_PATH | O_DIRECTORY);
    ::close(folder);
    folder = next;
  }
  const int file = ::openat(folder, "deepest", O_CREAT | O_WRONLY, 0600);
  ASSERT_GE(file, 0);
  ::close(file);
  drive.start();
  drive.waitForFirstScan();
  std::string path;
  for (int depth = 0; depth < 40; ++depth) path += name + "/";
  EXPECT_TRUE(drive.knows(path + "deepest"));
  // A change down there is seen too.
  const int second = ::openat(folder, "second", O_CREAT | O_WRONLY, 0600);
  ::close(second);
  ::close(folder);
  EXPECT_TRUE(eventually([&] { return drive.knows(path + "second"); }));
}

TEST(Scan, survivesFoldersThatVanishUnderIt) {
  KeldFixture drive({}, false);
  for (int i = 0; i < 200; ++i) {
    drive.folder("f" + std::to_string(i));
    drive.write("f" + std::to_string(i) + "/a");
  }
  drive.start();
  for (int i = 0; i < 200; i += 2) drive.remove("f" + std::to_string(i));
  drive.settle();
  for (int i = 0; i < 200; ++i) EXPECT_EQ(drive.knows("f" + std::to_string(i) + "/a"), i % 2 == 1) << i;
}

TEST(Scan, reportsAFolderThatCannotBeRead) {
  if (::geteuid() != 0) {
    KeldFixture drive({}, false);
    drive.folder("closed");
    ::chmod(drive.at("closed").c_str(), 0);
    drive.start();
    drive.settle();
    EXPECT_EQ(drive.pageOf("closed", 0, 10).error.code(), QVErrorUnreadable);
    ::chmod(drive.at("closed").c_str(), 0700);
    return;
  }
  // The administrator reads everything, so the daemon runs as somebody who doesn't.
  KeldFixture drive({}, false);
  drive.folder("closed");
  drive.write("closed/inside");
  for (const auto &entry : std::filesystem::recursive_directory_iterator(drive.home().root()))
    ASSERT_EQ(::lchown(entry.path().c_str(), 65534, 65534), 0);
  ASSERT_EQ(::chown(drive.home().root().c_str(), 65534, 65534), 0);
  ASSERT_EQ(::chmod(drive.at("closed").c_str(), 0), 0);
  ASSERT_EQ(::seteuid(65534), 0);
  drive.options() = WatchedBy(WatcherKind::inotify);
  drive.start();
  drive.settle();
  EXPECT_EQ(drive.pageOf("closed", 0, 10).error.domain(), QVTessalyErrorDomain);
  EXPECT_EQ(drive.pageOf("closed", 0, 10).error.code(), QVErrorUnreadable);
  EXPECT_TRUE(drive.knows("closed"));
  ::chmod(drive.at("closed").c_str(), 0700);
  EXPECT_TRUE(eventually([&] { return drive.knows("closed/inside"); }));
  EXPECT_EQ(drive.pageOf("closed", 0, 10).error, NSError());
  drive.stop();
  ASSERT_EQ(::seteuid(0), 0);
}

TEST(Scan, keepsWhatIsPrivateFromListings) {
  KeldFixture drive;
  const std::string container = drive.replica() + "/org.example.App";
  std::filesystem::create_directories(container + "/Documents");
  std::filesystem::create_directories(container + "/Library");
  drive.write(container + "/Library/state");
  drive.settle();
  EXPECT_TRUE(drive.knows(container + "/Library/state"));
  const auto item = drive.item(container + "/Library/state");
  Once<NSURL, NSError> url("URL");
  drive.session()->getURLForItemIdentifier(item->itemIdentifier(), url.completion());
  EXPECT_EQ(url.value<0>().path(), container + "/Library/state");
  Once<QVQueryItems, std::uint64_t, NSError> folders("all folders");
  drive.session()->enumerateAllFoldersWithSortOrder(0, 0, 1000, folders.completion());
  for (const auto &folder : folders.value<0>()) EXPECT_NE(folder->fields().filename, "Library");
}

TEST(Scan, makesTheBuiltInContainersAgain) {
  KeldFixture drive;
  drive.settle();
  std::filesystem::remove_all(drive.replica() + "/" + QVUbiquitousDesktopContainerID);
  EXPECT_TRUE(
      eventually([&] { return std::filesystem::exists(drive.documents(QVUbiquitousDesktopContainerID)); }));
  drive.settle();
  EXPECT_TRUE(drive.knows(drive.documents(QVUbiquitousDesktopContainerID)));
}

TEST(Scan, tellsOfContainersThatComeAndGo) {
  KeldFixture drive;
  drive.settle();
  const auto subscriber = std::make_shared<RecordingSubscriber>();
  Once<NSError> subscribed("subscription");
  drive.session()->subscribeToNotifications(subscriber, subscribed.completion());
  ASSERT_EQ(subscribed.value<0>(), NSError());
  std::filesystem::create_directories(drive.replica() + "/org.example.Sketches/Documents");
  EXPECT_TRUE(subscriber->waitFor("QVContainerListDidChangeNotification"));
  drive.settle();
  EXPECT_EQ(NamesOf(drive.page(std::nullopt, 0, 10).items),
            (std::vector<std::string>{"Desktop", "Documents", "Sketches"}));
  const std::size_t told = subscriber->names().size();
  std::filesystem::remove_all(drive.replica() + "/org.example.Sketches");
  EXPECT_TRUE(eventually([&] { return subscriber->names().size() > told; }));
  drive.settle();
  EXPECT_EQ(NamesOf(drive.page(std::nullopt, 0, 10).items),
            (std::vector<std::string>{"Desktop", "Documents"}));
}

TEST(Scan, ignoresFoldersThatAreNoContainers) {
  KeldFixture drive({}, false);
  std::filesystem::create_directories(drive.replica() + "/plain/Documents");
  std::filesystem::create_directories(drive.replica() + "/.hidden.folder/Documents");
  drive.write(drive.replica() + "/a.file");
  drive.start();
  drive.settle();
  EXPECT_EQ(drive.daemon().containers()->entries().size(), 4U);
}

}  // namespace droxa::keld
