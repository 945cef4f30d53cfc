#include <gtest/gtest.h>

#include "keld/sync/ConflictName.h"

namespace droxa::keld {
namespace {

constexpr std::int64_t kDay = 1'700'000'000'000'000'000;  // noon or so of 2023-11-14, nearly everywhere

std::string nameOf(const std::string &name, unsigned number = 1, const std::string &device = "anna") {
  return ConflictName(name, device, kDay, number);
}

// Whether it ends in the middle of a character, or begins so after any prefix.
bool isWholeUTF8(const std::string &text) {
  for (std::size_t at = 0; at < text.size();) {
    const auto lead = static_cast<unsigned char>(text[at]);
    const std::size_t length = lead < 0x80 ? 1 : lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : lead >= 0xC0 ? 2 : 0;
    if (length == 0 || at + length > text.size()) return false;
    for (std::size_t next = 1; next < length; ++next)
      if ((static_cast<unsigned char>(text[at + next]) & 0xC0U) != 0x80U) return false;
    at += length;
  }
  return true;
}

TEST(ConflictName, keepsTheExtension) {
  EXPECT_EQ(nameOf("notes.txt").find("notes (conflict, anna 2023-11-1"), 0U);
  EXPECT_EQ(nameOf("notes.txt").substr(nameOf("notes.txt").size() - 5), ").txt");
}

TEST(ConflictName, aNameThatBeginsWithADotHasNoExtension) {
  EXPECT_EQ(nameOf(".profile").find(".profile (conflict"), 0U);
}

TEST(ConflictName, whatIsTooLongForAnExtensionIsNone) {
  const std::string name = "a." + std::string(40, 'e');
  EXPECT_EQ(nameOf(name).find(name + " (conflict"), 0U);
}

TEST(ConflictName, numbersTellSeveralApart) {
  EXPECT_NE(nameOf("a", 1), nameOf("a", 2));
  EXPECT_NE(nameOf("a", 2), nameOf("a", 3));
}

TEST(ConflictName, isNeverTooLong) {
  for (std::size_t length = 1; length <= 255; ++length) {
    for (const char *extension : {"", ".txt", ".nineteen-characters"}) {
      if (length + std::string(extension).size() > 255) continue;
      const std::string name = nameOf(std::string(length, 'n') + extension, 9999, std::string(200, 'd'));
      EXPECT_LE(name.size(), 255U);
      EXPECT_EQ(name.substr(name.size() - std::string(extension).size()), extension);
    }
  }
}

TEST(ConflictName, isCutBetweenCharacters) {
  for (const char *character : {"\xC3\xA9", "\xE2\x82\xAC", "\xF0\x9F\x98\x80"}) {
    for (std::size_t filler = 0; filler < 4; ++filler) {
      std::string name(filler, 'x');
      while (name.size() + std::string(character).size() <= 251) name += character;
      std::string device(filler, 'd');
      while (device.size() < 100) device += character;
      EXPECT_TRUE(isWholeUTF8(nameOf(name + ".txt", 1, device))) << nameOf(name + ".txt", 1, device);
    }
  }
}

TEST(ConflictName, theDeviceBringsNoSeparator) {
  const std::string name = nameOf("a", 1, "x/../y\n");
  EXPECT_EQ(name.find('/'), std::string::npos);
  EXPECT_EQ(name.find('\n'), std::string::npos);
}

TEST(ConflictName, datesBeforeTheEpochAndFarAwayMakeNames) {
  for (const std::int64_t date : {std::int64_t{0}, std::int64_t{-1}, INT64_MIN, INT64_MAX}) {
    const std::string name = ConflictName("a.txt", "anna", date, 1);
    EXPECT_EQ(name.find("a (conflict, anna "), 0U);
  }
}

}  // namespace
}  // namespace droxa::keld
