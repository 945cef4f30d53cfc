#pragma once

#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {

template <class World>
class CloudRecords : public testing::Test {
 protected:
  void SetUp() override { EXPECT_OK(cloud->saveZone(kZone, patiently())); }
  World world;
  const std::shared_ptr<CKCloud> cloud = world.open("one");
  const std::shared_ptr<CKCloud> other = world.open("two");
};
TYPED_TEST_SUITE_P(CloudRecords);

TYPED_TEST_P(CloudRecords, everyKindOfValueComesBackAsItWasSaved) {
  CKRecord record = item("a");
  record.fields = {{"integer", std::int64_t{-5}},
                   {"real", 0.25},
                   {"string", std::string("raw \xff\n bytes")},
                   {"data", NSData::dataWithString("data")},
                   {"no bytes", NSData::dataWithString("")},
                   {"date", NSDate::dateWithNanosecondsSince1970(-123456789)},
                   {"strings", std::vector<std::string>{"a", "", "b"}},
                   {"empty", std::string()}};
  const CKRecord saved = save(*this->cloud, record);
  EXPECT_EQ(saved.fields, record.fields);
  EXPECT_FALSE(saved.recordChangeTag.empty());
  EXPECT_EQ(saved.modifiedByDevice, "one");
  EXPECT_TRUE(saved.modificationDate);
  const CKRecordResult fetched = fetch(*this->other, record.recordID);
  EXPECT_OK(fetched.error);
  EXPECT_EQ(fetched.record, saved);
}

TYPED_TEST_P(CloudRecords, noValueIsNotSavedAndTakesAKeyAway) {
  CKRecord record = item("a");
  record.fields["none"] = NSData();
  CKRecord saved = save(*this->cloud, record);
  EXPECT_FALSE(saved.fields.contains("none"));
  saved.fields = {{"title", std::monostate()}, {"other", std::string("x")}};
  EXPECT_EQ(save(*this->cloud, saved).fields,
            (std::map<std::string, CKRecordValue>{{"other", std::string("x")}}));
}

TYPED_TEST_P(CloudRecords, anUnknownRecordAndAnUnknownZoneFailAlone) {
  save(*this->cloud, item("a"));
  const CKRecordID elsewhere{"a", {"elsewhere"}};
  const CKFetchReply reply =
      this->cloud->fetchRecords({item("a").recordID, item("b").recordID, elsewhere}, {}, patiently());
  EXPECT_CODE(reply.error, partialFailure);
  ASSERT_EQ(reply.results.size(), 3U);
  EXPECT_OK(reply.results[0].error);
  EXPECT_CODE(reply.results[1].error, unknownItem);
  EXPECT_CODE(reply.results[2].error, zoneNotFound);
  EXPECT_EQ(reply.results[2].recordID, elsewhere);
}

TYPED_TEST_P(CloudRecords, onlyDesiredKeysAreAnswered) {
  CKRecord record = item("a");
  record.fields["size"] = std::int64_t{1};
  save(*this->cloud, record);
  using Keys = std::set<std::string>;
  EXPECT_EQ(fetch(*this->cloud, record.recordID, Keys{"size", "none"}).record.fields.size(), 1U);
  EXPECT_TRUE(fetch(*this->cloud, record.recordID, Keys{}).record.fields.empty());
  EXPECT_EQ(fetch(*this->cloud, record.recordID).record.fields.size(), 2U);
}

TYPED_TEST_P(CloudRecords, aRecordFetchedInPartKeepsItsOtherFieldsWhenSaved) {
  CKRecord record = item("a");
  record.fields["size"] = std::int64_t{1};
  save(*this->cloud, record);
  CKRecord part = fetch(*this->cloud, record.recordID, std::set<std::string>{"title"}).record;
  part.fields["title"] = std::string("new");
  const CKRecord saved = save(*this->cloud, part);
  EXPECT_EQ(*saved.template get<std::int64_t>("size"), 1);
  EXPECT_EQ(*saved.template get<std::string>("title"), "new");
}

