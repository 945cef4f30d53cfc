#pragma once

#include <cstring>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "additions/NSData+Additions.h"
#include "additions/QVLogSection.h"
#include "enumeration/QVFileEnumerator.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSNotificationCenter.h"
#include "platform/oslog/os_log.h"
#include "tests/support/Eventually.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/LogLines.h"
#include "tests/support/Observers.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingHostLink.h"

namespace droxa {

// A base enumerator whose inside tests may reach.
class OpenBaseEnumerator final : public QVBaseFileEnumerator {
 public:
  static std::shared_ptr<OpenBaseEnumerator> make(std::optional<QVFileObjectID> fileObjectID,
                                                  std::string itemIdentifier) {
    return std::shared_ptr<OpenBaseEnumerator>(
        new OpenBaseEnumerator(fileObjectID, std::move(itemIdentifier)));
  }
  using QVBaseFileEnumerator::_invalidate;
  using QVBaseFileEnumerator::_stopObservingAccountChanges;
  using QVBaseFileEnumerator::_lock;
  using QVBaseFileEnumerator::_personaID;
  using QVBaseFileEnumerator::_queue;

  void setupNotificationReceivingIfNeededWithCompletion(SetupCompletion completion) override {
    if (setup) {
      setup(std::move(completion));
    } else {
      QVBaseFileEnumerator::setupNotificationReceivingIfNeededWithCompletion(std::move(completion));
    }
  }
  std::function<void(SetupCompletion)> setup;  // instead of the base's

  void addUpdate(const std::shared_ptr<const QVQueryItem> &item) {
    RecursiveLock lock(_lock);
    _updatedItemsByIDs[item->fileObjectID()] = item;
  }
  void addDeath(const std::string &identifier) {
    RecursiveLock lock(_lock);
    _deletedItemsIdentifiers.push_back(identifier);
  }
  std::size_t pendingCount() {
    RecursiveLock lock(_lock);
    return _updatedItemsByIDs.size() + _deletedItemsIdentifiers.size();
  }

 private:
  OpenBaseEnumerator(std::optional<QVFileObjectID> fileObjectID, std::string itemIdentifier)
      : QVBaseFileEnumerator(fileObjectID, std::move(itemIdentifier), false) {}
};

// A file enumerator whose inside tests may reach.
class OpenFileEnumerator final : public QVFileEnumerator {
 public:
  static std::shared_ptr<OpenFileEnumerator> make(std::optional<QVFileObjectID> fileObjectID, NSURL url,
                                                  std::string itemIdentifier, bool recursive) {
    return std::shared_ptr<OpenFileEnumerator>(
        new OpenFileEnumerator(fileObjectID, std::move(url), std::move(itemIdentifier), recursive));
  }
  using QVFileEnumerator::_handleNotificationError;
  using QVFileEnumerator::_lock;
  using QVFileEnumerator::_personaID;
  using QVFileEnumerator::_queue;
  using QVFileEnumerator::_setupNotificationReceivingIfNeededWithCompletion;
  using QVFileEnumerator::_signalChange;
  using QVFileEnumerator::_startObservingAccountChangesIfNeeded;

  // Waits until what is on the queue now, and what that puts there, has run.
  void drain() {
    for (int i = 0; i < 4; ++i) dispatch_sync(_queue, [] {});
  }
  bool hasSender() {
    bool has = false;
    dispatch_sync(_queue, [&] { has = _remoteNotificationSender != nullptr; });
    return has;
  }
  std::size_t pendingUpdates() {
    RecursiveLock lock(_lock);
    return _updatedItemsByIDs.size();
  }
  std::vector<std::string> pendingDeletions() {
    RecursiveLock lock(_lock);
    return _deletedItemsIdentifiers;
  }
  std::size_t registrations() const {
    return NSNotificationCenter::defaultCenter().registrationCount(dynamic_cast<const void *>(this));
  }

