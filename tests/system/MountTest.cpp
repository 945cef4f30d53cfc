#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <poll.h>
#include <signal.h>
#include <sys/inotify.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using Json = nlohmann::json;

// A drive that is mounted in its home.
class Mounted : public ::testing::Test {
 protected:
  void SetUp() override {
    if (access("/dev/fuse", R_OK | W_OK) != 0) GTEST_SKIP() << "/dev/fuse can't be used here";
    fs::create_directories(source());
  }
  void TearDown() override {
    if (drive.hasKeld()) drive.droxa({"unmount"});
  }

  std::string source() const { return drive.home() + "/source"; }
  std::string folder() const { return drive.home() + "/Droxa Drive"; }
  std::string at(const std::string &path) const { return folder() + "/" + path; }
  // With the documents of source() in the cloud alone.
  void start() {
    drive.importFolder(source());
    drive.start();
    mount();
  }
  void mount() {
    const Result mounted = drive.droxa({"mount"});
    ASSERT_EQ(mounted.status, 0) << mounted.errors << drive.host().errors();
    ASSERT_EQ(mounted.output, folder() + "\n");
  }
  std::string contentsOf(const std::string &path) {
    return drive.contents(path).value("contents", std::string());
  }
  // Through a process of its own, which the test can't be held up by.
  Result run(const std::string &script, std::chrono::milliseconds deadline = 60s) {
    Process process({"/bin/bash", "-c", script, "bash", folder()}, drive.home() + "/output",
                    "script" + std::to_string(scripts_++));
    const auto status = process.wait(deadline);
    return {status.value_or(-1), process.output(), process.errors()};
  }
  std::unique_ptr<Process> inBackground(const std::string &script, const std::string &name) {
    return std::make_unique<Process>(std::vector<std::string>{"/bin/bash", "-c", script, "bash", folder()},
                                     drive.home() + "/output", name);
  }

  Drive drive;

 private:
  int scripts_ = 0;
};

std::vector<std::string> namesIn(const std::string &folder) {
  std::vector<std::string> names;
  for (const auto &entry : fs::directory_iterator(folder)) names.push_back(entry.path().filename().native());
  std::sort(names.begin(), names.end());
  return names;
}

// With what the root of every drive shows.
std::vector<std::string> withOwn(std::vector<std::string> names) {
  names.insert(names.end(), {".Trash-" + std::to_string(getuid()), "Desktop", "Documents"});
  std::sort(names.begin(), names.end());
  return names;
}

std::string attribute(const std::string &path, const char *name) {
  char value[256];
  const ssize_t length = lgetxattr(path.c_str(), name, value, sizeof(value));
  return length < 0 ? "errno " + std::to_string(errno) : std::string(value, static_cast<std::size_t>(length));
}

ino_t inodeOf(const std::string &path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 ? status.st_ino : 0;
}

TEST_F(Mounted, showsTheDriveAndTakesWhatIsWritten) {
  start();
  writeFile(at("a.txt"), "one");
  EXPECT_EQ(readFile(drive.documents() + "/a.txt"), "one");
  fs::create_directories(at("folder/below"));
  fs::rename(at("a.txt"), at("folder/below/b.txt"));
  EXPECT_EQ(readFile(at("folder/below/b.txt")), "one");
  EXPECT_FALSE(fs::exists(at("a.txt")));
  writeFile(at("draft"), "two");
  fs::rename(at("draft"), at("folder/below/b.txt"));
  EXPECT_EQ(readFile(at("folder/below/b.txt")), "two");
  EXPECT_EQ(namesIn(at("folder/below")), std::vector<std::string>{"b.txt"});
  EXPECT_TRUE(drive.waitForName("b.txt", "folder/below"));
  fs::create_symlink("folder", at("link"));
  EXPECT_EQ(fs::read_symlink(at("link")), "folder");
  fs::remove_all(at("folder"));
  EXPECT_FALSE(fs::exists(drive.documents() + "/folder"));
  EXPECT_FALSE(fs::exists(at("folder")));
}

