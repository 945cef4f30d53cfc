#include <cerrno>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <stdlib.h>
#include <thread>

#include "cli/Commands.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tests/cli/ScriptedHost.h"
#include "tests/support/FakeDaemonConnection.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using Json = nlohmann::json;
using Words = std::vector<std::string>;

// A host and a daemon over the same drive: a document, and a folder with another one. Contents come when the
// host's providing ends.
class Contents : public ::testing::Test, protected CommandFixture {
 protected:
  Contents() {
    std::string path = ::testing::TempDir() + "droxa-contents-XXXXXX";
    root = mkdtemp(path.data());
    keld = FakeDaemon::make(root / "replica");
    connection = std::make_shared<FakeDaemonConnection>(keld);
    daemon = connection;
    stop = [] { return false; };
    keld->addDatalessDocument("a.txt", 6);
    keld->addFolder("in");
    keld->addDatalessDocument("in/b.txt", 4);
    keld->addDatalessDocument("in/c.txt", 4);
    name("a.txt", item("d1", "a.txt"));
    name("in", folder("i2", "in"));
    name("in/b.txt", item("d3", "b.txt"));
    host->provide = [this](const NSURL &url, std::uint64_t) { return fetch(url); };
  }
  ~Contents() override { fs::remove_all(root); }

  void name(const std::string &path, const NSFileProviderItemFields &fields) {
    host->items[fields.itemIdentifier] = fields;
    host->paths[path] = fields.itemIdentifier;
    host->urls[fields.itemIdentifier] = keld->url(path).path();
  }
  // What the extension does: the daemon fetches, and the file is there.
  std::shared_ptr<FPDProviding> fetch(const NSURL &url) {
    auto providing = std::make_shared<ScriptedProviding>();
    NSError outcome = failure;
    if (!outcome) {
      keld->startDownloadAtURL(url, 0, [](const auto &, const NSError &) {});
      if (!fs::is_directory(url.path())) write(url.path(), text);
    }
    providing->end(outcome);
    return providing;
  }
  static void write(const fs::path &path, const std::string &bytes) {
    fs::create_directories(path.parent_path());
    std::ofstream(path, std::ios::binary) << bytes;
  }
  int cat(const Words &words) {
    return run([&](CommandContext &made) { return runCat(made, words); });
  }
  int download(const Words &words, bool json = false) {
    return run([&](CommandContext &made) { return runDownload(made, words, json); });
  }
  int evict(const Words &words, bool json = false) {
    return run([&](CommandContext &made) { return runEvict(made, words, json); });
  }
  int pin(const Words &words, bool isPinned) {
    return run([&](CommandContext &made) { return runPin(made, words, isPinned, false); });
  }
  int wait(const WaitOptions &options) {
    return run([&](CommandContext &made) { return runWait(made, options); });
  }
  int status(const Words &words, bool json = false) {
    return run([&](CommandContext &made) { return runItemStatus(made, words, json); });
  }
  bool said(const std::string &words) const { return err.str().find(words) != std::string::npos; }

  fs::path root;
  std::shared_ptr<FakeDaemon> keld;
  std::shared_ptr<FakeDaemonConnection> connection;
  NSError failure;  // of the next providings
  std::string text = std::string("he\0l\xff\n", 6);
};

TEST_F(Contents, catWritesTheBytesAsTheyAre) {
  EXPECT_EQ(cat({"a.txt", "in/b.txt"}), 0) << err.str();
  EXPECT_EQ(out.str(), text + text);
}

TEST_F(Contents, catWritesNothingBeforeTheWholeIsHere) {
  const auto slow = std::make_shared<ScriptedProviding>();
  std::string before = "not looked at";
  std::thread ending;
  host->provide = [&](const NSURL &url, std::uint64_t) {
    write(url.path(), "part");
    ending = std::thread([&, url] {
      before = out.str();
      write(url.path(), text);
      slow->end(NSError());
    });
    return slow;
  };
  EXPECT_EQ(cat({"a.txt"}), 0);
  ending.join();
  EXPECT_EQ(before, "");
  EXPECT_EQ(out.str(), text);
}

TEST_F(Contents, catOfWhatHasNoContentsSaysSo) {
  name("link", item("d9", "link", NSFileProviderItemKind::symbolicLink));
  EXPECT_EQ(cat({"in"}), 1);
  EXPECT_TRUE(said("it is a folder")) << err.str();
  EXPECT_EQ(cat({"link"}), 1);
  EXPECT_TRUE(said("it is a symbolicLink")) << err.str();
  EXPECT_EQ(cat({"nowhere"}), 66);
}

TEST_F(Contents, oneThatFailsDoesntKeepTheOthersBack) {
  EXPECT_EQ(cat({"nowhere", "a.txt"}), 66);
  EXPECT_EQ(out.str(), text);
}

