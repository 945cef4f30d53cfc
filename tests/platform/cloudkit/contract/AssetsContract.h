#pragma once

#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {

template <class World>
class CloudAssets : public testing::Test {
 protected:
  void SetUp() override { EXPECT_OK(cloud->saveZone(kZone, patiently())); }

  // What was stored comes back, to another device, from the start and from within.
  void roundTrip(const std::string &bytes) {
    const CKUploadReply uploaded = upload(*cloud, bytes);
    ASSERT_FALSE(uploaded.error) << uploaded.error.description();
    const CKAssetReference asset = uploaded.asset.reference();
    EXPECT_EQ(asset, (CKAssetReference{bytes.size(), digestOf(bytes)}));
    EXPECT_TRUE(other->hasAsset(asset, patiently()).isPresent);
    for (const std::uint64_t offset : {std::size_t{0}, bytes.size() / 2, bytes.size()}) {
      const auto [got, error] = read(*other, asset, offset);
      EXPECT_OK(error);
      EXPECT_TRUE(got == bytes.substr(offset)) << "of " << bytes.size() << " from " << offset;
    }
  }
  static CKRecord document(const std::string &name, const CKAsset &asset) {
    CKRecord record = item(name);
    record.fields["contents"] = asset;
    return record;
  }

  World world;
  const std::shared_ptr<CKCloud> cloud = world.open("one");
  const std::shared_ptr<CKCloud> other = world.open("two");
};
TYPED_TEST_SUITE_P(CloudAssets);

inline constexpr std::size_t kKiB = 1024;

TYPED_TEST_P(CloudAssets, contentsOfEverySizeComeBack) {
  for (const std::size_t size :
       {0 * kKiB, kKiB / 1024, 256 * kKiB - 1, 256 * kKiB, 256 * kKiB + 1, 4096 * kKiB, 4096 * kKiB + 1}) {
    this->roundTrip(noise(size));
  }
  this->roundTrip(std::string(9 * 1024 * kKiB, '\0'));
}

TYPED_TEST_P(CloudAssets, aLargeFileAndItsChangedVersionBothComeBack) {
  const std::string first = noise(20 * 1024 * kKiB);
  this->roundTrip(first);
  std::string second = first;
  second.insert(second.size() / 2, "inserted in the middle");
  this->roundTrip(second);
  EXPECT_TRUE(read(*this->cloud, {first.size(), digestOf(first)}).first == first);
}

TYPED_TEST_P(CloudAssets, aBrokenTransferGoesOnWhereItStopped) {
  const std::string bytes = noise(6 * 1024 * kKiB);
  const CKAssetReference asset = upload(*this->cloud, bytes).asset.reference();
  std::string got;
  const NSError full("Disk", 28);
  const NSError error = this->cloud->readAsset(
      asset, 0,
      [&](std::span<const std::uint8_t> part) {
        got.append(reinterpret_cast<const char *>(part.data()), part.size());
        return full;
      },
      {}, patiently());
  EXPECT_EQ(error, full);
  ASSERT_LT(got.size(), bytes.size());
  got += read(*this->cloud, asset, got.size()).first;
  EXPECT_TRUE(got == bytes);
}

TYPED_TEST_P(CloudAssets, progressEndsWithTheWhole) {
  const std::string bytes = noise(5 * 1024 * kKiB);
  std::uint64_t uploaded = 0;
  std::uint64_t readTo = 0;
  const MemoryFile file(bytes);
  const CKUploadReply reply = this->cloud->uploadAsset(
      file.descriptor(), bytes.size(),
      [&](std::uint64_t done, std::uint64_t total) {
        EXPECT_EQ(total, bytes.size());
        EXPECT_GE(done, uploaded);
        uploaded = done;
      },
      patiently());
  EXPECT_EQ(uploaded, bytes.size());
  const auto sink = [](std::span<const std::uint8_t>) { return NSError(); };
  EXPECT_OK(this->cloud->readAsset(
      reply.asset.reference(), 0, sink, [&](std::uint64_t done, std::uint64_t) { readTo = done; },
      patiently()));
  EXPECT_EQ(readTo, bytes.size());
}

TYPED_TEST_P(CloudAssets, aFileOfAnotherSizeOrThatChangesMeanwhileIsNotTaken) {
  const std::string bytes = noise(8 * 1024 * kKiB);
  const MemoryFile file(bytes);
  EXPECT_CODE(this->cloud->uploadAsset(file.descriptor(), bytes.size() + 1, {}, patiently()).error,
              assetFileModified);
  EXPECT_CODE(this->cloud->uploadAsset(file.descriptor(), bytes.size() - 1, {}, patiently()).error,
              assetFileModified);
  const auto change = [&](std::uint64_t done, std::uint64_t) {
    if (done > 0) file.putAt("changed", bytes.size() / 2, 1);
  };
  EXPECT_CODE(this->cloud->uploadAsset(file.descriptor(), bytes.size(), change, patiently()).error,
              assetFileModified);
  EXPECT_CODE(this->cloud->uploadAsset(-1, 5, {}, patiently()).error, assetFileNotFound);
}

