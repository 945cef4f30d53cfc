#include <gtest/gtest.h>

#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/operations/FPNames.h"

namespace droxa {
namespace {

std::string bounced(const std::string &name, bool isFolder = false) {
  return FPBouncedNames(name, isFolder).next();
}

TEST(FPNames, countOnFromTwo) {
  FPBouncedNames names("a.txt", false);
  EXPECT_EQ(names.next(), "a 2.txt");
  EXPECT_EQ(names.next(), "a 3.txt");
}

TEST(FPNames, goOnFromTheNumberThatTheyHave) {
  EXPECT_EQ(bounced("a 2.txt"), "a 3.txt");
  EXPECT_EQ(bounced("a 99"), "a 100");
  EXPECT_EQ(bounced("a 1.txt"), "a 1 2.txt");
  EXPECT_EQ(bounced("a 02.txt"), "a 02 2.txt");
  EXPECT_EQ(bounced("report 2024.txt"), "report 2024 2.txt");
  EXPECT_EQ(bounced("a2.txt"), "a2 2.txt");
  EXPECT_EQ(bounced("2"), "2 2");
  EXPECT_EQ(bounced(" 2"), " 2 2");
}

TEST(FPNames, keepTheExtensionOfDocuments) {
  EXPECT_EQ(bounced("a.tar.gz"), "a.tar 2.gz");
  EXPECT_EQ(bounced(".hidden"), ".hidden 2");
  EXPECT_EQ(bounced(".hidden.conf"), ".hidden.conf 2");
  EXPECT_EQ(bounced("ends."), "ends. 2");
  EXPECT_EQ(bounced("folder.d", true), "folder.d 2");
}

TEST(FPNames, areShortenedBetweenCharacters) {
  const std::string full(251, 'x');
  EXPECT_EQ(bounced(full + ".txt"), full.substr(0, 249) + " 2.txt");
  std::string rockets;
  for (int i = 0; i < 63; ++i) rockets += "🚀";
  EXPECT_EQ(bounced(rockets + "abc"), rockets + "a 2");
  EXPECT_EQ(bounced(rockets + "🚀").size(), 252U + 2U);
  EXPECT_LE(bounced("a." + std::string(253, 'e')).size(), 255U);
}

TEST(FPObfuscatedPath, showsTheEndsAndTheLength) {
  EXPECT_EQ(fp_obfuscatedPath("/home/secret.txt"), "/h(4)e/s(10)t");
  EXPECT_EQ(fp_obfuscatedPath("/a/bc/"), "/(1)/(2)/");
  EXPECT_EQ(fp_obfuscatedPath("relative"), "r(8)e");
  EXPECT_EQ(fp_obfuscatedPath(""), "");
  EXPECT_EQ(fp_obfuscatedPath("/"), "/");
}

TEST(FPObfuscatedPath, cutsNoCharacterAndBreaksNoLine) {
  EXPECT_EQ(fp_obfuscatedPath("/éabcé"), "/é(7)é");
  EXPECT_EQ(fp_obfuscatedPath("/\nab\xff"), "/?(4)?");
  EXPECT_EQ(fp_obfuscatedPath("/🚀"), "/🚀(4)🚀");
}

}  // namespace
}  // namespace droxa
