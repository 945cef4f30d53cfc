#include <cerrno>
#include <fstream>
#include <gtest/gtest.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "tessaly/QVErrors.h"
#include "tessaly/QVItemMetadata.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class ItemMetadataAttributes : public testing::Test {
 protected:
  ItemMetadataAttributes() { std::ofstream(path) << "x"; }
  std::string raw(const char *name) const {
    std::string bytes(70'000, '\0');
    const ssize_t length = ::lgetxattr(path.c_str(), name, bytes.data(), bytes.size());
    bytes.resize(length < 0 ? 0 : static_cast<std::size_t>(length));
    return bytes;
  }
  bool setRaw(const char *name, const std::string &value) const {
    return ::lsetxattr(path.c_str(), name, value.data(), value.size(), 0) == 0;
  }
  QVItemMetadata read() const {
    QVItemMetadata metadata;
    EXPECT_EQ(QVReadItemAttributes(path, &metadata), 0);
    return metadata;
  }
  ScratchHome home;
  const std::string path = home.root() + "/a";
};

constexpr std::int64_t kDate = 1'769'860'800'123'456'789;  // 2026-01-31 12:00:00 UTC and a bit

}  // namespace

TEST_F(ItemMetadataAttributes, areTextsThatAPersonCanRead) {
  ASSERT_EQ(QVWriteItemAttributes(path, {{{"Red", "Work"}}, kDate, 12}), 0);
  EXPECT_EQ(raw("user.xdg.tags"), "Red,Work");
  EXPECT_EQ(raw("user.droxa.last-used"), "2026-01-31T12:00:00.123456789Z");
  EXPECT_EQ(raw("user.droxa.favorite-rank"), "12");
  EXPECT_EQ(read(), (QVItemMetadata{{"Red", "Work"}, kDate, 12}));
}

TEST_F(ItemMetadataAttributes, stayAsTheyAreUnlessAskedFor) {
  ASSERT_EQ(QVWriteItemAttributes(path, {{{"Red"}}, kDate, 12}), 0);
  ASSERT_EQ(QVWriteItemAttributes(path, {{}, {}, 13}), 0);
  EXPECT_EQ(read(), (QVItemMetadata{{"Red"}, kDate, 13}));
}

TEST_F(ItemMetadataAttributes, areRemovedWhenTheyAreEmpty) {
  ASSERT_EQ(QVWriteItemAttributes(path, {{{"Red"}}, kDate, 12}), 0);
  for (int time = 0; time < 2; ++time)
    ASSERT_EQ(QVWriteItemAttributes(path, QVItemMetadataChange::to({})), 0);
  EXPECT_EQ(::llistxattr(path.c_str(), nullptr, 0), 0);
  EXPECT_TRUE(read().isEmpty());
}

TEST_F(ItemMetadataAttributes, cantBeBorneByALink) {
  const std::string link = home.root() + "/link";
  ASSERT_EQ(::symlink("a", link.c_str()), 0);
  EXPECT_EQ(QVWriteItemAttributes(link, {{{"Red"}}, {}, {}}), ENOTSUP);
  EXPECT_FALSE(QVKeepsItemAttributes(link));
  EXPECT_TRUE(QVKeepsItemAttributes(path));
  EXPECT_TRUE(read().isEmpty()) << "the target was changed";
}

TEST_F(ItemMetadataAttributes, ofWhatIsntThereCantBeWritten) {
  EXPECT_EQ(QVWriteItemAttributes(home.root() + "/missing", {{{"Red"}}, {}, {}}), ENOENT);
}