TYPED_TEST_P(CloudAssets, aFileInARecordIsUploadedWhenItIsSaved) {
  const std::string bytes = noise(300 * kKiB);
  const MemoryFile file(bytes);
  const CKAsset asset = CKAsset::assetWithDescriptor(file.descriptor(), nullptr);
  const CKRecord saved = save(*this->cloud, this->document("a", asset));
  const auto *stored = saved.template get<CKAsset>("contents");
  ASSERT_TRUE(stored && stored->isReference());
  EXPECT_EQ(stored->reference(), (CKAssetReference{bytes.size(), digestOf(bytes)}));
  EXPECT_EQ(fetch(*this->other, saved.recordID).record, saved);
  EXPECT_TRUE(read(*this->other, stored->reference()).first == bytes);
}

TYPED_TEST_P(CloudAssets, aFileThatIsGoneOrNoFileFailsItsRecordAlone) {
  const CKModifyReply reply = modify(*this->cloud,
                                     {this->document("a", CKAsset::assetWithFileAtPath("/nowhere/at all")),
                                      this->document("b", CKAsset::assetWithFileAtPath("/")), item("c")},
                                     CKRecordSavePolicy::ifServerRecordUnchanged, false);
  EXPECT_CODE(reply.error, partialFailure);
  EXPECT_CODE(reply.saved.at(0).error, assetFileNotFound);
  EXPECT_CODE(reply.saved.at(1).error, assetFileNotFound);
  EXPECT_OK(reply.saved.at(2).error);
}

TYPED_TEST_P(CloudAssets, aReferenceToUnknownContentsIsNotSaved) {
  const CKAssetReference unknown{5, std::string(64, 'a')};
  EXPECT_CODE(saveError(*this->cloud, this->document("a", CKAsset::assetWithReference(unknown))),
              assetFileNotFound);
  CKAssetReference otherSize = upload(*this->cloud, "bytes").asset.reference();
  ++otherSize.size;
  EXPECT_CODE(saveError(*this->cloud, this->document("a", CKAsset::assetWithReference(otherSize))),
              assetFileNotFound);
  EXPECT_CODE(saveError(*this->cloud, this->document("a", CKAsset::assetWithReference({5, "../../etc"}))),
              invalidArguments);
}

TYPED_TEST_P(CloudAssets, unknownContentsAndOffsetsBeyondTheEndAreToldSo) {
  const CKAssetReference unknown{5, std::string(64, 'a')};
  EXPECT_CODE(read(*this->cloud, unknown).second, unknownItem);
  EXPECT_OK(this->cloud->hasAsset(unknown, patiently()).error);
  EXPECT_FALSE(this->cloud->hasAsset(unknown, patiently()).isPresent);
  const CKAssetReference asset = upload(*this->cloud, "bytes").asset.reference();
  EXPECT_CODE(read(*this->cloud, asset, 6).second, invalidArguments);
}

TYPED_TEST_P(CloudAssets, transfersCanBeCancelledInTheirMiddle) {
  const std::string bytes = noise(12 * 1024 * kKiB);
  CKCallContext context = patiently();
  context.cancellation = std::make_shared<CKCancellation>();
  const MemoryFile file(bytes);
  const auto cancel = [&](std::uint64_t done, std::uint64_t) {
    if (done > 0) context.cancellation->cancel();
  };
  EXPECT_CODE(this->cloud->uploadAsset(file.descriptor(), bytes.size(), cancel, context).error,
              operationCancelled);
  const CKAssetReference asset = upload(*this->cloud, bytes).asset.reference();
  context.cancellation = std::make_shared<CKCancellation>();
  std::size_t got = 0;
  const auto sink = [&](std::span<const std::uint8_t> part) {
    got += part.size();
    context.cancellation->cancel();
    return NSError();
  };
  EXPECT_CODE(this->cloud->readAsset(asset, 0, sink, {}, context), operationCancelled);
  EXPECT_LT(got, bytes.size());
}

TYPED_TEST_P(CloudAssets, theQuotaCountsWhatRecordsReferTo) {
  this->world.setQuota(1000);
  const CKAsset small = upload(*this->cloud, noise(600)).asset;
  CKRecord first = save(*this->cloud, this->document("a", small));
  const CKAsset another = upload(*this->cloud, noise(601)).asset;
  EXPECT_CODE(saveError(*this->cloud, this->document("b", another)), quotaExceeded);
  first.fields["contents"] = another;  // in the place of the first, it fits
  save(*this->cloud, first);
  EXPECT_OK(removeError(*this->cloud, first.recordID));
  save(*this->cloud, this->document("b", small));
  EXPECT_CODE(upload(*this->cloud, noise(1001)).error, quotaExceeded);
  this->world.setQuota(std::nullopt);
  save(*this->cloud, this->document("c", another));
}

REGISTER_TYPED_TEST_SUITE_P(CloudAssets, contentsOfEverySizeComeBack,
                            aLargeFileAndItsChangedVersionBothComeBack, aBrokenTransferGoesOnWhereItStopped,
                            progressEndsWithTheWhole, aFileOfAnotherSizeOrThatChangesMeanwhileIsNotTaken,
                            aFileInARecordIsUploadedWhenItIsSaved, aFileThatIsGoneOrNoFileFailsItsRecordAlone,
                            aReferenceToUnknownContentsIsNotSaved,
                            unknownContentsAndOffsetsBeyondTheEndAreToldSo,
                            transfersCanBeCancelledInTheirMiddle, theQuotaCountsWhatRecordsReferTo);

}  // namespace droxa::contract
