#pragma once

#include "tests/platform/cloudkit/contract/Calls.h"

namespace droxa::contract {

template <class World>
class CloudZones : public testing::Test {};
TYPED_TEST_SUITE_P(CloudZones);

TYPED_TEST_P(CloudZones, aNewCloudHasNone) {
  TypeParam world;
  const CKZoneList list = world.open("one")->listZones(patiently());
  EXPECT_OK(list.error);
  EXPECT_TRUE(list.zones.empty());
}

TYPED_TEST_P(CloudZones, everyDeviceSeesASavedZoneAndSavingItAgainIsNoError) {
  TypeParam world;
  const auto one = world.open("one");
  EXPECT_OK(one->saveZone({"b"}, patiently()));
  EXPECT_OK(one->saveZone({"a"}, patiently()));
  EXPECT_OK(one->saveZone({"a"}, patiently()));
  EXPECT_EQ(world.open("two")->listZones(patiently()).zones, (std::vector<CKRecordZoneID>{{"a"}, {"b"}}));
}

TYPED_TEST_P(CloudZones, aDeletedZoneTakesItsRecordsWithIt) {
  TypeParam world;
  const auto cloud = world.open("one");
  EXPECT_OK(cloud->saveZone(kZone, patiently()));
  save(*cloud, item("a"));
  EXPECT_OK(cloud->deleteZone(kZone, patiently()));
  EXPECT_TRUE(cloud->listZones(patiently()).zones.empty());
  EXPECT_CODE(fetch(*cloud, item("a").recordID).error, zoneNotFound);
  EXPECT_CODE(changes(*cloud).error, zoneNotFound);
  EXPECT_CODE(saveError(*cloud, item("a")), zoneNotFound);
  EXPECT_OK(cloud->saveZone(kZone, patiently()));
  EXPECT_CODE(fetch(*cloud, item("a").recordID).error, unknownItem);
}

TYPED_TEST_P(CloudZones, deletingAnUnknownZoneIsToldSo) {
  TypeParam world;
  EXPECT_CODE(world.open("one")->deleteZone(kZone, patiently()), zoneNotFound);
}

TYPED_TEST_P(CloudZones, namesAreRawBytesOfBoundedLength) {
  TypeParam world;
  const auto cloud = world.open("one");
  const std::string hostile = std::string("new\nline '\"\\ %s \xff") + std::string(238, 'x');
  ASSERT_EQ(hostile.size(), 255U);
  EXPECT_OK(cloud->saveZone({hostile}, patiently()));
  EXPECT_EQ(cloud->listZones(patiently()).zones, (std::vector<CKRecordZoneID>{{hostile}}));
  EXPECT_CODE(cloud->saveZone({std::string("a\0b", 3)}, patiently()), invalidArguments);
  EXPECT_CODE(cloud->saveZone({hostile + "x"}, patiently()), invalidArguments);
  EXPECT_CODE(cloud->saveZone({""}, patiently()), invalidArguments);
  EXPECT_CODE(cloud->saveZone({"a", "somebody"}, patiently()), invalidArguments);
}

TYPED_TEST_P(CloudZones, theCloudKeepsItsIdentifierAndAnotherHasAnother) {
  TypeParam world;
  const UUID uuid = world.open("one")->cloudIdentifier();
  EXPECT_FALSE(uuid.isNull());
  EXPECT_EQ(world.open("two")->cloudIdentifier(), uuid);
  EXPECT_FALSE(world.openAnotherCloud("one")->cloudIdentifier() == uuid);
}

TYPED_TEST_P(CloudZones, theAccountIsAvailableAndTheDeviceKnowsItsName) {
  TypeParam world;
  const auto cloud = world.open("one");
  const CKAccountReply reply = cloud->accountStatus(patiently());
  EXPECT_OK(reply.error);
  EXPECT_EQ(reply.status, CKAccountStatus::available);
  EXPECT_EQ(cloud->deviceName(), "one");
  EXPECT_NE(cloud->description().find("one"), std::string::npos);
}

TYPED_TEST_P(CloudZones, aCancelledOrLateCallDoesNothing) {
  TypeParam world;
  const auto cloud = world.open("one");
  CKCallContext cancelled = patiently();
  cancelled.cancellation = std::make_shared<CKCancellation>();
  cancelled.cancellation->cancel();
  EXPECT_CODE(cloud->saveZone(kZone, cancelled), operationCancelled);
  EXPECT_CODE(cloud->listZones(cancelled).error, operationCancelled);
  EXPECT_CODE(cloud->fetchRecords({}, {}, cancelled).error, operationCancelled);
  EXPECT_CODE(cloud->modifyRecords({}, cancelled).error, operationCancelled);
  const CKCallContext late = CKCallContext::withTimeout(std::chrono::milliseconds(-1));
  EXPECT_TRUE(CKErrorIsTimeout(cloud->saveZone(kZone, late)));
  EXPECT_TRUE(CKErrorIsTimeout(cloud->fetchZoneChanges(kZone, {}, {}, 1, late).error));
  EXPECT_TRUE(cloud->listZones(patiently()).zones.empty());
}

REGISTER_TYPED_TEST_SUITE_P(CloudZones, aNewCloudHasNone, everyDeviceSeesASavedZoneAndSavingItAgainIsNoError,
                            aDeletedZoneTakesItsRecordsWithIt, deletingAnUnknownZoneIsToldSo,
                            namesAreRawBytesOfBoundedLength, theCloudKeepsItsIdentifierAndAnotherHasAnother,
                            theAccountIsAvailableAndTheDeviceKnowsItsName, aCancelledOrLateCallDoesNothing);

}  // namespace droxa::contract