TYPED_TEST_P(CloudRecords, aStaleTagIsAConflictThatCarriesTheServersRecord) {
  const CKRecord first = save(*this->cloud, item("a"));
  CKRecord theirs = first;
  theirs.fields["title"] = std::string("theirs");
  theirs = save(*this->other, theirs);
  EXPECT_NE(theirs.recordChangeTag, first.recordChangeTag);
  const NSError error = saveError(*this->cloud, first);
  ASSERT_TRUE(CKErrorServerRecord(error)) << error.description();
  EXPECT_EQ(*CKErrorServerRecord(error), theirs);
  EXPECT_CODE(saveError(*this->cloud, item("a")), serverRecordChanged);  // no tag: it must not exist
  EXPECT_EQ(fetch(*this->cloud, first.recordID).record, theirs);
}

TYPED_TEST_P(CloudRecords, otherPoliciesOverwriteWhateverTheTag) {
  CKRecord record = item("a");
  record.fields["size"] = std::int64_t{1};
  save(*this->cloud, record);
  CKRecord change = item("a", "changed");
  EXPECT_EQ(save(*this->other, change, CKRecordSavePolicy::changedKeys).fields.size(), 2U);
  EXPECT_EQ(save(*this->other, change, CKRecordSavePolicy::allKeys).fields, change.fields);
}

TYPED_TEST_P(CloudRecords, savingADeletedRecordByItsTagIsToldSo) {
  const CKRecord record = save(*this->cloud, item("a"));
  EXPECT_OK(removeError(*this->other, record.recordID));
  EXPECT_CODE(saveError(*this->cloud, record), unknownItem);
  const CKRecord again = save(*this->cloud, item("a"));
  EXPECT_NE(again.recordChangeTag, record.recordChangeTag);
}

TYPED_TEST_P(CloudRecords, aDeletionWithAStaleTagIsAConflictAndOneOfNothingSucceeds) {
  const CKRecord first = save(*this->cloud, item("a"));
  const CKRecord second = save(*this->cloud, first);
  EXPECT_CODE(removeError(*this->other, first.recordID, first.recordChangeTag), serverRecordChanged);
  EXPECT_OK(removeError(*this->other, first.recordID, second.recordChangeTag));
  EXPECT_CODE(fetch(*this->cloud, first.recordID).error, unknownItem);
  EXPECT_OK(removeError(*this->other, first.recordID, second.recordChangeTag));
  EXPECT_CODE(removeError(*this->other, {"a", {"elsewhere"}}), zoneNotFound);
}

TYPED_TEST_P(CloudRecords, anAtomicCallWithAConflictChangesNothing) {
  save(*this->cloud, item("a"));
  const CKModifyReply reply =
      this->cloud->modifyRecords({{item("new"), item("a")}, {{item("gone").recordID, {}}}}, patiently());
  EXPECT_CODE(reply.error, partialFailure);
  ASSERT_EQ(reply.saved.size(), 2U);
  EXPECT_CODE(reply.saved[0].error, batchRequestFailed);
  EXPECT_CODE(reply.saved[1].error, serverRecordChanged);
  EXPECT_CODE(reply.deleted.at(0).error, batchRequestFailed);
  EXPECT_CODE(fetch(*this->cloud, item("new").recordID).error, unknownItem);
}

TYPED_TEST_P(CloudRecords, anAtomicCallTellsEveryConflict) {
  save(*this->cloud, item("a"));
  save(*this->cloud, item("b"));
  const CKModifyReply conflicts = modify(*this->other, {item("a"), item("b")});
  EXPECT_CODE(conflicts.saved.at(0).error, serverRecordChanged);
  EXPECT_CODE(conflicts.saved.at(1).error, serverRecordChanged);
}

