#pragma once

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>

#include "platform/foundation/NSURLResources.h"
#include "tests/extension/ExtensionFixture.h"
#include "tests/support/Once.h"

namespace droxa {

// An extension over a drive whose documents may also be on disk, which is where the reachability of a URL is
// seen. Downloads end when the test says.
class ProvidingTest : public ExtensionTest {
 protected:
  ProvidingTest() {
    NSURLForgetPackageExtensions();
    daemon.replies().hold("download");
    daemon.addDatalessDocument("a", 10);
    clear();
  }
  NSURL at(const std::string &path) const { return daemon.url("").URLByAppendingPathComponent(path); }
  NSURL onDisk(const std::string &path) const {
    const NSURL url = at(path);
    std::filesystem::create_directories(url.URLByDeletingLastPathComponent().path());
    std::ofstream(url.path()) << "contents";
    return url;
  }
  NSURL folderOnDisk(const std::string &path) const {
    std::filesystem::create_directories(at(path).path());
    return at(path);
  }
  // Sets a download going, up to the daemon's wait.
  void start(const NSURL &url, const Once<NSError> &done, std::uint64_t options = 0) {
    const std::size_t waits = waitsOfDaemon();
    extension->startProvidingItemAtURL(url, options, done.completion());
    ASSERT_TRUE(eventually([&] { return waitsOfDaemon() > waits; }));
  }
  std::size_t waitsOfDaemon() const {
    std::size_t waits = 0;
    for (const std::string &call : asked()) waits += call.ends_with(": waitWithReply") ? 1 : 0;
    return waits;
  }
  // What was logged, once a line that begins so was.
  Lines loggedUntil(const std::string &line) const {
    EXPECT_TRUE(eventually([&] {
      for (const std::string &one : logged())
        if (one.starts_with(line)) return true;
      return false;
    })) << line;
    return logged();
  }
  Lines faults() const {
    Lines lines = logLines(capture);
    std::erase_if(lines, [](const std::string &line) { return !line.starts_with("fault: "); });
    return lines;
  }
  static std::string starting(const NSURL &url, int section, const std::string &options = "0 (none)") {
    return "debug: [DEBUG] ┣<" + std::to_string(section) + "> start providing " + url.path() +
           " (readingOptions: " + options + ")";
  }
  static std::string ended(int section, const NSError &error) {
    return "debug: [DEBUG] ┳<" + std::to_string(section) + "> item providing completion; " +
           error.description();
  }
  static std::string closed(int section) { return "debug: [DEBUG] ┗<" + std::to_string(section) + "> "; }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

}  // namespace droxa
