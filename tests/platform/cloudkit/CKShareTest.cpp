#include "platform/cloudkit/embedded/ShareToken.h"
#include "tests/platform/cloudkit/contract/ShareCalls.h"

namespace droxa::contract {
namespace {

CKShare fullShare() {
  CKShare share = shareOf("root", {named("bob"), named("eve", Permission::readOnly)}, Permission::readOnly);
  share.participants[0].userIdentity = {"bob", "Bob B.", "bob@droxa.test"};
  share.participants[1].acceptanceStatus = Acceptance::removed;
  share.URL = NSURL::URLWithString("droxa-share:0123");
  share.recordChangeTag = "tag";
  share.modifiedByDevice = "one";
  share.fields[CKShareTypeKey] = std::string("folder");
  return share;
}

TEST(CKShare, goesIntoARecordAndComesBack) {
  const CKShare share = fullShare();
  EXPECT_EQ(CKShare::shareWithRecord(share.record()), share);
  CKShare empty;
  empty.recordID = {"empty", kZone};
  EXPECT_EQ(CKShare::shareWithRecord(empty.record()), empty);
  EXPECT_FALSE(CKShare::shareWithRecord(item("a")));
}

TEST(CKShare, isNotReadFromARecordThatIsDamaged) {
  const CKRecord good = fullShare().record();
  const std::string names("a\0b\0c\0", 6);
  for (const std::string &text : {std::string("bob"), names, names + "0", names + "009", names + "0123"}) {
    CKRecord record = good;
    record.fields["participants"] = std::vector<std::string>{text};
    EXPECT_FALSE(CKShare::shareWithRecord(record)) << text;
  }
  CKRecord record = good;
  record.fields["participants"] = std::string("bob");
  EXPECT_FALSE(CKShare::shareWithRecord(record));
  record = good;
  record.fields["publicPermission"] = std::int64_t{3};
  EXPECT_FALSE(CKShare::shareWithRecord(record));
}

TEST(CKShare, isDescribedWithItsParticipants) {
  EXPECT_EQ(
      fullShare().description(),
      "share share of root@documents:__defaultOwner__ of root@documents:__defaultOwner__ public readOnly "
      "{bob (Bob B., bob@droxa.test) privateUser readWrite pending, eve (, ) privateUser readOnly removed}");
}

TEST(CKShare, aNewOneIsInItsRootsZoneUnderANameOfItsOwn) {
  const CKShare one = CKShare::shareWithRootRecordID(idAtAlices("root"));
  EXPECT_EQ(one.recordID.zoneID, kAlices);
  EXPECT_EQ(one.rootRecordID, idAtAlices("root"));
  EXPECT_NE(one.recordID, CKShare::shareWithRootRecordID(idAtAlices("root")).recordID);
  EXPECT_FALSE(one.isKnownToServer());
}

TEST(ShareToken, opensOnlyWithTheKeyThatSealedIt) {
  embedded::ShareToken token;
  token.kind = CKShareTokenKind::share;
  token.cloud = UUID::generate();
  token.zone = 5;
  token.account = -7;
  token.record = "record";
  token.share = "share";
  const std::string text = token.sealed("key");
  EXPECT_EQ(embedded::ShareToken::open(text, "key"), token);
  EXPECT_FALSE(embedded::ShareToken::open(text, "another"));
  EXPECT_FALSE(embedded::ShareToken::open("", "key"));
  EXPECT_FALSE(embedded::ShareToken::open("zz", "key"));
}

}  // namespace
}  // namespace droxa::contract