TYPED_TEST_P(CloudRecords, aCallThatIsNotAtomicChangesWhatItCan) {
  save(*this->cloud, item("a"));
  const CKModifyReply reply =
      modify(*this->cloud, {item("new"), item("a")}, CKRecordSavePolicy::ifServerRecordUnchanged, false);
  EXPECT_CODE(reply.error, partialFailure);
  EXPECT_OK(reply.saved.at(0).error);
  EXPECT_CODE(reply.saved.at(1).error, serverRecordChanged);
  EXPECT_OK(fetch(*this->cloud, item("new").recordID).error);
}

TYPED_TEST_P(CloudRecords, callsThatCantBeAreRefusedAsAWhole) {
  EXPECT_CODE(modify(*this->cloud, {item("a"), item("a")}).error, invalidArguments);
  CKRecord elsewhere = item("b");
  elsewhere.recordID.zoneID.zoneName = "elsewhere";
  EXPECT_CODE(modify(*this->cloud, {item("a"), elsewhere}).error, invalidArguments);
  std::vector<CKRecord> many;
  for (std::size_t i = 0; i <= CKMostRecordsPerCall; ++i) many.push_back(item(std::to_string(i)));
  EXPECT_CODE(modify(*this->cloud, many).error, limitExceeded);
  EXPECT_CODE(
      this->cloud->fetchRecords(std::vector<CKRecordID>(CKMostRecordsPerCall + 1), {}, patiently()).error,
      limitExceeded);
  EXPECT_TRUE(changes(*this->cloud).changedRecords.empty());
}

TYPED_TEST_P(CloudRecords, namesTypesKeysAndSizesAreChecked) {
  const std::string longest(255, '\n');
  CKRecord record = item(longest);
  record.recordType = longest;
  record.fields[longest] = std::int64_t{1};
  EXPECT_EQ(fetch(*this->other, save(*this->cloud, record).recordID).record.fields, record.fields);
  EXPECT_CODE(saveError(*this->cloud, item(longest + "x")), invalidArguments);
  EXPECT_CODE(saveError(*this->cloud, item(std::string("a\0b", 3))), invalidArguments);
  EXPECT_CODE(saveError(*this->cloud, item("")), invalidArguments);
  EXPECT_CODE(fetch(*this->cloud, item("").recordID).error, invalidArguments);
  EXPECT_CODE(removeError(*this->cloud, item("").recordID), invalidArguments);
  record.fields[""] = std::int64_t{1};
  EXPECT_CODE(saveError(*this->cloud, record), invalidArguments);
  CKRecord untyped = item("a");
  untyped.recordType = "";
  EXPECT_CODE(saveError(*this->cloud, untyped), invalidArguments);
  EXPECT_CODE(saveError(*this->cloud, item("a", std::string(CKLargestRecord, 'x'))), limitExceeded);
}

TYPED_TEST_P(CloudRecords, aRecordKeepsItsType) {
  CKRecord record = save(*this->cloud, item("a"));
  record.recordType = "Other";
  EXPECT_CODE(saveError(*this->cloud, record), invalidArguments);
}

REGISTER_TYPED_TEST_SUITE_P(CloudRecords, everyKindOfValueComesBackAsItWasSaved,
                            noValueIsNotSavedAndTakesAKeyAway, anUnknownRecordAndAnUnknownZoneFailAlone,
                            onlyDesiredKeysAreAnswered, aRecordFetchedInPartKeepsItsOtherFieldsWhenSaved,
                            aStaleTagIsAConflictThatCarriesTheServersRecord,
                            otherPoliciesOverwriteWhateverTheTag, savingADeletedRecordByItsTagIsToldSo,
                            aDeletionWithAStaleTagIsAConflictAndOneOfNothingSucceeds,
                            anAtomicCallWithAConflictChangesNothing, anAtomicCallTellsEveryConflict,
                            aCallThatIsNotAtomicChangesWhatItCan, callsThatCantBeAreRefusedAsAWhole,
                            namesTypesKeysAndSizesAreChecked, aRecordKeepsItsType);

}  // namespace droxa::contract