TEST_F(ItemMetadataAttributes, thatAreHostileAreReadAsFarAsTheyMakeSense) {
  std::string many;
  for (int tag = 0; tag < 500; ++tag) many += "t" + std::to_string(tag) + ",";
  const struct {
    std::string text;
    std::vector<std::string> tags;
  } cases[] = {
      {"Red,,Red, Work ,", {"Red", "Work"}},
      {std::string("a\0b,Red", 7), {"Red"}},
      {"\xff\xfe,Red,\xc0\x80,\xed\xa0\x80,\xf5\x80\x80\x80,\xc3", {"Red"}},
      {"line\nbreak,\x7f,\xc2\x85,Red", {"Red"}},
      {"gr\xc3\xbcn,\xe7\xba\xa2,\xf0\x9f\x94\xb4", {"gr\xc3\xbcn", "\xe7\xba\xa2", "\xf0\x9f\x94\xb4"}},
      {std::string(2'000, 'x') + ",Red", {"Red"}},
      {",,,   ,", {}},
  };
  for (const auto &one : cases) {
    ASSERT_TRUE(setRaw(QVTagsAttribute, one.text));
    EXPECT_EQ(read().tags, one.tags) << one.text;
  }
  ASSERT_TRUE(setRaw(QVTagsAttribute, many));
  EXPECT_EQ(read().tags.size(), QVMostTags);
  EXPECT_EQ(QVDecodeTagNames(std::string(65'000, ',') + "Red"), std::vector<std::string>{"Red"});
}

TEST_F(ItemMetadataAttributes, whichAreNoDateOrNumberReadAsNone) {
  for (const char *text :
       {"", "now", "2026-13-01T00:00:00Z", "2026-01-31", "2026-01-31T12:00:00", "2026-01-31T12:00:00.Z",
        "0000-01-01T00:00:00Z", "9999-01-01T00:00:00Z", "2026-01-31T25:00:00Z", "2026-01-31T12:00:00Zx",
        "-2026-01-31T12:00:00Z", "2026-01-3\xff"}) {
    EXPECT_EQ(QVDecodeLastUsed(text), 0) << text;
  }
  for (const char *text : {"", "-1", "12x", "x", "99999999999999999999", "0x10", "1.5"})
    EXPECT_EQ(QVDecodeFavoriteRank(text), 0U) << text;
  ASSERT_TRUE(setRaw(QVLastUsedAttribute, std::string(3'000, '9')));
  ASSERT_TRUE(setRaw(QVFavoriteRankAttribute, " 7 "));
  EXPECT_EQ(read(), (QVItemMetadata{{}, 0, 7}));
}

TEST(ItemMetadata, datesReadBackAsTheyWereWritten) {
  for (const std::int64_t date :
       {std::int64_t{1}, std::int64_t{-1}, kDate, std::int64_t{-1'000'000'000}, std::int64_t{-1'500'000'001},
        std::int64_t{9'000'000'000'000'000'000}, std::int64_t{-9'000'000'000'000'000'000}}) {
    EXPECT_EQ(QVDecodeLastUsed(QVEncodeLastUsed(date)), date) << QVEncodeLastUsed(date);
  }
  EXPECT_EQ(QVDecodeLastUsed("2026-01-31T12:00:00.5Z"), 1'769'860'800'500'000'000);
  EXPECT_EQ(QVDecodeLastUsed("2026-01-31 12:00:00Z"), 1'769'860'800'000'000'000);
}

TEST(ItemMetadata, tagsThatCantBeKeptAreRefused) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"a,b", "comma"}, {"a\nb", "control"}, {"\xff", "UTF-8"}, {std::string(256, 'x'), "255 bytes"}};
  for (const auto &[name, why] : cases) {
    std::vector<std::string> names{"Red", name};
    const NSError error = QVNormalizeTagNames(&names);
    ASSERT_TRUE(error.is(QVTessalyErrorDomain, QVErrorInvalidArgument)) << name;
    EXPECT_NE(error.localizedDescription().find(why), std::string::npos) << error.localizedDescription();
    EXPECT_EQ(names.size(), 2U);
  }
  std::vector<std::string> many;
  for (std::size_t tag = 0; tag <= QVMostTags; ++tag) many.push_back(std::to_string(tag));
  EXPECT_TRUE(QVNormalizeTagNames(&many));
}

TEST(ItemMetadata, tagsAreEachOnceAndWithoutBlanksAround) {
  std::vector<std::string> names{" Red", "Work", "Red ", "", " "};
  EXPECT_FALSE(QVNormalizeTagNames(&names));
  EXPECT_EQ(names, (std::vector<std::string>{"Red", "Work"}));
}

}  // namespace droxa
