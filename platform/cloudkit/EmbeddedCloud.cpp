#include "platform/cloudkit/EmbeddedCloud.h"

#include <limits>

#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/Home.h"

namespace droxa {

struct EmbeddedCloud::State {
  const std::shared_ptr<embedded::Home> home;
};

EmbeddedCloud::EmbeddedCloud(std::shared_ptr<State> state) : state_(std::move(state)) {}

EmbeddedCloud::~EmbeddedCloud() = default;

std::shared_ptr<EmbeddedCloud> EmbeddedCloud::open(const std::string &folder, const std::string &accountName,
                                                   const std::string &deviceName, NSError *error) {
  return openWith(folder, accountName, deviceName, error, [](embedded::Home &home) { return home.create(); });
}

std::shared_ptr<EmbeddedCloud> EmbeddedCloud::openExisting(const std::string &folder,
                                                           const std::string &accountName,
                                                           const std::string &deviceName, NSError *error) {
  return openWith(folder, accountName, deviceName, error, [](embedded::Home &home) {
    return home.run(embedded::Home::Access::read, {}, [](const embedded::Connection &) {});
  });
}

std::shared_ptr<EmbeddedCloud> EmbeddedCloud::openWith(
    const std::string &folder, const std::string &accountName, const std::string &deviceName, NSError *error,
    const std::function<NSError(embedded::Home &home)> &reach) {
  NSError failure;
  if (!CKNameIsValid(accountName) || !CKNameIsValid(deviceName)) {
    failure = CKErrorMake(CKErrorCode::invalidArguments, "An account or device can't be named so");
  }
  const auto home = std::make_shared<embedded::Home>(folder, accountName, deviceName);
  if (!failure) failure = reach(*home);
  if (failure) {
    if (error) *error = failure;
    return nullptr;
  }
  return std::shared_ptr<EmbeddedCloud>(new EmbeddedCloud(std::make_shared<State>(State{home})));
}

std::shared_ptr<CKCloud> EmbeddedCloud::sharedDatabase() {
  const embedded::Home &home = *state_->home;
  const auto shared = std::make_shared<embedded::Home>(home.folder(), home.accountName(), home.deviceName(),
                                                       CKDatabaseScope::sharedDatabase);
  return std::shared_ptr<EmbeddedCloud>(new EmbeddedCloud(std::make_shared<State>(State{shared})));
}

NSError EmbeddedCloud::setUserIdentity(const std::string &displayName, const std::string &handle,
                                       const CKCallContext &context) {
  return embedded::SetUserIdentity(*state_->home, displayName, handle, context);
}

NSError EmbeddedCloud::setQuota(std::optional<std::uint64_t> bytes, const CKCallContext &context) {
  constexpr std::uint64_t kMost = std::numeric_limits<std::int64_t>::max();
  using embedded::Home;
  return state_->home->run(Home::Access::write, context, [&](const embedded::Connection &connection) {
    embedded::SqlUse update = connection.use("UPDATE accounts SET quota = ? WHERE id = ?");
    if (bytes) {
      update.bind(static_cast<std::int64_t>(std::min(*bytes, kMost)));
    } else {
      update.bindNull();
    }
    update.bind(connection.account).run();
  });
}

EmbeddedCloud::Usage EmbeddedCloud::usage(const CKCallContext &context) {
  Usage usage;
  using embedded::Home;
  usage.error = state_->home->run(Home::Access::read, context, [&](const embedded::Connection &connection) {
    embedded::SqlUse row = connection.use("SELECT used, quota FROM accounts WHERE id = ?");
    if (!row.bind(connection.account).step()) return;
    usage.bytes = static_cast<std::uint64_t>(row.integer(0));
    if (!row.isNull(1)) usage.quota = static_cast<std::uint64_t>(row.integer(1));
  });
  return usage;
}

EmbeddedCloud::Garbage EmbeddedCloud::collectGarbage(std::chrono::seconds grace,
                                                     const CKCallContext &context) {
  return embedded::CollectGarbage(*state_->home, grace, context);
}

UUID EmbeddedCloud::cloudIdentifier() {
  UUID uuid;
  state_->home->run(embedded::Home::Access::read, {},
                    [&](const embedded::Connection &connection) { uuid = connection.cloud; });
  return uuid;
}

CKAccountReply EmbeddedCloud::accountStatus(const CKCallContext &context) {
  const NSError error =
      state_->home->run(embedded::Home::Access::read, context, [](const embedded::Connection &) {});
  if (!error) return {{}, CKAccountStatus::available};
  if (CKErrorIs(error, CKErrorCode::serviceUnavailable)) return {{}, CKAccountStatus::temporarilyUnavailable};
  return {error, CKAccountStatus::couldNotDetermine};
}

const std::string &EmbeddedCloud::deviceName() const {
  return state_->home->deviceName();
}

std::string EmbeddedCloud::description() const {
  return state_->home->folder() + " (account " + state_->home->accountName() + ", device " +
         state_->home->deviceName() + ")";
}

NSError EmbeddedCloud::saveZone(const CKRecordZoneID &zone, const CKCallContext &context) {
  return embedded::SaveZone(*state_->home, zone, context);
}

NSError EmbeddedCloud::deleteZone(const CKRecordZoneID &zone, const CKCallContext &context) {
  return embedded::DeleteZone(*state_->home, zone, context);
}

CKZoneList EmbeddedCloud::listZones(const CKCallContext &context) {
  return embedded::ListZones(*state_->home, context);
}

CKFetchReply EmbeddedCloud::fetchRecords(const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                                         const CKCallContext &context) {
  return embedded::FetchRecords(*state_->home, ids, desiredKeys, context);
}

CKModifyReply EmbeddedCloud::modifyRecords(const CKModifyRequest &request, const CKCallContext &context) {
  return embedded::ModifyRecords(*state_->home, request, context);
}

CKZoneChanges EmbeddedCloud::fetchZoneChanges(const CKRecordZoneID &zone, const CKServerChangeToken &token,
                                              const CKDesiredKeys &desiredKeys, std::size_t limit,
                                              const CKCallContext &context) {
  return embedded::FetchZoneChanges(*state_->home, zone, token, desiredKeys, limit, context);
}

CKUploadReply EmbeddedCloud::uploadAsset(int descriptor, std::uint64_t size,
                                         const CKProgressHandler &progress, const CKCallContext &context) {
  return embedded::UploadAsset(*state_->home, descriptor, size, progress, context);
}

NSError EmbeddedCloud::readAsset(const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                                 const CKProgressHandler &progress, const CKCallContext &context) {
  return embedded::ReadAsset(*state_->home, asset, offset, sink, progress, context);
}

CKAssetPresence EmbeddedCloud::hasAsset(const CKAssetReference &asset, const CKCallContext &context) {
  return embedded::HasAsset(*state_->home, asset, context);
}

CKUserIdentityReply EmbeddedCloud::currentUserIdentity(const CKCallContext &context) {
  return embedded::CurrentUserIdentity(*state_->home, context);
}

CKShareParticipantsReply EmbeddedCloud::lookUpShareParticipants(
    const std::vector<std::string> &namesOrHandles, const CKCallContext &context) {
  return embedded::LookUpShareParticipants(*state_->home, namesOrHandles, context);
}

CKShareMetadataReply EmbeddedCloud::fetchShareMetadata(const NSURL &url, const CKCallContext &context) {
  return embedded::FetchShareMetadata(*state_->home, url, context);
}

CKShareMetadataReply EmbeddedCloud::acceptShare(const NSURL &url, const CKCallContext &context) {
  return embedded::AcceptShare(*state_->home, url, context);
}

CKShareTokens EmbeddedCloud::shareTokens(const CKRecordID &record, const CKCallContext &context) {
  return embedded::ShareTokens(*state_->home, record, context);
}

CKShareTokenReply EmbeddedCloud::verifyShareToken(const std::string &token, const CKCallContext &context) {
  return embedded::VerifyShareToken(*state_->home, token, context);
}

std::unique_ptr<CKSubscription> EmbeddedCloud::subscribe(CKZonesChangedHandler handler, NSError *error) {
  return embedded::Subscribe(state_->home, std::move(handler), error);
}

}  // namespace droxa