TEST_F(Contents, eachFailureOfATransferHasItsStatus) {
  const NSError cloud(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable,
                      {{NSUnderlyingErrorKey, NSError(NSCocoaErrorDomain, 4355)}});
  const NSError host_(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);
  const std::vector<std::pair<NSError, int>> failures{
      {cloud, 75},
      {host_, 69},
      {NSError(NSPOSIXErrorDomain, ENOSPC), 73},
      {NSError(NSPOSIXErrorDomain, EROFS), 73},
      {NSError(NSFileProviderErrorDomain, NSFileProviderErrorInsufficientQuota), 73},
      {NSError(NSPOSIXErrorDomain, EIO), 74},
      {qvc_error(QVErrorChecksumMismatch, "wrong"), 74},
      {NSError(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated), 77}};
  for (const auto &[error, expected] : failures) {
    failure = error;
    EXPECT_EQ(cat({"a.txt"}), expected) << error.description();
    EXPECT_TRUE(said("droxa: a.txt: ")) << err.str();
    EXPECT_EQ(out.str(), "");
  }
}

TEST_F(Contents, downloadOfAFolderTellsHowFarItIsAndWhatItDid) {
  EXPECT_EQ(download({"in"}), 0) << err.str();
  EXPECT_EQ(out.str(), "in: 0 of 2 documents\nin: 2 documents fetched, 8 bytes\n");
  EXPECT_EQ(download({"in"}), 0);
  EXPECT_EQ(out.str(), "in: here already, 8 bytes\n");
}

TEST_F(Contents, downloadInJSONIsOneObjectALine) {
  EXPECT_EQ(download({"a.txt"}, true), 0);
  std::istringstream lines(out.str());
  std::string line;
  std::getline(lines, line);
  EXPECT_EQ(Json::parse(line)["state"], "downloading");
  EXPECT_EQ(Json::parse(line)["contents"], "dataless");
  std::getline(lines, line);
  EXPECT_EQ(Json::parse(line)["state"], "done");
  EXPECT_EQ(Json::parse(line)["contents"], "present");
}

TEST_F(Contents, aStopCancelsTheDownload) {
  const auto endless = std::make_shared<ScriptedProviding>();
  host->provide = [&](const NSURL &, std::uint64_t) { return endless; };
  stop = [] { return true; };
  EXPECT_EQ(download({"a.txt", "in"}), 130);
  EXPECT_TRUE(endless->wasCancelled());
  EXPECT_TRUE(said("cancelled")) << err.str();
  EXPECT_EQ(err.str().find("in:"), std::string::npos) << "the next one isn't begun";
}

TEST_F(Contents, downloadIsForced) {
  std::uint64_t options = 0;
  host->provide = [&](const NSURL &url, std::uint64_t given) {
    options = given;
    return fetch(url);
  };
  EXPECT_EQ(download({"in"}), 0);
  EXPECT_EQ(options, 1U << 17);
}

TEST_F(Contents, evictListsWhatWasRefusedWithItsReason) {
  ASSERT_EQ(download({"in"}), 0);
  keld->setInUse("in/b.txt", true);
  EXPECT_EQ(evict({"in"}), 1);
  EXPECT_EQ(out.str(), "in: let go of 1 document, 4 bytes\n");
  EXPECT_TRUE(said("in/b.txt: a program has it open")) << err.str();
  EXPECT_EQ(evict({"in"}, true), 1);
  const Json json = Json::parse(out.str());
  EXPECT_EQ(json["refused"], 1);
  EXPECT_EQ(json["refusals"][0]["code"], QVErrorDocumentInUse);
  keld->setInUse("in/b.txt", false);
  EXPECT_EQ(evict({"in"}), 0);
  EXPECT_EQ(evict({"in"}), 0);
  EXPECT_EQ(out.str(), "in: nothing to let go of\n");
}

TEST_F(Contents, evictOfADocumentSaysWhyItWasRefusedOnce) {
  ASSERT_EQ(download({"a.txt"}), 0);
  keld->setUnsent("a.txt", true);
  EXPECT_EQ(evict({"a.txt"}), 1);
  EXPECT_EQ(err.str(),
            "droxa: a.txt: the cloud doesn't have its contents yet; `droxa wait` waits until it does\n");
}

TEST_F(Contents, whatIsPinnedStays) {
  EXPECT_EQ(pin({"in"}, true), 0) << err.str();
  EXPECT_EQ(out.str().rfind("in: pinned", 0), 0U) << out.str();
  EXPECT_EQ(evict({"in/b.txt"}), 1);
  EXPECT_TRUE(said("unpin")) << err.str();
  EXPECT_EQ(pin({"in/b.txt"}, false), 1) << "its folder pins it still";
  EXPECT_EQ(pin({"in"}, false), 0);
  EXPECT_EQ(evict({"in/b.txt"}), 0) << err.str();
}

TEST_F(Contents, waitReturnsWhenEverythingIsInTheCloud) {
  EXPECT_EQ(wait({}), 0);
  EXPECT_EQ(out.str(), "everything is in the cloud\n");
  EXPECT_EQ(wait({{"a.txt"}, {}, true}), 0);
  EXPECT_EQ(Json::parse(out.str())["inCloud"], true);
}

