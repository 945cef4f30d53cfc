#include <functional>
#include <sys/time.h>

#include "ContentsFixture.h"
#include "keld/contents/DocumentClass.h"
#include "keld/contents/FileSteps.h"

namespace droxa::keld {
namespace {

const std::string kBytes = BytesOfLength(20'000);

// What becomes of a document of 20,000 bytes when the user does something to it.
DocumentClass classAfter(bool isFilled, const std::function<void(const ContentsReplica &)> &what,
                         const std::string &bytes = kBytes, MarkerState *state = nullptr) {
  const ContentsReplica replica;
  EXPECT_TRUE(replica.publishPlaceholder("a", bytes).isDone());
  EXPECT_TRUE(!isFilled || replica.fill("a", bytes).isDone());
  if (state) {
    auto marker = replica.markerOf(bytes);
    marker.state = *state;
    const OwnedDescriptor file(::open(replica.path("a").c_str(), O_RDWR | O_CLOEXEC));
    EXPECT_EQ(WriteMarker(file.get(), marker), 0);
  }
  what(replica);
  return replica.look("a").kind;
}

void nothing(const ContentsReplica &) {}

void setDate(const ContentsReplica &replica, std::int64_t date) {
  const OwnedDescriptor file(::open(replica.path("a").c_str(), O_RDWR | O_CLOEXEC));
  ASSERT_EQ(SetModified(file.get(), date), 0);
}

void touch(const ContentsReplica &replica) {
  setDate(replica, ContentsReplica::kDate + 1);
}

void cutTo(const ContentsReplica &replica, off_t length) {
  ASSERT_EQ(::truncate(replica.path("a").c_str(), length), 0);
}

TEST(ClassifyDocument, tellsWhatIsNoDocument) {
  const ContentsReplica replica;
  EXPECT_EQ(replica.look("a").kind, DocumentClass::missing);
  ASSERT_EQ(::mkdir(replica.path("folder").c_str(), 0755), 0);
  ASSERT_EQ(::symlink("x", replica.path("link").c_str()), 0);
  EXPECT_EQ(replica.look("folder").kind, DocumentClass::notADocument);
  EXPECT_EQ(replica.look("link").kind, DocumentClass::notADocument);
  replica.write("plain", "text");
  EXPECT_EQ(replica.look("plain").kind, DocumentClass::plain);
  EXPECT_EQ(replica.look("plain").facts.size, 4U);
}

TEST(ClassifyDocument, aPresentDocument) {
  EXPECT_EQ(classAfter(true, nothing), DocumentClass::present);
  EXPECT_EQ(classAfter(true, touch), DocumentClass::edited);
  EXPECT_EQ(classAfter(true, [](auto &r) { r.writeAt("a", 5, "x"); }), DocumentClass::edited);
  EXPECT_EQ(classAfter(true, [](auto &r) { cutTo(r, 5); }), DocumentClass::edited);
}

TEST(ClassifyDocument, aPlaceholder) {
  EXPECT_EQ(classAfter(false, nothing), DocumentClass::dataless);
  EXPECT_EQ(classAfter(false, touch), DocumentClass::dataless);
  EXPECT_EQ(classAfter(false, nothing, "x"), DocumentClass::dataless);
}

TEST(ClassifyDocument, anEmptyDocumentIsPresent) {
  EXPECT_EQ(classAfter(false, nothing, ""), DocumentClass::present);
}

TEST(ClassifyDocument, aPlaceholderThatWasWrittenAnewIsOverwritten) {
  const auto write = [](const std::string &bytes) { return [bytes](auto &r) { r.write("a", bytes); }; };
  EXPECT_EQ(classAfter(false, write("")), DocumentClass::overwritten);
  EXPECT_EQ(classAfter(false, [](auto &r) { cutTo(r, 0); }), DocumentClass::overwritten);
  EXPECT_EQ(classAfter(false, write("new")), DocumentClass::overwritten);
  EXPECT_EQ(classAfter(false, write(BytesOfLength(20'000, 2))), DocumentClass::overwritten);
  EXPECT_EQ(classAfter(false, write(BytesOfLength(50'000, 2))), DocumentClass::overwritten);
  EXPECT_EQ(classAfter(false, [](auto &r) { r.writeAt("a", 0, BytesOfLength(20'000, 2)); }),
            DocumentClass::overwritten);
}

TEST(ClassifyDocument, aPlaceholderThatWasWrittenIntoIsPartlyWritten) {
  EXPECT_EQ(classAfter(false, [](auto &r) { r.writeAt("a", 0, "x"); }), DocumentClass::partlyWritten);
  EXPECT_EQ(classAfter(false, [](auto &r) { r.writeAt("a", 9000, "x"); }), DocumentClass::partlyWritten);
  EXPECT_EQ(classAfter(false, [](auto &r) { r.writeAt("a", 20'000, "x"); }), DocumentClass::partlyWritten);
  EXPECT_EQ(classAfter(false, [](auto &r) { cutTo(r, 5); }), DocumentClass::partlyWritten);
  EXPECT_EQ(classAfter(false, [](auto &r) { cutTo(r, 30'000); }), DocumentClass::partlyWritten);
  // Within one block there are no holes to see, but the zeros of what was there.
  EXPECT_EQ(classAfter(
                false, [](auto &r) { r.writeAt("a", 10, "appended"); }, "0123456789"),
            DocumentClass::partlyWritten);
}

TEST(ClassifyDocument, aCopyOfAPlaceholderWithoutItsHolesIsDatalessAsLongAsNothingElseChanged) {
  const auto fillWithZeros = [](const ContentsReplica &replica) {
    replica.writeAt("a", 0, std::string(20'000, '\0'));
    setDate(replica, ContentsReplica::kDate);
  };
  EXPECT_EQ(classAfter(false, fillWithZeros), DocumentClass::dataless);
}

TEST(ClassifyDocument, anEvictionThatWasCutShort) {
  MarkerState evicting = MarkerState::evicting;
  EXPECT_EQ(classAfter(true, nothing, kBytes, &evicting), DocumentClass::evicting);
  EXPECT_EQ(classAfter(false, nothing, kBytes, &evicting), DocumentClass::evicting);
  EXPECT_EQ(classAfter(false, touch, kBytes, &evicting), DocumentClass::evicting);  // punched
  EXPECT_EQ(classAfter(
                true, [](auto &r) { r.write("a", "new"); }, kBytes, &evicting),
            DocumentClass::overwritten);
  EXPECT_EQ(classAfter(
                true, [](auto &r) { r.writeAt("a", 5, "x"); }, kBytes, &evicting),
            DocumentClass::overwritten);
  EXPECT_EQ(classAfter(
                false, [](auto &r) { r.writeAt("a", 5, "x"); }, kBytes, &evicting),
            DocumentClass::partlyWritten);
}

TEST(ClassifyDocument, aPromiseStandsForItsDocument) {
  const ContentsReplica replica(kPromises);
  ASSERT_TRUE(replica.publishPlaceholder("a", kBytes, 0604).isDone());
  EXPECT_FALSE(replica.exists("a"));
  const auto look = replica.look("a");
  EXPECT_EQ(look.kind, DocumentClass::dataless);
  EXPECT_TRUE(look.isPromised);
  EXPECT_EQ(look.facts.size, kBytes.size());
  EXPECT_EQ(look.facts.mode & 07777, 0604U);
  EXPECT_EQ(look.facts.modified, ContentsReplica::kDate);
  EXPECT_EQ(look.marker, replica.markerOf(kBytes));
  replica.write("a", kBytes);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::overwritten);
  setDate(replica, ContentsReplica::kDate);
  EXPECT_EQ(replica.look("a").kind, DocumentClass::present);
  EXPECT_TRUE(replica.look("a").isPromised);
}

}  // namespace
}  // namespace droxa::keld