 private:
  OpenFileEnumerator(std::optional<QVFileObjectID> fileObjectID, NSURL url, std::string itemIdentifier,
                     bool recursive)
      : QVFileEnumerator(fileObjectID, std::move(url), std::move(itemIdentifier), recursive) {}
};

// A fake daemon with the folder "Folder", a recording line to the host, a capture of the log. Enumerators
// made here are invalidated at the end.
class EnumerationTest : public ::testing::Test {
 protected:
  EnumerationTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
  ~EnumerationTest() override {
    for (const auto &enumerator : made_) {
      enumerator->invalidate();
      enumerator->drain();
    }
  }

  std::shared_ptr<OpenFileEnumerator> makeForFolder(bool recursive = false) {
    return keep(OpenFileEnumerator::make(folder, daemon.url("Folder"), folder.asString(), recursive));
  }
  std::shared_ptr<OpenFileEnumerator> makeForRoot() {
    return keep(OpenFileEnumerator::make(std::nullopt, daemon.url(""),
                                         NSFileProviderRootContainerItemIdentifier, false));
  }
  // One whose update channel stands.
  std::shared_ptr<OpenFileEnumerator> makeListed() {
    auto enumerator = makeForFolder();
    listPage(*enumerator, NSData());
    enumerator->drain();  // the last line of its log comes after the answer
    daemon.log().clear();
    log.clear();
    return enumerator;
  }

  // What the daemon would push.
  static std::shared_ptr<const QVQueryItem> live(std::uint64_t number, const std::string &name = "name") {
    NSFileProviderItemFields fields;
    fields.itemIdentifier = QVFileObjectID::documentID(number).asString();
    fields.filename = name;
    return std::make_shared<const QVQueryItem>(QVFileObjectID::documentID(number), fields);
  }
  static std::shared_ptr<const QVQueryItem> dead(std::uint64_t number) {
    NSFileProviderItemFields fields;
    fields.itemIdentifier = QVFileObjectID::documentID(number).asString();
    return std::make_shared<const QVQueryItem>(QVFileObjectID::documentID(number), fields, true);
  }
  // Pushes, and fails the test unless the reply comes.
  static void push(QVFileEnumerator &enumerator, const QVQueryItems &items) {
    Once<> reply("reply to a push");
    enumerator.receiveUpdates(items, {}, {}, reply.completion());
  }

  // "debug: [DEBUG] …"
  std::vector<std::string> logLines() const { return droxa::logLines(log); }
  std::size_t countOfLines(const std::string &line) const {
    std::size_t count = 0;
    for (const std::string &one : logLines()) count += one == line ? 1 : 0;
    return count;
  }
  bool logged(const std::string &line) const { return countOfLines(line) > 0; }

  static bool isExpired(const NSError &error) {
    return error == NSError(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired);
  }
  // The generation and the rank of a change token, from its bytes.
  static std::int64_t rankOf(const NSData &token) {
    std::int64_t rank = 0;
    EXPECT_EQ(token.length(), 24u);
    if (token.length() == 24) std::memcpy(&rank, token.bytes().data(), sizeof rank);
    return rank;
  }
  static UUID uuidOf(const NSData &token) {
    UUID uuid;
    EXPECT_EQ(token.length(), 24u);
    if (token.length() == 24) std::memcpy(uuid.bytes.data(), token.bytes().data() + 8, 16);
    return uuid;
  }

  FakeDaemonScope fake;
  FakeDaemon &daemon = *fake.daemon;
  const QVFileObjectID folder = fake.daemon->addFolder("Folder");
  const std::shared_ptr<RecordingHostLink> host = RecordingHostLink::install();
  OSLogCapture log;

 private:
  std::shared_ptr<OpenFileEnumerator> keep(std::shared_ptr<OpenFileEnumerator> enumerator) {
    made_.push_back(enumerator);
    return enumerator;
  }
  std::vector<std::shared_ptr<OpenFileEnumerator>> made_;
};

}  // namespace droxa
