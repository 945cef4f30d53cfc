#pragma once

#include <filesystem>
#include <string>
#include <utility>

#include "platform/fileprovider/NSFileProviderError.h"
#include "tests/extension/ExtensionFixture.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingItemActions.h"
#include "tests/support/RecordingURLOperations.h"

namespace droxa {

using ItemAnswer = Once<std::shared_ptr<const NSFileProviderItem>, NSError>;

// An extension over a drive in memory, with the operations on files as the test scripts them. The drive has
// the folder "f", with the identifier `folder`, and the document "a.txt", with the identifier `document`.
class ActionTest : public ExtensionTest {
 protected:
  ActionTest() { clear(); }

  NSURL at(const std::string &path) const { return daemon.url("").URLByAppendingPathComponent(path); }

  // An item, whatever was asked for before, and no error.
  void expectItem(const ItemAnswer &answer, const std::string &path) const {
    const auto [item, error] = answer.values();
    EXPECT_EQ(error, NSError()) << error.description();
    ASSERT_TRUE(item);
    EXPECT_EQ(item->fields(), daemon.item(path)->fields());
  }
  static void expectError(const ItemAnswer &answer, const NSError &expected) {
    const auto [item, error] = answer.values();
    EXPECT_FALSE(item);
    EXPECT_EQ(error, expected) << error.description();
  }
  static NSError noSuchItem(const std::string &identifier) {
    return fileProviderErrorForNonExistentItemWithIdentifier(identifier);
  }

  // What looking something up logs, as the section of that number.
  static Lines urlLines(int section, const std::string &identifier, const NSURL &url) {
    return {opened(section) + "asked url for " + identifier, "debug: [DEBUG] returning " + url.description(),
            closed(section)};
  }
  static Lines itemLines(int section, const NSURL &url,
                         const std::shared_ptr<const NSFileProviderItem> &item) {
    return {opened(section) + "asked properties for " + url.path(),
            "debug: [DEBUG] returning " + (item ? item->description() : "(null)"), closed(section)};
  }
  static Lines unknownLines(int section, const std::string &identifier) {
    return {opened(section) + "asked url for " + identifier,
            "error: [ERROR] returning nil, there was an error: (null)", closed(section)};
  }
  static std::string opened(int section) { return "debug: [DEBUG] ┏<" + std::to_string(section) + "> "; }
  static std::string closed(int section) { return "debug: [DEBUG] ┗<" + std::to_string(section) + "> "; }
  static std::string gotNewURL(const NSURL &url, const NSError &error = {}) {
    return "debug: [DEBUG] got new URL " + url.description() + "; " + error.description();
  }
  static Lines joined(std::initializer_list<Lines> parts) {
    Lines lines;
    for (const Lines &part : parts) lines.insert(lines.end(), part.begin(), part.end());
    return lines;
  }
  std::string lookedAt(const std::string &path) const {
    return "getQueryItemForURL(" + at(path).path() + ", fakeFSEvent 1)";
  }

  RecordingURLOperations operations;
  RecordingItemActions actions;
  const std::string folder = daemon.addFolder("f").asString();
  const std::string document = daemon.addDocument("a.txt", 3).asString();
  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

inline const std::string kUnknown = "no identifier";
// Of the file system, without and with words of its own for the framework.
inline NSError fileError(std::int64_t code) {
  return NSError(NSCocoaErrorDomain, code,
                 NSUserInfo{{NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(5)}});
}
inline NSError collisionAt(const NSURL &url) {
  return NSError(NSCocoaErrorDomain, NSFileWriteFileExistsError, NSUserInfo{{FPCollidingURLKey, url}});
}

}  // namespace droxa
