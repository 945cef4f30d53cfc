#include <unordered_set>

#include "platform/cloudkit/CKAssetFile.h"
#include "platform/cloudkit/CKCallContext.h"
#include "platform/cloudkit/CKDigest.h"
#include "platform/cloudkit/embedded/ChangeToken.h"
#include "platform/cloudkit/embedded/RecordCoding.h"
#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {
namespace {

TEST(CKRecordID, isDescribedOnOneLineAndHashedByAllItsParts) {
  const CKRecordID id{"a\nb", {"zone", "owner"}};
  EXPECT_EQ(id.description(), "a\\x0ab@zone:owner");
  const std::unordered_set<CKRecordID> ids{id, {"a\nb", {"zone"}}, {"a\nb", {"other", "owner"}}, id};
  EXPECT_EQ(ids.size(), 3U);
}

TEST(CKError, tellsTransientErrorsAndWhatTheyCarry) {
  EXPECT_TRUE(CKErrorIsTransient(CKErrorMake(CKErrorCode::zoneBusy, "")));
  EXPECT_FALSE(CKErrorIsTransient(CKErrorMake(CKErrorCode::quotaExceeded, "")));
  EXPECT_FALSE(CKErrorIsTransient(NSError("Other", static_cast<std::int64_t>(CKErrorCode::zoneBusy))));
  EXPECT_FALSE(CKErrorIsTransient({}));
  const NSError limited =
      CKErrorMakeRetryAfter(CKErrorCode::requestRateLimited, "slowly", std::chrono::milliseconds(1500));
  EXPECT_EQ(CKErrorRetryAfter(limited), std::chrono::milliseconds(1500));
  EXPECT_FALSE(CKErrorRetryAfter(CKErrorMake(CKErrorCode::zoneBusy, "")));
  EXPECT_TRUE(CKErrorIsTimeout(CKErrorMakeTimeout("late")));
  EXPECT_FALSE(CKErrorIsTimeout(CKErrorMake(CKErrorCode::networkFailure, "broken")));
  EXPECT_EQ(CKErrorServerRecord(CKErrorMakeServerRecordChanged(item("a"))), item("a"));
  EXPECT_FALSE(CKErrorServerRecord(CKErrorMake(CKErrorCode::unknownItem, "")));
}

TEST(CKRecord, anOwnSaveIsToldFromAConflict) {
  CKRecord server = item("a");
  server.modifiedByDevice = "one";
  server.fields["other"] = std::int64_t{1};
  EXPECT_TRUE(CKServerRecordIsOwnSave(item("a"), server, "one"));
  EXPECT_FALSE(CKServerRecordIsOwnSave(item("a"), server, "two"));
  EXPECT_FALSE(CKServerRecordIsOwnSave(item("a", "differs"), server, "one"));
  EXPECT_FALSE(CKServerRecordIsOwnSave(item("b"), server, "one"));
  CKRecord removes = item("a");
  removes.fields["other"] = std::monostate();
  EXPECT_FALSE(CKServerRecordIsOwnSave(removes, server, "one"));
  server.fields.erase("other");
  EXPECT_TRUE(CKServerRecordIsOwnSave(removes, server, "one"));
}

TEST(CKDigest, isSHA256AndGoesOnFromACopy) {
  CKDigest digest;
  EXPECT_EQ(digest.hex(), "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855");
  const std::string abc = "abc";
  digest.update({reinterpret_cast<const std::uint8_t *>(abc.data()), 2});
  CKDigest copy = digest;
  copy.update({reinterpret_cast<const std::uint8_t *>(abc.data()) + 2, 1});
  EXPECT_EQ(copy.hex(), "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
  EXPECT_EQ(copy.size(), 3U);
  EXPECT_EQ(digest.size(), 2U);
  EXPECT_EQ(digest.hex(), digestOf("ab"));
}

TEST(CKCallContext, theEarlierDeadlineCountsAndMayMove) {
  const auto moving = std::make_shared<CKMovingDeadline>();
  CKCallContext context = patiently();
  context.idleDeadline = moving;
  EXPECT_OK(context.check());
  moving->moveTo(CKCallContext::Clock::now());
  EXPECT_TRUE(CKErrorIsTimeout(context.check()));
  moving->moveTo(CKCallContext::Clock::now() + kTestDeadline);
  EXPECT_OK(context.check());
}

TEST(CKAssetFile, takesRegularFilesOnly) {
  EXPECT_CODE(CKAssetFile(CKAsset::assetWithFileAtPath("/nowhere")).error(), assetFileNotFound);
  EXPECT_CODE(CKAssetFile(CKAsset::assetWithFileAtPath("/")).error(), assetFileNotFound);
  EXPECT_CODE(CKAssetFile(CKAsset::assetWithFileAtPath("/dev/null")).error(), assetFileNotFound);
  EXPECT_CODE(CKAssetFile(CKAsset::assetWithReference({1, std::string(64, 'a')})).error(), invalidArguments);
  EXPECT_CODE(CKAssetFile(CKAsset()).error(), invalidArguments);
  const MemoryFile file("bytes");
  EXPECT_EQ(CKAssetFile(CKAsset::assetWithDescriptor(file.descriptor(), nullptr)).size(), 5U);
  NSError error;
  EXPECT_FALSE(CKAsset::assetWithDescriptor(-1, &error));
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, EBADF));
}

TEST(RecordCoding, everyShortenedFormIsRefusedOrIsOfFewerFields) {
  const embedded::Fields fields{{"a", std::int64_t{1}},
                                {"b", std::string("text")},
                                {"c", std::vector<std::string>{"x", "y"}},
                                {"d", CKAsset::assetWithReference({1, std::string(64, 'a')})}};
  const std::string bytes = embedded::EncodeFields(fields);
  EXPECT_EQ(embedded::DecodeFields(bytes, {}), fields);
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    const auto decoded = embedded::DecodeFields(bytes.substr(0, i), {});
    EXPECT_TRUE(!decoded || decoded->size() < fields.size());
  }
}

TEST(RecordCoding, lengthsAndKindsThatCantBeAreRefused) {
  const std::string huge = "\x03" + std::string(8, '\xff') + "key";
  EXPECT_FALSE(embedded::DecodeFields(huge, {}));
  const std::string manyStrings = embedded::EncodeFields({{"k", std::vector<std::string>{"x"}}});
  std::string lying = manyStrings;
  lying.replace(1 + 8 + 1, 8, 8, '\xff');
  EXPECT_FALSE(embedded::DecodeFields(lying, {}));
  std::string unknown = manyStrings;
  unknown[0] = 99;
  EXPECT_FALSE(embedded::DecodeFields(unknown, {}));
}

TEST(ChangeToken, onlyItsOwnBytesAreRead) {
  const embedded::ChangeToken token{UUID::generate(), 7, 1'234'567'890'123};
  const auto decoded = embedded::ChangeToken::decode(token.encoded());
  ASSERT_TRUE(decoded);
  EXPECT_EQ(decoded->cloud, token.cloud);
  EXPECT_EQ(decoded->zone, 7);
  EXPECT_EQ(decoded->seq, 1'234'567'890'123);
  const CKServerChangeToken encoded = token.encoded();
  const auto bytes = encoded.data.bytes();
  EXPECT_FALSE(embedded::ChangeToken::decode({NSData::dataWithBytes(bytes.first(bytes.size() - 1))}));
  EXPECT_FALSE(embedded::ChangeToken::decode({}));
}

}  // namespace
}  // namespace droxa::contract
