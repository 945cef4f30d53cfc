#pragma once

#include "platform/cloudkit/EmbeddedCloud.h"
#include "platform/cloudkit/embedded/Home.h"

namespace droxa::embedded {

// The calls of EmbeddedCloud, each in a file of its own; their contracts are CKCloud's.
NSError SaveZone(Home &home, const CKRecordZoneID &zone, const CKCallContext &context);
NSError DeleteZone(Home &home, const CKRecordZoneID &zone, const CKCallContext &context);
CKZoneList ListZones(Home &home, const CKCallContext &context);
CKFetchReply FetchRecords(Home &home, const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                          const CKCallContext &context);
CKModifyReply ModifyRecords(Home &home, const CKModifyRequest &request, const CKCallContext &context);
CKZoneChanges FetchZoneChanges(Home &home, const CKRecordZoneID &zone, const CKServerChangeToken &token,
                               const CKDesiredKeys &desiredKeys, std::size_t limit,
                               const CKCallContext &context);
CKUploadReply UploadAsset(Home &home, int descriptor, std::uint64_t size, const CKProgressHandler &progress,
                          const CKCallContext &context);
NSError ReadAsset(Home &home, const CKAssetReference &asset, std::uint64_t offset, const CKAssetSink &sink,
                  const CKProgressHandler &progress, const CKCallContext &context);
CKAssetPresence HasAsset(Home &home, const CKAssetReference &asset, const CKCallContext &context);
CKUserIdentityReply CurrentUserIdentity(Home &home, const CKCallContext &context);
NSError SetUserIdentity(Home &home, const std::string &displayName, const std::string &handle,
                        const CKCallContext &context);
CKShareParticipantsReply LookUpShareParticipants(Home &home, const std::vector<std::string> &namesOrHandles,
                                                 const CKCallContext &context);
CKShareMetadataReply FetchShareMetadata(Home &home, const NSURL &url, const CKCallContext &context);
CKShareMetadataReply AcceptShare(Home &home, const NSURL &url, const CKCallContext &context);
CKShareTokens ShareTokens(Home &home, const CKRecordID &record, const CKCallContext &context);
CKShareTokenReply VerifyShareToken(Home &home, const std::string &token, const CKCallContext &context);
std::unique_ptr<CKSubscription> Subscribe(std::shared_ptr<Home> home, CKZonesChangedHandler handler,
                                          NSError *error);
EmbeddedCloud::Garbage CollectGarbage(Home &home, std::chrono::seconds grace, const CKCallContext &context);

}  // namespace droxa::embedded
