#include <algorithm>
#include <filesystem>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using Json = nlohmann::json;

// A drive whose documents came into the cloud from a folder, and aren't here.
class Contents : public ::testing::Test {
 protected:
  Contents() { fs::create_directories(source()); }

  std::string source() const { return drive.home() + "/source"; }
  void startWithSource() {
    drive.importFolder(source());
    drive.start();
  }
  std::string contentsOf(const std::string &path) {
    return drive.contents(path).value("contents", std::string());
  }
  std::string uploadOf(const std::string &path) {
    return drive.contents(path).value("upload", std::string());
  }
  Json transfers() {
    const auto status = Json::parse(drive.droxa({"status", "--json"}).output, nullptr, false);
    return status.is_object() && status["transfers"].is_object() ? status["transfers"] : Json::object();
  }
  // Every name in the documents folder, hidden ones too.
  std::vector<std::string> filesThere() const {
    std::vector<std::string> names;
    for (const auto &entry : fs::recursive_directory_iterator(drive.documents()))
      names.push_back(entry.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
  }

  Drive drive;
};

TEST_F(Contents, aDatalessDocumentIsFetchedLetGoOfAndFetchedAgain) {
  const std::string bytes = std::string("he\0llo\xff", 7) + std::string(300'000, 'x');
  writeFile(source() + "/a.bin", bytes);
  startWithSource();
  ASSERT_TRUE(drive.waitForName("a.bin"));
  EXPECT_TRUE(eventually([&] {
    return drive.droxa({"ls", "-l", "a.bin"}).output.rfind("-rw-r--r-- c ", 0) == 0;
  }));
  for (int round = 0; round < 2; ++round) {
    EXPECT_EQ(contentsOf("a.bin"), "dataless");
    const Result cat = drive.droxa({"cat", "a.bin"});
    EXPECT_EQ(cat.status, 0) << cat.errors;
    EXPECT_TRUE(cat.output == bytes) << cat.output.size();
    EXPECT_EQ(contentsOf("a.bin"), "present");
    EXPECT_NE(drive.droxa({"ls", "-l", "a.bin"}).output.find("-rw-r--r-- - "), std::string::npos);
    const Result evict = drive.droxa({"evict", "a.bin"});
    EXPECT_EQ(evict.status, 0) << evict.errors;
  }
}

TEST_F(Contents, anEmptyDocumentIsAlwaysHere) {
  writeFile(source() + "/empty", "");
  startWithSource();
  ASSERT_TRUE(drive.waitForName("empty"));
  EXPECT_EQ(drive.droxa({"evict", "empty"}).status, 0);
  EXPECT_EQ(contentsOf("empty"), "present");
  EXPECT_EQ(drive.droxa({"cat", "empty"}).output, "");
}

TEST_F(Contents, waitReturnsWhenAWriteIsInTheCloud) {
  startWithSource();
  writeFile(drive.documents() + "/new.txt", "written here");
  const Result wait = drive.droxa({"wait", "new.txt"});
  ASSERT_EQ(wait.status, 0) << wait.errors;
  EXPECT_EQ(uploadOf("new.txt"), "inCloud");
  EXPECT_EQ(drive.contents("new.txt")["checksum"].get<std::string>().size(), 64U);
  EXPECT_EQ(drive.droxa({"evict", "new.txt"}).status, 0);
  EXPECT_EQ(drive.droxa({"cat", "new.txt"}).output, "written here");
  writeFile(drive.documents() + "/draft.tmp", "x");
  EXPECT_EQ(drive.droxa({"wait"}).status, 0);
  EXPECT_NE(drive.droxa({"ls", "-l", "draft.tmp"}).output.find(" x "), std::string::npos);
}

TEST_F(Contents, aPinnedDocumentStaysAndAFolderPinsWhatIsInIt) {
  fs::create_directories(source() + "/kept");
  writeFile(source() + "/kept/a.txt", "a");
  startWithSource();
  ASSERT_TRUE(drive.waitForName("a.txt", "kept"));
  ASSERT_TRUE(eventually([&] { return contentsOf("kept/a.txt") == "dataless"; }));
  ASSERT_EQ(drive.droxa({"pin", "kept"}).status, 0);
  EXPECT_TRUE(eventually([&] { return contentsOf("kept/a.txt") == "present"; }));
  for (const char *path : {"kept", "kept/a.txt"}) {
    const Result evict = drive.droxa({"evict", path});
    EXPECT_EQ(evict.status, 1) << path;
    EXPECT_NE(evict.errors.find("unpin"), std::string::npos) << evict.errors;
  }
  EXPECT_EQ(contentsOf("kept/a.txt"), "present");
  ASSERT_EQ(drive.droxa({"unpin", "kept"}).status, 0);
  EXPECT_EQ(drive.droxa({"evict", "kept"}).status, 0);
  EXPECT_EQ(contentsOf("kept/a.txt"), "dataless");
}

TEST_F(Contents, aFolderOfFiftyIsFetchedAndToldLineByLine) {
  fs::create_directories(source() + "/fifty");
  for (int i = 0; i < 50; ++i) writeFile(source() + "/fifty/" + std::to_string(i), std::string(20'000, 'x'));
  startWithSource();
  ASSERT_TRUE(eventually([&] { return drive.contents("fifty").value("dataless", 0) == 50; }));
  const Result download = drive.droxa({"download", "fifty"});
  EXPECT_EQ(download.status, 0) << download.errors;
  EXPECT_EQ(download.output.rfind("fifty: 0 of 50 documents\n", 0), 0U) << download.output;
  EXPECT_NE(download.output.find("fifty: 50 documents fetched, 1.0 MB\n"), std::string::npos)
      << download.output;
  EXPECT_EQ(download.output.find('\r'), std::string::npos) << "a bar is for a terminal";
  EXPECT_EQ(drive.contents("/")["dataless"], 0);
  EXPECT_EQ(drive.droxa({"evict", "/"}).status, 0);
  EXPECT_EQ(drive.contents("fifty")["dataless"], 50);
}

TEST_F(Contents, ctrlCEndsADownloadAndLeavesTheDocumentAsItWas) {
  writeFile(source() + "/large", "");
  fs::resize_file(source() + "/large", 700'000'000);  // zeros, which cost no room in the cloud
  startWithSource();
  ASSERT_TRUE(drive.waitForName("large"));
  const auto before = filesThere();
  const auto download = drive.droxaInBackground({"download", "large"}, "download");
  ASSERT_TRUE(eventually([&] { return contentsOf("large") == "downloading"; })) << download->output();
  download->signal(SIGINT);
  EXPECT_EQ(download->wait(), 130) << download->errors();
  EXPECT_NE(download->errors().find("cancelled"), std::string::npos) << download->errors();
  EXPECT_TRUE(eventually([&] { return contentsOf("large") == "dataless"; }));
  EXPECT_TRUE(eventually([&] { return transfers()["downloads"]["active"] == 0; }));
  EXPECT_EQ(filesThere(), before);
  struct stat status {};
  ASSERT_EQ(stat((drive.documents() + "/large").c_str(), &status), 0);
  EXPECT_EQ(status.st_size, 700'000'000);
  EXPECT_LT(status.st_blocks, 64);
}

TEST_F(Contents, aReaderThatIsKilledEndsItsDownload) {
  writeFile(source() + "/large", "");
  fs::resize_file(source() + "/large", 700'000'000);
  startWithSource();
  ASSERT_TRUE(drive.waitForName("large"));
  const auto cat = drive.droxaInBackground({"cat", "large"}, "cat");
  ASSERT_TRUE(eventually([&] { return contentsOf("large") == "downloading"; }));
  cat->signal(SIGKILL);
  EXPECT_TRUE(eventually([&] { return contentsOf("large") == "dataless"; }));
  EXPECT_EQ(cat->output(), "");
}

TEST_F(Contents, aReaderThatGoesEndsCatAsAnyCommandOfAPipe) {
  writeFile(source() + "/long", std::string(3'000'000, 'x'));
  startWithSource();
  ASSERT_TRUE(drive.waitForName("long"));
  const std::string script = std::string(DROXA_BIN_DIR) + "/droxa --home " + drive.home() +
                             " cat long | head -c 5; echo \" ${PIPESTATUS[0]}\"";
  Process pipe({"/bin/bash", "-c", script}, drive.home() + "/output", "pipe");
  EXPECT_EQ(pipe.wait(), 0);
  EXPECT_EQ(pipe.output(), "xxxxx 141\n") << pipe.errors();
}

TEST_F(Contents, ctrlCEndsADownloadFromADaemonThatHangs) {
  writeFile(source() + "/large", "");
  fs::resize_file(source() + "/large", 700'000'000);
  startWithSource();
  ASSERT_TRUE(drive.waitForName("large"));
  const auto download = drive.droxaInBackground({"download", "large"}, "download");
  ASSERT_TRUE(eventually([&] { return contentsOf("large") == "downloading"; })) << download->output();
  drive.keld().signal(SIGSTOP);
  download->signal(SIGINT);
  EXPECT_EQ(download->wait(15s), 130) << download->errors();
  drive.keld().signal(SIGCONT);
}

TEST_F(Contents, aCloudThatIsAwayIsSaidWithStatus75) {
  writeFile(source() + "/a.txt", "a");
  startWithSource();
  ASSERT_TRUE(drive.waitForName("a.txt"));
  fs::rename(drive.home() + "/cloud", drive.home() + "/away");
  const Result cat = drive.droxa({"cat", "a.txt"}, 90s);
  EXPECT_EQ(cat.status, 75) << cat.errors;
  EXPECT_NE(cat.errors.find("a.txt: the cloud can't be reached"), std::string::npos) << cat.errors;
  EXPECT_EQ(cat.output, "");
  writeFile(drive.documents() + "/new.txt", "x");
  EXPECT_EQ(drive.droxa({"wait", "--timeout", "0.5"}).status, 75);
  EXPECT_TRUE(eventually([&] { return transfers()["reachable"] == false; }, 40s));
  fs::rename(drive.home() + "/away", drive.home() + "/cloud");
  EXPECT_TRUE(eventually([&] { return drive.droxa({"cat", "a.txt"}).output == "a"; }));
}

TEST_F(Contents, manyDeletionsAreHeldUntilTheyAreAnswered) {
  fs::create_directories(source() + "/many");
  for (int i = 0; i < 60; ++i) writeFile(source() + "/many/" + std::to_string(i), "x");
  startWithSource();
  const auto documents = [&] { return drive.contents("many").value("documents", 0); };
  const auto held = [&] { return transfers().value("heldDeletions", 0); };
  ASSERT_TRUE(eventually([&] { return documents() == 60; }));
  // While nobody looks, so that they are seen together.
  const auto deleteAll = [&] {
    drive.keld().signal(SIGTERM);
    ASSERT_EQ(drive.keld().wait(), 0);
    for (int i = 0; i < 60; ++i) fs::remove(drive.documents() + "/many/" + std::to_string(i));
    drive.startKeld();
    ASSERT_TRUE(eventually([&] { return held() == 60; })) << held();
  };
  deleteAll();
  EXPECT_NE(drive.droxa({"deletions"}).output.find("held"), std::string::npos);
  EXPECT_NE(drive.droxa({"status"}).output.find("droxa deletions"), std::string::npos);
  const Result restore = drive.droxa({"deletions", "restore"});
  EXPECT_EQ(restore.status, 0) << restore.errors;
  EXPECT_TRUE(eventually([&] {
    return documents() == 60 && drive.contents("many").value("unsent", 60) == 0;
  })) << documents();
  deleteAll();
  EXPECT_EQ(drive.droxa({"deletions", "carry-out"}).status, 0);
  EXPECT_EQ(drive.droxa({"deletions"}).output, "no deletions are held\n");
  EXPECT_EQ(drive.droxa({"wait"}).status, 0);
  EXPECT_EQ(documents(), 0);
}

TEST_F(Contents, theExtensionMayDieWhileADocumentIsFetched) {
  writeFile(source() + "/large", "");
  fs::resize_file(source() + "/large", 300'000'000);
  startWithSource();
  ASSERT_TRUE(drive.waitForName("large"));
  const auto download = drive.droxaInBackground({"download", "large"}, "download");
  ASSERT_TRUE(eventually([&] { return contentsOf("large") == "downloading"; }));
  const pid_t extension = drive.extensionPid();
  ASSERT_GT(extension, 0);
  kill(extension, SIGKILL);
  // It is gone on with, unless what the dead one wanted was still being given up: then the command says so,
  // and going on is the next one's.
  const auto status = download->wait(60s);
  ASSERT_TRUE(status.has_value());
  const bool saysSo = download->errors().find("large: it was cancelled") != std::string::npos;
  EXPECT_TRUE(*status == 0 || saysSo) << download->errors();
  EXPECT_TRUE(eventually([&] { return drive.droxa({"download", "large"}).status == 0; }));
  EXPECT_EQ(contentsOf("large"), "present");
}

// Two homes on one cloud.
class TwoHomes : public ::testing::Test {
 protected:
  void SetUp() override {
    one.start({"--cloud", one.home() + "/shared", "--device", "one"});
    two.start({"--cloud", one.home() + "/shared", "--device", "two"});
  }
  Drive one, two;
};

TEST_F(TwoHomes, whatOneWritesTheOtherSeesAndReads) {
  writeFile(one.documents() + "/note.txt", "from one");
  ASSERT_EQ(one.droxa({"wait"}).status, 0);
  ASSERT_TRUE(two.waitForName("note.txt"));
  EXPECT_TRUE(eventually([&] { return two.contents("note.txt").value("contents", "") == "dataless"; }));
  EXPECT_EQ(two.droxa({"cat", "note.txt"}).output, "from one");
}

TEST_F(TwoHomes, aRenameAndADeletionFollow) {
  fs::create_directories(one.documents() + "/folder");
  writeFile(one.documents() + "/note.txt", "text");
  ASSERT_EQ(one.droxa({"wait"}).status, 0);
  ASSERT_TRUE(two.waitForName("note.txt"));
  const std::string identifier = two.droxa({"id", "note.txt"}).output;
  fs::rename(one.documents() + "/note.txt", one.documents() + "/folder/letter.txt");
  ASSERT_TRUE(two.waitForName("folder"));
  ASSERT_TRUE(two.waitForName("letter.txt", "folder"));
  EXPECT_TRUE(two.waitUntilGone("note.txt"));
  EXPECT_EQ(two.droxa({"id", "folder/letter.txt"}).output, identifier);
  EXPECT_EQ(two.droxa({"cat", "folder/letter.txt"}).output, "text");
  fs::remove_all(one.documents() + "/folder");
  EXPECT_TRUE(two.waitUntilGone("folder"));
}

TEST_F(TwoHomes, anEditReplacesWhatTheOtherHas) {
  writeFile(one.documents() + "/note.txt", "first");
  ASSERT_EQ(one.droxa({"wait"}).status, 0);
  ASSERT_TRUE(two.waitForName("note.txt"));
  ASSERT_EQ(two.droxa({"cat", "note.txt"}).output, "first");
  writeFile(two.documents() + "/note.txt", "second one");
  ASSERT_EQ(two.droxa({"wait", "note.txt"}).status, 0);
  EXPECT_TRUE(eventually([&] { return one.droxa({"cat", "note.txt"}).output == "second one"; }));
}

}  // namespace
}  // namespace droxa::testing
