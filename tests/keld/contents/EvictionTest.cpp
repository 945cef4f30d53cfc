#include "ContentsFixture.h"
#include "keld/contents/FileSteps.h"

namespace droxa::keld {
namespace {

const std::string kBytes = BytesOfLength(20'000);

class Evicting : public EachStorageKind {
 protected:
  ContentsOutcome evict(const std::string &name = "a") { return evict(name, replica_.look(name).facts); }
  ContentsOutcome evict(const std::string &name, const FileFacts &expected) {
    return replica_.storage().evict(replica_.folder(), name, expected, replica_.markerOf(kBytes)).outcome;
  }
  void expectWhole() {
    EXPECT_EQ(replica_.read("a"), kBytes);
    const auto look = replica_.look("a");
    EXPECT_EQ(look.kind, hasPlaceholders() ? DocumentClass::present : DocumentClass::plain);
    EXPECT_FALSE(look.isPromised);
    replica_.expectTidy();
  }
};
constexpr auto kKinds = {kPlaceholders, kWithoutLeases, kPromises, kPromisesWithoutExchange};
INSTANTIATE_TEST_SUITE_P(Each, Evicting, testing::ValuesIn(kKinds), StorageKindName);

TEST_P(Evicting, leavesSizeDatesAndMode) {
  replica_.publishPresent("a", kBytes);
  ASSERT_EQ(evict(), ContentsOutcome::done);
  const auto look = replica_.look("a");
  EXPECT_EQ(look.kind, DocumentClass::dataless);
  EXPECT_EQ(look.facts.size, kBytes.size());
  EXPECT_EQ(look.facts.modified, ContentsReplica::kDate);
  EXPECT_EQ(look.facts.mode & 07777, 0640U);
  EXPECT_EQ(look.marker, replica_.markerOf(kBytes));
  EXPECT_EQ(replica_.exists("a"), hasPlaceholders());
  replica_.expectTidy();
  EXPECT_TRUE(replica_.fill("a", kBytes).isDone());
  expectWhole();
}

TEST_P(Evicting, ofADocumentThatWasMadeHereWorksToo) {
  replica_.write("a", kBytes);
  OwnedDescriptor file(::open(replica_.path("a").c_str(), O_RDWR | O_CLOEXEC));
  ASSERT_EQ(SetModified(file.get(), ContentsReplica::kDate), 0);
  EXPECT_EQ(evict(), ContentsOutcome::inUse);
  file = OwnedDescriptor();
  EXPECT_EQ(evict(), ContentsOutcome::done);
  EXPECT_EQ(replica_.look("a").kind, DocumentClass::dataless);
}

TEST_P(Evicting, isRefusedWhileAnybodyHasItOpen) {
  replica_.publishPresent("a", kBytes);
  for (const int mode : {O_RDONLY, O_WRONLY, O_RDWR}) {
    const OwnedDescriptor user(::open(replica_.path("a").c_str(), mode | O_CLOEXEC));
    EXPECT_EQ(evict(), ContentsOutcome::inUse);
    expectWhole();
  }
  EXPECT_EQ(evict(), ContentsOutcome::done);
}

TEST_P(Evicting, isRefusedForWhatIsntExpected) {
  replica_.publishPresent("a", kBytes);
  const auto known = replica_.look("a").facts;
  const auto refusedWith = [&](auto change) {
    FileFacts expected = known;
    change(expected);
    return evict("a", expected) == ContentsOutcome::changedMeanwhile;
  };
  EXPECT_TRUE(refusedWith([](auto &facts) { ++facts.inode; }));
  EXPECT_TRUE(refusedWith([](auto &facts) { ++facts.size; }));
  EXPECT_TRUE(refusedWith([](auto &facts) { ++facts.modified; }));
  expectWhole();
  ASSERT_EQ(::link(replica_.path("a").c_str(), replica_.path("b").c_str()), 0);
  EXPECT_EQ(evict(), ContentsOutcome::changedMeanwhile);
  ASSERT_EQ(::unlink(replica_.path("b").c_str()), 0);
  expectWhole();
  EXPECT_EQ(evict("b", known), ContentsOutcome::gone);
  replica_.writeAt("a", 0, "x");
  EXPECT_EQ(evict(), ContentsOutcome::changedMeanwhile);  // as expected, but not what the cloud has
}

TEST_P(Evicting, neverPunchesASecondTime) {
  replica_.publishPresent("a", kBytes);
  const auto facts = replica_.look("a").facts;
  ASSERT_EQ(evict(), ContentsOutcome::done);
  EXPECT_NE(evict("a", facts), ContentsOutcome::done);
}

TEST_P(Evicting, seesWhoOpensTheDocumentMeanwhile) {
  replica_.publishPresent("a", kBytes);
  OwnedDescriptor user;
  replica_.hooks.beforePunch = [&] {
    user = OwnedDescriptor(::open(replica_.path("a").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  };
  EXPECT_EQ(evict(), ContentsOutcome::inUse);
  user = OwnedDescriptor();
  expectWhole();
}

TEST_P(Evicting, ofAnEmptyDocumentChangesNothing) {
  ASSERT_TRUE(replica_.publishPlaceholder("a", "").isDone());
  EXPECT_TRUE(replica_.storage()
                  .evict(replica_.folder(), "a", replica_.look("a").facts, replica_.markerOf(""))
                  .isDone());
  EXPECT_TRUE(replica_.exists("a"));
}

TEST(EvictingPlaceholders, keepsWhatIsWrittenMeanwhileWithoutLeases) {
  ContentsReplica replica(kWithoutLeases);
  replica.publishPresent("a", kBytes);
  const auto evict = [&] {
    return replica.storage()
        .evict(replica.folder(), "a", replica.look("a").facts, replica.markerOf(kBytes))
        .outcome;
  };
  replica.hooks.beforePunch = [&] { replica.writeAt("a", 0, "mine"); };
  EXPECT_EQ(evict(), ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::edited);
  EXPECT_EQ(replica.read("a"), "mine" + kBytes.substr(4));
  ContentsReplica later(kWithoutLeases);
  later.publishPresent("a", kBytes);
  later.hooks.afterPunch = [&] { later.write("a", BytesOfLength(20'000, 3)); };
  EXPECT_EQ(later.storage().evict(later.folder(), "a", later.look("a").facts, later.markerOf(kBytes)).outcome,
            ContentsOutcome::changedMeanwhile);
  EXPECT_EQ(later.look("a").kind, DocumentClass::overwritten);
  EXPECT_EQ(later.read("a"), BytesOfLength(20'000, 3));
}

TEST(FinishEviction, endsWhatWasCutShortAndNothingElse) {
  const ContentsReplica replica;
  replica.publishPresent("a", kBytes);
  const auto finish = [&] { return replica.storage().finishEviction(replica.folder(), "a").outcome; };
  EXPECT_EQ(finish(), ContentsOutcome::changedMeanwhile);
  {
    auto marker = replica.markerOf(kBytes);
    marker.state = MarkerState::evicting;
    const OwnedDescriptor file(::open(replica.path("a").c_str(), O_RDWR | O_CLOEXEC));
    ASSERT_EQ(WriteMarker(file.get(), marker), 0);
    EXPECT_EQ(finish(), ContentsOutcome::inUse);
  }
  EXPECT_EQ(finish(), ContentsOutcome::done);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::dataless);
  EXPECT_EQ(replica.look("a").facts.modified, ContentsReplica::kDate);
  ASSERT_EQ(::unlink(replica.path("a").c_str()), 0);
  EXPECT_EQ(finish(), ContentsOutcome::gone);
}

}  // namespace
}  // namespace droxa::keld
