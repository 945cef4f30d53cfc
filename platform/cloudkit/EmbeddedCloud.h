#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/cloudkit/CKCloud.h"

namespace droxa {

namespace embedded {
class Home;
}

// A cloud in a folder: one database file and the contents of assets, cut into chunks that versions and
// documents share. Several processes and devices (objects) use one folder at once. Nothing acknowledged is
// lost when any of them dies at any moment. A folder that is replaced while it is open is followed: its new
// identifier is answered, and tokens of the old one have expired; while it is gone, calls answer
// serviceUnavailable.
// Thread contract: every member may be called on any thread, concurrently. Not to be used across fork().
class EmbeddedCloud final : public CKCloud {
 public:
  // Makes the folder and the account where they are missing. Null, with an error of CKErrorDomain:
  // invalidArguments (names follow the rules for zones), serviceUnavailable (the folder can't be used; the
  // underlying error says why), internalError (what is there isn't such a cloud).
  static std::shared_ptr<EmbeddedCloud> open(const std::string &folder, const std::string &accountName,
                                             const std::string &deviceName, NSError *error);
  // The same, of a cloud that is there already: makes nothing of a folder that has none. serviceUnavailable
  // then, and while it can't be reached.
  static std::shared_ptr<EmbeddedCloud> openExisting(const std::string &folder,
                                                     const std::string &accountName,
                                                     const std::string &deviceName, NSError *error);
  ~EmbeddedCloud() override;

  // The most bytes of assets that the account's records may refer to, each record's counted; absent: no
  // limit. Kept in the cloud, for all devices. What is there already stays.
  NSError setQuota(std::optional<std::uint64_t> bytes, const CKCallContext &context);
  // By what people know the account, and find it; each at most 255 bytes without NUL, "" for none.
  // invalidArguments: they can't be, or the handle is another account's handle or name. Shares that name the
  // account show it once they are saved again.
  NSError setUserIdentity(const std::string &displayName, const std::string &handle,
                          const CKCallContext &context);
  struct Usage {
    NSError error;
    std::uint64_t bytes = 0;  // of assets that the account's records refer to, each record's counted
    std::optional<std::uint64_t> quota;
  };
  Usage usage(const CKCallContext &context);

  struct Garbage {
    NSError error;
    std::uint64_t assets = 0;  // whole contents that were forgotten
    std::uint64_t chunks = 0;  // files that were removed, and their bytes
    std::uint64_t bytes = 0;
  };
  // Forgets contents that no record has referred to for `grace`, and removes the chunks that nothing needs
  // any more. Safe while others upload and read; of use to one caller at a time.
  Garbage collectGarbage(std::chrono::seconds grace, const CKCallContext &context);

  UUID cloudIdentifier() override;
  CKAccountReply accountStatus(const CKCallContext &context) override;
  const std::string &deviceName() const override;
  std::string description() const override;
  std::shared_ptr<CKCloud> sharedDatabase() override;
  NSError saveZone(const CKRecordZoneID &zone, const CKCallContext &context) override;
  NSError deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) override;
  CKZoneList listZones(const CKCallContext &context) override;
  CKFetchReply fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                            const CKCallContext &context) override;
  CKModifyReply modifyRecords(const CKModifyRequest &request, const CKCallContext &context) override;
  CKZoneChanges fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &token,
                                 const CKDesiredKeys &desiredKeys, std::size_t limit,
                                 const CKCallContext &context) override;
  CKUploadReply uploadAsset(int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                            const CKCallContext &context) override;
  NSError readAsset(const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                    const CKProgressHandler &progress, const CKCallContext &context) override;
  CKAssetPresence hasAsset(const CKAssetReference &asset, const CKCallContext &context) override;
  CKUserIdentityReply currentUserIdentity(const CKCallContext &context) override;
  CKShareParticipantsReply lookUpShareParticipants(const std::vector<std::string> &namesOrHandles,
                                                   const CKCallContext &context) override;
  CKShareMetadataReply fetchShareMetadata(const NSURL &url, const CKCallContext &context) override;
  CKShareMetadataReply acceptShare(const NSURL &url, const CKCallContext &context) override;
  CKShareTokens shareTokens(const CKRecordID &record, const CKCallContext &context) override;
  CKShareTokenReply verifyShareToken(const std::string &token, const CKCallContext &context) override;
  std::unique_ptr<CKSubscription> subscribe(CKZonesChangedHandler handler, NSError *error) override;

 private:
  struct State;
  explicit EmbeddedCloud(std::shared_ptr<State> state);
  static std::shared_ptr<EmbeddedCloud> openWith(const std::string &folder, const std::string &accountName,
                                                 const std::string &deviceName, NSError *error,
                                                 const std::function<NSError(embedded::Home &home)> &reach);
  const std::shared_ptr<State> state_;
};

}  // namespace droxa
