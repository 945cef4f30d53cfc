#include <sys/xattr.h>

#include "ContentsFixture.h"
#include "keld/contents/DocumentMarker.h"

namespace droxa::keld {
namespace {

DocumentMarker someMarker() {
  DocumentMarker marker;
  marker.state = MarkerState::evicting;
  marker.recordName = "a record, with blanks \xc3\xa4";
  marker.contentVersion = "17";
  marker.digest = std::string(64, 'a');
  marker.size = 9'007'199'254'740'993;
  marker.modified = -5;
  marker.birth = 1'600'000'000'000'000'001;
  return marker;
}

TEST(DocumentMarker, readsBackAsItWasWritten) {
  DocumentMarker marker = someMarker();
  for (const auto state : {MarkerState::present, MarkerState::evicting, MarkerState::dataless}) {
    marker.state = state;
    EXPECT_EQ(ParseMarker(EncodeMarker(marker)), marker);
  }
  marker.contentVersion.clear();
  EXPECT_EQ(ParseMarker(EncodeMarker(marker)), marker);
  const auto folder = DocumentMarker::ofFolder("folder record");
  EXPECT_EQ(ParseMarker(EncodeMarker(folder)), folder);
}

TEST(DocumentMarker, isInvalidWithFieldsThatCantBeWritten) {
  const auto isValidWith = [](auto change) {
    DocumentMarker marker = someMarker();
    change(marker);
    return marker.isValid();
  };
  EXPECT_TRUE(isValidWith([](auto &) {}));
  EXPECT_FALSE(isValidWith([](auto &m) { m.recordName.clear(); }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.recordName = "a\nb"; }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.recordName = std::string(256, 'a'); }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.digest = std::string(64, 'A'); }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.digest.pop_back(); }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.contentVersion = "a b"; }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.size = UINT64_MAX; }));
  EXPECT_FALSE(isValidWith([](auto &m) { m.state = MarkerState::folder; }));
}

TEST(DocumentMarker, hostileBytesAreNoMarker) {
  const std::string digest(64, '0');
  const std::string good = "1 p 3 4 0 " + digest + " v1 name";
  ASSERT_TRUE(ParseMarker(good));
  for (const std::string &bad : std::initializer_list<std::string>{
           std::string(), std::string("1"), std::string("1 "),
           std::string("2 p 3 4 0 ") + digest + " v1 name", "1 x 3 4 0 " + digest + " v1 name",
           "1 p 03 4 0 " + digest + " v1 name", "1 p +3 4 0 " + digest + " v1 name",
           "1 p -3 4 0 " + digest + " v1 name", "1 p 3 -0 0 " + digest + " v1 name",
           "1 p 99999999999999999999 4 0 " + digest + " v1 name", "1 p 3 4 0 " + digest + " 1 name",
           "1 p 3 4 0 " + digest + " v1 ", "1 p 3 4 0 " + digest + " v1", "1  p 3 4 0 " + digest + " v1 name",
           "1 p 3 4 0 " + digest + " v1 na\nme", good + '\0', "1 f ", std::string(100'000, '1'),
           std::string("\0\0\0", 3)})
    EXPECT_FALSE(ParseMarker(bad)) << bad.substr(0, 100);
  for (std::size_t i = 0; i < good.size(); ++i)
    for (const char byte : {'\0', '\xff', '\n'}) {
      std::string changed = good;
      changed[i] = byte;
      // The name of the record may hold any byte but control characters.
      const bool isInName = i >= good.size() - 4 && byte == '\xff';
      EXPECT_EQ(ParseMarker(changed).has_value(), isInName) << i;
    }
}

TEST(DocumentMarker, isReadFromAFileByNameAndByDescriptor) {
  const ContentsReplica replica;
  replica.write("a", "text");
  const OwnedDescriptor file(::open(replica.path("a").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_FALSE(ReadMarker(file.get()));
  ASSERT_EQ(WriteMarker(file.get(), someMarker()), 0);
  EXPECT_EQ(ReadMarker(file.get()), someMarker());
  EXPECT_EQ(ReadMarker(replica.folder(), "a"), someMarker());
  ASSERT_EQ(::symlink("a", replica.path("link").c_str()), 0);
  EXPECT_FALSE(ReadMarker(replica.folder(), "link"));
  EXPECT_EQ(RemoveMarker(file.get()), 0);
  EXPECT_EQ(RemoveMarker(file.get()), 0);
  EXPECT_FALSE(ReadMarker(file.get()));
  EXPECT_EQ(WriteMarker(file.get(), DocumentMarker()), EINVAL);
}

TEST(DocumentMarker, oneThatIsTooLongIsNone) {
  const ContentsReplica replica;
  replica.write("a", "text");
  const std::string value(3000, 'x');
  ASSERT_EQ(::setxattr(replica.path("a").c_str(), kMarkerAttribute, value.data(), value.size(), 0), 0);
  EXPECT_FALSE(ReadMarker(replica.folder(), "a"));
  EXPECT_EQ(replica.look("a").kind, DocumentClass::plain);
}

}  // namespace
}  // namespace droxa::keld
