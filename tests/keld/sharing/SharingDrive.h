#pragma once

#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <tuple>
#include <vector>

#include "platform/cloudkit/EmbeddedCloud.h"
#include "tessaly/QVShareTypes.h"
#include "tests/keld/sync/TwoDevices.h"
#include "tests/support/FaultyCloud.h"
#include "tests/support/RecordingOperation.h"

namespace droxa::keld {

inline KeldOptions ImpatientOptions() {
  KeldOptions options;
  options.sharing.timeout = std::chrono::milliseconds(2000);
  return options;
}

// Anna's device, whose cloud goes wrong as a test says, and Ben's account in the same cloud. Each call is
// made as an operation of a client, and waits for its reply. Thread contract: the test's thread.
class SharingDrive : public testing::Test {
 protected:
  using Call = FaultyCloud::Call;
  using Permission = CKShareParticipantPermission;
  using Operation = std::shared_ptr<RecordingOperation>;
  struct ShareAnswer {
    std::optional<CKShare> share;
    NSURL url;
    NSError error;
  };

  explicit SharingDrive(KeldOptions options = {})
      : ben(open("ben", "bens")),
        cloud(std::make_shared<FaultyCloud>(open("anna", "annas"))),
        device(withCloud(std::move(options))) {}

  std::shared_ptr<EmbeddedCloud> open(const std::string &account, const std::string &deviceName) {
    NSError error;
    auto opened = EmbeddedCloud::open(folder.path() + "/cloud", account, deviceName, &error);
    EXPECT_TRUE(opened) << error.description();
    return opened;
  }
  KeldOptions withCloud(KeldOptions options) {
    options.sync.cloud = cloud;
    return options;
  }
  static FaultyCloud::Fault failing(CKErrorCode code) {
    FaultyCloud::Fault fault;
    fault.error = CKErrorMake(code, "it fails");
    return fault;
  }
  static FaultyCloud::Fault hanging() {
    FaultyCloud::Fault fault;
    fault.hangs = true;
    return fault;
  }

  void sent(const std::string &path) {
    const NSError error = device.waitForUploads(path);
    ASSERT_FALSE(error) << error.description();
  }
  void sentDocument(const std::string &path, const std::string &contents = "x") {
    device.keld.write(path, contents);
    sent(path);
  }
  void sentFolder(const std::string &path) {
    device.keld.folder(path);
    sent(path);
  }
  const std::shared_ptr<QVProtocol> &session() { return device.keld.session(); }
  NSURL url(const std::string &path) { return device.url(path); }