TEST_F(Contents, waitGivesUpInTimeAndAtAStop) {
  keld->setUnsent("a.txt", true);
  EXPECT_EQ(wait({{}, std::chrono::milliseconds(1), false}), 75);
  EXPECT_TRUE(said("not everything is in the cloud in time")) << err.str();
  stop = [] { return true; };
  EXPECT_EQ(wait({}), 130);
}

TEST_F(Contents, waitSaysWhatFailed) {
  keld->replies().failNext("waitForUploadAtURL", NSError(NSCocoaErrorDomain, 4354));
  EXPECT_EQ(wait({{"a.txt"}, {}, false}), 73);
  EXPECT_TRUE(said("a.txt: the cloud has no room")) << err.str();
  keld->replies().failNext("waitForUploadAtURL", qvc_error(QVErrorUnsentChanges, "deletions are held"));
  EXPECT_EQ(wait({}), 1);
  EXPECT_EQ(err.str(), "droxa: not everything is in the cloud: deletions are held\n");
}

TEST_F(Contents, statusOfItemsTellsWhereTheyAre) {
  EXPECT_EQ(status({"a.txt", "in"}), 0);
  EXPECT_NE(out.str().find("contents:    dataless: 6 bytes"), std::string::npos) << out.str();
  EXPECT_NE(out.str().find("documents:   2 documents, 8 bytes; 2 in the cloud alone"), std::string::npos)
      << out.str();
  EXPECT_EQ(status({"in/b.txt"}, true), 0);
  EXPECT_EQ(Json::parse(out.str())["contents"], "dataless");
  EXPECT_EQ(status({"nowhere"}), 66);
}

TEST_F(Contents, theSystemsStatusHasTheTransfers) {
  EXPECT_EQ(run([](CommandContext &made) { return runStatus(made, false); }), 0);
  EXPECT_NE(out.str().find("downloads      0 in flight"), std::string::npos) << out.str();
  EXPECT_EQ(run([](CommandContext &made) { return runStatus(made, true); }), 0);
  EXPECT_EQ(Json::parse(out.str())["transfers"]["downloads"]["active"], 0);
}

TEST_F(Contents, withoutHeldDeletionsThereIsNothingToAnswer) {
  EXPECT_EQ(run([](CommandContext &made) { return runDeletions(made, DeletionsAnswer::restore, false); }), 0);
  EXPECT_EQ(out.str(), "no deletions are held\n");
  EXPECT_EQ(keld->log().count("confirmDeletions"), 0U);
}

TEST_F(Contents, withoutTheDaemonEachSaysSo) {
  connection->setUnreachable(NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  EXPECT_EQ(evict({"a.txt"}), 69);
  EXPECT_EQ(pin({"a.txt"}, true), 69);
  EXPECT_EQ(wait({}), 69);
  EXPECT_EQ(status({"a.txt"}), 69);
  EXPECT_EQ(run([](CommandContext &made) { return runDeletions(made, DeletionsAnswer::none, false); }), 69);
}

// `open` with a program of the test's own in $PATH.
class Open : public Contents {
 protected:
  Open() {
    fs::create_directories(root / "bin");
    path_ = getenv("PATH") ? getenv("PATH") : "";
    setenv("PATH", (root / "bin").c_str(), 1);
  }
  ~Open() override { setenv("PATH", path_.c_str(), 1); }
  void addOpener(int status) {
    write(root / "bin/xdg-open", "#!/bin/sh\nprintf '%s' \"$1\" >" + (root / "opened").native() + "\nexit " +
                                     std::to_string(status));
    fs::permissions(root / "bin/xdg-open", fs::perms::owner_all);
  }
  int open(const std::string &argument) {
    return run([&](CommandContext &made) { return runOpen(made, {argument}, false); });
  }
  std::string opened() const {
    std::ostringstream words;
    words << std::ifstream(root / "opened").rdbuf();
    return words.str();
  }

 private:
  std::string path_;
};

TEST_F(Open, withoutAnOpenerThePathIsSaid) {
  EXPECT_EQ(open("a.txt"), 0) << err.str();
  EXPECT_EQ(out.str(), keld->url("a.txt").path() + "\n");
  EXPECT_TRUE(fs::exists(keld->url("a.txt").path()));
}

TEST_F(Open, theOpenerGetsADocumentThatIsHere) {
  addOpener(0);
  EXPECT_EQ(open("a.txt"), 0) << err.str();
  EXPECT_EQ(opened(), keld->url("a.txt").path());
  EXPECT_EQ(out.str(), "");
}

TEST_F(Open, anOpenerThatFailsIsSaid) {
  addOpener(4);
  EXPECT_EQ(open("a.txt"), 1);
  EXPECT_TRUE(said("xdg-open can't open it (status 4)")) << err.str();
}

}  // namespace
}  // namespace droxa::testing
