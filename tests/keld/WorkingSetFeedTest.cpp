// The feed's tokens.

#include "keld/WorkingSetFeed.h"
#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

namespace {

struct Batch {
  QVQueryItems updated;
  std::vector<QVFileObjectID> deleted;
  NSData token;
  NSError error;
};

Batch changes(KeldFixture &drive, const NSData &token, std::uint64_t limit = 200) {
  Once<QVQueryItems, std::vector<QVFileObjectID>, NSData, NSError> answer("working set");
  drive.session()->enumerateWorkingSetChangesFromChangeToken(token, limit, answer.completion());
  return {answer.value<0>(), answer.value<1>(), answer.value<2>(), answer.value<3>()};
}

}  // namespace

TEST(WorkingSetToken, isReadAsItWasWritten) {
  WorkingSetToken token;
  token.databaseUUID = std::string(36, 'u');
  token.rank = 0x0102030405060708;
  token.deadUpTo = 9;
  const NSData data = token.data();
  EXPECT_EQ(data.length(), 56U);
  const auto read = WorkingSetToken::parse(data);
  ASSERT_TRUE(read);
  EXPECT_EQ(read->databaseUUID, token.databaseUUID);
  EXPECT_EQ(read->rank, token.rank);
  EXPECT_EQ(read->deadUpTo, token.deadUpTo);
}

TEST(WorkingSetToken, isRefusedWhenItIsCutOrForeign) {
  WorkingSetToken token;
  token.databaseUUID = std::string(36, 'u');
  const NSData data = token.data();
  for (std::size_t length = 0; length < data.length(); ++length)
    EXPECT_FALSE(WorkingSetToken::parse(NSData::dataWithBytes(data.bytes().first(length)))) << length;
  std::string foreign(data.bytes().begin(), data.bytes().end());
  foreign[0] = 'X';
  EXPECT_FALSE(WorkingSetToken::parse(NSData::dataWithString(foreign)));
}

TEST(WorkingSetFeed, refusesARankThatTheDatabaseNeverReached) {
  KeldFixture drive;
  drive.settle();
  auto token = WorkingSetToken::parse(changes(drive, NSData()).token);
  ASSERT_TRUE(token);
  token->rank += 1000000;
  EXPECT_EQ(changes(drive, token->data()).error.code(), QVErrorChangeTokenExpired);
}

TEST(WorkingSetFeed, expiresTokensWhoseDeathsAreForgotten) {
  KeldOptions options;
  options.keeper.mostTombstones = 10;
  KeldFixture drive(options);
  drive.folder("f");
  drive.settle();
  const NSData before = changes(drive, NSData(), 1000).token;
  for (int i = 0; i < 30; ++i) drive.write("f/" + std::to_string(i));
  drive.settle();
  for (int i = 0; i < 30; ++i) drive.remove("f/" + std::to_string(i));
  drive.settle();
  EXPECT_EQ(changes(drive, before).error.code(), QVErrorChangeTokenExpired);
  // A reader that begins afresh gets through, however small its steps.
  NSData token;
  std::size_t steps = 0;
  for (; steps < 1000; ++steps) {
    const Batch batch = changes(drive, token, 1);
    ASSERT_EQ(batch.error, NSError());
    if (batch.token == token) break;
    token = batch.token;
  }
  EXPECT_LT(steps, 1000U);
}

TEST(WorkingSetFeed, leavesOutWhatIsPrivate) {
  KeldFixture drive;
  const std::string hidden = drive.replica() + "/" + QVUbiquitousDefaultContainerID + "/private";
  drive.write("shown");
  drive.write(hidden);
  drive.settle();
  const Batch all = changes(drive, NSData(), 1000);
  const std::vector<std::string> names = NamesOf(all.updated);
  EXPECT_EQ(std::count(names.begin(), names.end(), "shown"), 1);
  EXPECT_EQ(std::count(names.begin(), names.end(), "private"), 0);
  const QVFileObjectID shown = QVFileObjectID::documentID(drive.number("shown"));
  drive.rename("shown", hidden + "2");
  drive.settle();
  const Batch after = changes(drive, all.token, 1000);
  EXPECT_EQ(after.deleted, std::vector<QVFileObjectID>{shown});
}

}  // namespace droxa::keld