  ShareAnswer info(const NSURL &asked, const Operation &op = nullptr) {
    Once<std::optional<CKShare>, NSURL, NSError> answer("sharing info");
    session()->startOperation_toCopySharingInfoAtURL(op, asked, answer.completion());
    const auto [share, where, error] = answer.values();
    return {share, where, error};
  }
  ShareAnswer create(const NSURL &asked) {
    Once<std::optional<CKShare>, NSError> answer("new share");
    session()->createSharingInfoForURL(asked, answer.completion());
    return {answer.value<0>(), {}, answer.value<1>()};
  }
  ShareAnswer save(const std::optional<CKShare> &share) {
    Once<std::optional<CKShare>, NSError> answer("saved share");
    session()->startOperation_toSaveSharingInfo(nullptr, share, answer.completion());
    return {answer.value<0>(), {}, answer.value<1>()};
  }
  ShareAnswer shareURL(const std::optional<CKShare> &share) {
    Once<std::optional<CKShare>, NSURL, NSError> answer("the share's URL");
    session()->startOperation_toCopyShareURLForShare(nullptr, share, "Writer", answer.completion());
    const auto [saved, where, error] = answer.values();
    return {saved, where, error};
  }
  NSError unshare(const std::optional<CKShare> &share, bool forceDelete) {
    Once<NSError> answer("unshare");
    session()->startOperation_toUnshareShare(nullptr, share, forceDelete, answer.completion());
    return answer.value<0>();
  }
  std::tuple<NSData, std::optional<std::string>, NSError> access(const NSURL &asked, bool allow) {
    Once<NSData, std::optional<std::string>, NSError> answer("access");
    session()->startOperation_toModifyRecordAccessAtURL(nullptr, asked, allow, answer.completion());
    return answer.values();
  }
  std::tuple<std::optional<std::string>, std::optional<std::string>, NSError> tokens(const NSURL &asked) {
    Once<std::optional<std::string>, std::optional<std::string>, NSError> answer("tokens");
    session()->startOperation_toCopyParticipantTokenAtURL(nullptr, asked, answer.completion());
    return answer.values();
  }
  NSError prepare(const NSURL &asked, const Operation &op = nullptr) {
    Once<NSError> answer("preparation");
    session()->startOperation_toPrepFolderForSharingAt(op, asked, answer.completion());
    return answer.value<0>();
  }
  NSError process(const NSURL &asked, std::uint64_t mostFailures, std::uint64_t type,
                  const Operation &op = nullptr) {
    Once<NSError> answer("processing");
    session()->startOperation_toProcessSubitemsAtURL(op, asked, mostFailures, type, answer.completion());
    return answer.value<0>();
  }
  std::tuple<std::shared_ptr<const FPSandboxingURLWrapper>, NSError> document(
      const std::optional<CKRecordID> &record, bool syncs, const Operation &op = nullptr) {
    Once<std::shared_ptr<const FPSandboxingURLWrapper>, NSError> answer("document");
    session()->startOperation_toCopyDocumentURLForRecordID(op, record, syncs, answer.completion());
    return answer.values();
  }
  std::tuple<QVShareParticipants, NSError> lookUp(const QVShareParticipants &participants) {
    Once<QVShareParticipants, NSError> answer("participants");
    session()->startOperation_toLookupShareParticipants(nullptr, participants, answer.completion());
    return answer.values();
  }
  struct Options {
    bool isShared, isSharedByOthers, isSharedByItself;
    std::optional<std::string> folder;
    bool operator==(const Options &) const = default;
  };
  Options options(const std::string &path) {
    Once<bool, bool, bool, std::optional<std::string>, NSError> answer("options of " + path);
    const auto record = device.keld.record(path);
    const std::string identifier = record ? FileObjectID(record->id, record->facts.kind).asString() : "";
    session()->getShareOptionsOfItemIdentifier(identifier, answer.completion());
    EXPECT_FALSE(answer.value<4>()) << answer.value<4>().description();
    return {answer.value<0>(), answer.value<1>(), answer.value<2>(), answer.value<3>()};
  }
  bool isShown(const std::string &path, bool isShared) {
    return eventually([&] { return device.keld.item(path)->fields().isShared == isShared; });
  }
  // A share of the item, in the cloud.
  CKShare shared(const std::string &path, Permission everybody = Permission::none) {
    ShareAnswer made = create(url(path));
    EXPECT_FALSE(made.error) << made.error.description();
    if (!made.share) return {};
    made.share->publicPermission = everybody;
    ShareAnswer saved = save(made.share);
    EXPECT_FALSE(saved.error) << saved.error.description();
    return saved.share.value_or(CKShare());
  }
  CKRecordID recordOf(const std::string &path) {
    const auto row = device.keld.daemon().sync().store().byItem(device.keld.number(path));
    EXPECT_TRUE(row) << path;
    return {row ? row->record : "", DriveZone()};
  }
  // The share as another device of Anna's sees it.
  std::optional<CKShare> inCloud(const CKShare &share) {
    const CKFetchReply reply =
        open("anna", "other")->fetchRecords({share.recordID}, std::nullopt, CKCallContext());
    if (reply.results.empty() || reply.results.front().error) return std::nullopt;
    return CKShare::shareWithRecord(reply.results.front().record);
  }

  const TemporaryFolder folder;
  const std::shared_ptr<EmbeddedCloud> ben;
  const std::shared_ptr<FaultyCloud> cloud;
  Device device;
};

#define EXPECT_TESSALY_ERROR(asked, number)                                   \
  do {                                                                        \
    const NSError told = (asked);                                             \
    EXPECT_TRUE(told.is(QVTessalyErrorDomain, number)) << told.description(); \
  } while (false)
#define EXPECT_CLOUD_ERROR(asked, expected)                                    \
  do {                                                                         \
    const NSError told = (asked);                                              \
    EXPECT_TRUE(CKErrorIs(told, CKErrorCode::expected)) << told.description(); \
  } while (false)

}  // namespace droxa::keld