TEST_F(Mounted, aDocumentThatWasUnlinkedIsReadAndWrittenWhileItIsOpen) {
  start();
  const int file = open(at("a").c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
  ASSERT_GE(file, 0);
  EXPECT_EQ(open(at("a").c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600), -1);
  EXPECT_EQ(errno, EEXIST);
  ASSERT_EQ(unlink(at("a").c_str()), 0);
  EXPECT_EQ(pwrite(file, "abc", 3, 0), 3);
  struct stat status {};
  EXPECT_EQ(fstat(file, &status), 0);
  EXPECT_EQ(status.st_size, 3);
  EXPECT_EQ(ftruncate(file, 2), 0);
  char bytes[4];
  EXPECT_EQ(pread(file, bytes, 4, 0), 2);
  close(file);
}

TEST_F(Mounted, aDatalessDocumentIsFetchedByTheFirstReadAndByNothingElse) {
  const std::string bytes = std::string(300'000, 'x') + "end";
  for (int i = 0; i < 20; ++i) writeFile(source() + "/" + std::to_string(i) + ".bin", bytes);
  start();
  ASSERT_TRUE(drive.waitForName("19.bin"));
  ASSERT_TRUE(eventually([&] { return drive.contents("/").value("dataless", 0) == 20; }));
  const Result looked = run("ls -lR \"$1\" && stat \"$1\"/*.bin && du -s \"$1\" && find \"$1\" -size +1k");
  EXPECT_EQ(looked.status, 0) << looked.errors;
  EXPECT_EQ(fs::file_size(at("3.bin")), bytes.size());
  EXPECT_EQ(attribute(at("3.bin"), "user.droxa.state"), "dataless,in the cloud");
  const int opened = open(at("3.bin").c_str(), O_RDONLY | O_CLOEXEC);
  ASSERT_GE(opened, 0);
  EXPECT_EQ(drive.contents("/")["dataless"], 20);
  const ino_t before = inodeOf(at("3.bin"));
  char last[3];
  EXPECT_EQ(pread(opened, last, 3, 300'000), 3);
  EXPECT_EQ(std::string(last, 3), "end");
  EXPECT_EQ(inodeOf(at("3.bin")), before) << "one document to those who have it open";
  close(opened);
  EXPECT_EQ(drive.contents("/")["dataless"], 19);
  EXPECT_EQ(attribute(at("3.bin"), "user.droxa.state"), "local,in the cloud");
  EXPECT_TRUE(readFile(at("3.bin")) == bytes);
}

TEST_F(Mounted, aWriteIntoADatalessDocumentKeepsTheRest) {
  writeFile(source() + "/a.txt", std::string(10'000, 'a'));
  writeFile(source() + "/b.txt", std::string(10'000, 'b'));
  start();
  ASSERT_TRUE(
      eventually([&] { return contentsOf("a.txt") == "dataless" && contentsOf("b.txt") == "dataless"; }));
  const Result appended = run("echo end >> \"$1/a.txt\" && tail -c 6 \"$1/a.txt\"");
  EXPECT_EQ(appended.output, "aaend\n") << appended.errors;
  EXPECT_EQ(fs::file_size(at("a.txt")), 10'004U);
  writeFile(at("b.txt"), "new");
  EXPECT_EQ(readFile(at("b.txt")), "new");
  EXPECT_EQ(drive.droxa({"wait"}).status, 0);
  EXPECT_EQ(drive.droxa({"cat", "b.txt"}).output, "new");
}

TEST_F(Mounted, aDocumentThatIsOpenIsNotLetGoOf) {
  writeFile(source() + "/a.txt", std::string(10'000, 'a'));
  start();
  ASSERT_TRUE(drive.waitForName("a.txt"));
  const int file = open(at("a.txt").c_str(), O_RDONLY | O_CLOEXEC);
  char byte;
  EXPECT_EQ(pread(file, &byte, 1, 0), 1);
  EXPECT_NE(drive.droxa({"evict", "a.txt"}).status, 0);
  close(file);
  EXPECT_TRUE(eventually([&] { return drive.droxa({"evict", "a.txt"}).status == 0; }));
  EXPECT_EQ(readFile(at("a.txt")), std::string(10'000, 'a'));
}

TEST_F(Mounted, aChangeBehindItIsSeenByTheNextStat) {
  start();
  writeFile(at("a.txt"), "one");
  EXPECT_EQ(readFile(at("a.txt")), "one");
  EXPECT_EQ(namesIn(folder()), withOwn({"a.txt"}));
  EXPECT_FALSE(fs::exists(at("b.txt")));
  writeFile(drive.documents() + "/a.txt", "another");
  writeFile(drive.documents() + "/b.txt", "b");
  EXPECT_TRUE(eventually([&] { return readFile(at("a.txt")) == "another"; }))
      << '"' << readFile(at("a.txt")) << "\", " << fs::file_size(at("a.txt")) << " bytes";
  EXPECT_TRUE(eventually([&] { return fs::exists(at("b.txt")); }));
  EXPECT_EQ(namesIn(folder()), withOwn({"a.txt", "b.txt"}));
  fs::remove(drive.documents() + "/b.txt");
  fs::rename(drive.documents() + "/a.txt", drive.documents() + "/c.txt");
  EXPECT_TRUE(eventually([&] { return !fs::exists(at("b.txt")) && !fs::exists(at("a.txt")); }));
  EXPECT_EQ(readFile(at("c.txt")), "another");
}

// What a watcher of the mount's root is told of `name`.
std::uint32_t eventOf(int watch, const std::string &name, std::uint32_t wanted) {
  alignas(inotify_event) char buffer[8192];
  std::uint32_t seen = 0;
  pollfd waited{watch, POLLIN, 0};
  while ((seen & wanted) != wanted && poll(&waited, 1, 20'000) > 0) {
    const ssize_t length = read(watch, buffer, sizeof(buffer));
    for (const char *at = buffer; at < buffer + length;) {
      const auto *event = reinterpret_cast<const inotify_event *>(at);
      at += sizeof(inotify_event) + event->len;
      if (event->len > 0 && name == event->name) seen |= event->mask;
    }
  }
  return seen;
}

TEST_F(Mounted, aChangeBehindItIsToldToItsWatchers) {
  start();
  writeFile(at("a.txt"), "one");
  const int watch = inotify_init1(IN_CLOEXEC);
  ASSERT_GE(inotify_add_watch(watch, folder().c_str(), IN_ALL_EVENTS), 0);
  writeFile(drive.documents() + "/new.txt", "new");
  EXPECT_NE(eventOf(watch, "new.txt", IN_CREATE) & IN_CREATE, 0U);
  EXPECT_EQ(readFile(at("new.txt")), "new");
  writeFile(drive.documents() + "/a.txt", "another");
  EXPECT_NE(eventOf(watch, "a.txt", IN_MODIFY) & IN_MODIFY, 0U);
  EXPECT_EQ(readFile(at("a.txt")), "another");
  fs::remove(drive.documents() + "/new.txt");
  EXPECT_NE(eventOf(watch, "new.txt", IN_DELETE) & IN_DELETE, 0U);
  fs::create_directory(drive.documents() + "/folder");
  EXPECT_NE(eventOf(watch, "folder", IN_CREATE) & IN_ISDIR, 0U);
  close(watch);
}

TEST_F(Mounted, openFilesOutliveTheExtensionAndTheDaemon) {
  writeFile(source() + "/far.txt", std::string(5000, 'f'));
  start();
  ASSERT_TRUE(drive.waitForName("far.txt"));
  const int file = open(at("a.txt").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  const int far = open(at("far.txt").c_str(), O_RDONLY | O_CLOEXEC);
  ASSERT_GE(file, 0);
  const pid_t extension = drive.extensionPid();
  ASSERT_GT(extension, 0);
  kill(extension, SIGKILL);
  EXPECT_EQ(pwrite(file, "abc", 3, 0), 3);
  drive.keld().signal(SIGKILL);
  drive.keld().wait();
  EXPECT_EQ(pwrite(file, "d", 1, 3), 1);
  EXPECT_EQ(readFile(at("a.txt")), "abcd");
  EXPECT_GE(namesIn(folder()).size(), 2U);
  drive.startKeld();
  char byte = 0;
  EXPECT_TRUE(eventually([&] { return pread(far, &byte, 1, 4999) == 1; }, 60s)) << strerror(errno);
  EXPECT_EQ(byte, 'f');
  close(far);
  close(file);
}

TEST_F(Mounted, aHostThatWasKilledMountsAnewWhereItWas) {
  start();
  writeFile(at("a.txt"), "one");
  const auto held = inBackground("exec 3<\"$1/a.txt\"; sleep 60", "holder");
  drive.host().signal(SIGKILL);
  drive.host().wait();
  EXPECT_NE(run("cat \"$1/a.txt\"", 10s).status, -1) << "nothing hangs on a dead mount";
  drive.startHost();
  EXPECT_TRUE(eventually([&] { return readFile(at("a.txt")) == "one"; }));
  const auto json = Json::parse(drive.droxa({"status", "--json"}).output, nullptr, false);
  EXPECT_EQ(json["fileproviderd"]["mount"], folder());
  held->signal(SIGKILL);
}

TEST_F(Mounted, aReadThatWaitsIsInterrupted) {
  writeFile(source() + "/large", "");
  fs::resize_file(source() + "/large", 700'000'000);
  start();
  ASSERT_TRUE(drive.waitForName("large"));
  const auto reader = inBackground("exec cat \"$1/large\"", "reader");
  ASSERT_TRUE(eventually([&] { return contentsOf("large") == "downloading"; })) << reader->errors();
  reader->signal(SIGINT);
  EXPECT_EQ(reader->wait(10s), 130) << reader->errors();
  EXPECT_TRUE(eventually([&] { return contentsOf("large") == "dataless"; })) << contentsOf("large");
}

TEST_F(Mounted, aCloudThatHangsIsATimeoutWithinTheDeadline) {
  writeFile(source() + "/a.txt", "a document");
  drive.importFolder(source());
  fs::create_directories(drive.home() + "/config");
  writeFile(drive.home() + "/config/mount-patience", "1.5\n");
  drive.start();
  mount();
  writeFile(at("here.txt"), "here");
  ASSERT_TRUE(drive.waitForName("a.txt"));
  drive.keld().signal(SIGSTOP);
  const auto before = std::chrono::steady_clock::now();
  const Result read = run("cat \"$1/a.txt\"", 30s);
  EXPECT_EQ(read.status, 1);
  EXPECT_NE(read.errors.find("timed out"), std::string::npos) << read.errors;
  EXPECT_LT(std::chrono::steady_clock::now() - before, 20s);
  EXPECT_EQ(readFile(at("here.txt")), "here");
  EXPECT_EQ(run("ls \"$1\" && df \"$1\"", 10s).status, 0);
  drive.keld().signal(SIGCONT);
  EXPECT_TRUE(eventually([&] { return readFile(at("a.txt")) == "a document"; }, 60s));
}

TEST_F(Mounted, attributesOfUsersAreKeptAndTheOthersRefused) {
  start();
  const std::string file = at("a.txt");
  writeFile(file, "one");
  EXPECT_EQ(setxattr(file.c_str(), "user.mine", "1", 1, 0), 0);
  EXPECT_EQ(setxattr(file.c_str(), "user.xdg.tags", "red", 3, 0), 0);
  EXPECT_EQ(attribute(drive.documents() + "/a.txt", "user.mine"), "1");
  EXPECT_EQ(attribute(drive.documents() + "/a.txt", "user.xdg.tags"), "red");
  for (const char *name : {"user.droxa.document", "user.droxa.state", "trusted.x"}) {
    EXPECT_EQ(setxattr(file.c_str(), name, "1", 1, 0), -1);
    EXPECT_EQ(errno, ENOTSUP) << name;
  }
  EXPECT_EQ(drive.droxa({"wait", "a.txt"}).status, 0);
  EXPECT_EQ(attribute(file, "user.droxa.document"), "errno " + std::to_string(ENODATA));
  EXPECT_EQ(attribute(file, "user.droxa.state"), "local,in the cloud");
  char names[1024];
  const ssize_t length = listxattr(file.c_str(), names, sizeof(names));
  EXPECT_EQ(std::string(names, static_cast<std::size_t>(std::max<ssize_t>(length, 0))).find("droxa"),
            std::string::npos);
}

TEST_F(Mounted, whatIsTheSyncsOwnIsNeitherSeenNorMade) {
  start();
  for (const char *name : {".droxa-private", ".droxa-replacement-1", ".a.droxafault"}) {
    EXPECT_EQ(mkdir(at(name).c_str(), 0700), -1);
    EXPECT_EQ(errno, EPERM) << name;
  }
  fs::create_directories(drive.documents() + "/.droxa-replacement-x");
  EXPECT_FALSE(fs::exists(at(".droxa-replacement-x")));
  EXPECT_EQ(namesIn(folder()), withOwn({}));
}

TEST_F(Mounted, theTrashIsWhereFileManagersLookForIt) {
  start();
  writeFile(at("a.txt"), "a");
  ASSERT_TRUE(drive.waitForName("a.txt"));
  ASSERT_EQ(drive.droxa({"trash", "a.txt"}).status, 0);
  const std::string trash = at(".Trash-" + std::to_string(getuid()));
  EXPECT_TRUE(eventually([&] { return fs::exists(trash + "/files/a.txt"); }));
  EXPECT_TRUE(fs::exists(trash + "/info/a.txt.trashinfo"));
  fs::rename(trash + "/files/a.txt", at("back.txt"));
  EXPECT_EQ(readFile(at("back.txt")), "a");
}

TEST_F(Mounted, memoryMapsAndHolesWork) {
  start();
  const int file = open(at("m").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  ASSERT_EQ(ftruncate(file, 8192), 0);
  void *map = mmap(nullptr, 8192, PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  ASSERT_NE(map, MAP_FAILED);
  static_cast<char *>(map)[5000] = 'z';
  EXPECT_EQ(msync(map, 8192, MS_SYNC), 0);
  munmap(map, 8192);
  EXPECT_EQ(readFile(drive.documents() + "/m")[5000], 'z');
  EXPECT_EQ(fallocate(file, 0, 8192, 4096), 0);
  EXPECT_EQ(fs::file_size(at("m")), 12'288U);
  EXPECT_GE(lseek(file, 0, SEEK_HOLE), 0);
  close(file);
}

TEST_F(Mounted, whatWasWrittenIntoMappedMemoryIsKeptWhenItIsTakenOff) {
  start();
  const int file = open(at("m").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  ASSERT_EQ(ftruncate(file, 4096), 0);
  void *map = mmap(nullptr, 4096, PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  ASSERT_NE(map, MAP_FAILED);
  static_cast<char *>(map)[7] = 'z';
  EXPECT_EQ(drive.droxa({"unmount"}).status, 0);
  EXPECT_EQ(readFile(drive.documents() + "/m").at(7), 'z');
  munmap(map, 4096);
  close(file);
}

TEST_F(Mounted, gitWorksInIt) {
  start();
  const Result git = run(
      "set -e; cd \"$1\"; git init -q repo; cd repo; git config user.email a@b; git config user.name a\n"
      "for i in $(seq 50); do echo $i > f$i; done; git add .; git commit -qm one\n"
      "git mv f1 g1; echo more >> f2; git commit -qam two; git gc -q; git fsck --strict; git status --short");
  EXPECT_EQ(git.status, 0) << git.errors;
  EXPECT_EQ(git.output, "");
}

TEST_F(Mounted, aDatabaseWithAWriteAheadLogWorksInIt) {
  if (run("command -v sqlite3").status != 0) GTEST_SKIP() << "no sqlite3";
  start();
  const Result sql =
      run("set -e; cd \"$1\"; sqlite3 d.db 'pragma journal_mode=wal; create table t(x);'\n"
          "for w in 1 2 3; do (for i in $(seq 20); do sqlite3 -cmd '.timeout 20000' d.db "
          "'insert into t values(1)'; done) & done; wait\n"
          "sqlite3 d.db 'select count(*) from t; pragma integrity_check'",
          120s);
  EXPECT_EQ(sql.output, "wal\n60\nok\n") << sql.errors;
}

TEST_F(Mounted, copiesBothWaysAreTheSame) {
  if (run("command -v rsync").status != 0) GTEST_SKIP() << "no rsync";
  start();
  const Result copied =
      run("set -e; cd \"$(dirname \"$1\")\"; mkdir -p tree/a/b; for i in $(seq 40); do head -c $((i*997)) "
          "/dev/urandom > tree/a/b/$i; done; ln -s b tree/a/l; touch -d 2001-02-03 tree/a/b/7; chmod 640 "
          "tree/a/b/8\n"
          "rsync -aX tree \"$1/\"; rsync -aX \"$1/tree\" back/; rsync -aXcni --delete tree/ \"$1/tree/\"\n"
          "diff -r tree back/tree");
  EXPECT_EQ(copied.status, 0) << copied.errors;
  EXPECT_EQ(copied.output, "");
}

}  // namespace
}  // namespace droxa::testing
