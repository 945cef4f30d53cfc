#include <ctime>
#include <gtest/gtest.h>
#include <map>
#include <sstream>

#include "tessaly/QVTrashInfo.h"

namespace droxa {

namespace {

// Reads a note as another program would: the group, then keys and values line by line.
std::map<std::string, std::string> readAsOthersDo(const std::string &text) {
  std::istringstream lines(text);
  std::string line;
  std::getline(lines, line);
  EXPECT_EQ(line, "[Trash Info]");
  std::map<std::string, std::string> values;
  while (std::getline(lines, line)) values[line.substr(0, line.find('='))] = line.substr(line.find('=') + 1);
  return values;
}

std::string decodeAsOthersDo(const std::string &text) {
  std::string bytes;
  for (std::size_t at = 0; at < text.size(); ++at) {
    if (text[at] == '%') {
      bytes += static_cast<char>(std::stoi(text.substr(at + 1, 2), nullptr, 16));
      at += 2;
    } else {
      bytes += text[at];
    }
  }
  return bytes;
}

std::string noteWithPath(const std::string &path) {
  return "[Trash Info]\nPath=" + path + "\nDeletionDate=2026-01-31T12:00:00\n";
}

}  // namespace

TEST(TrashInfo, isReadByOtherProgramsAsItWasWritten) {
  for (const std::string &path : {std::string("/a"), std::string("/home/u/My Files/100% \xc3\xbc.txt"),
                                  std::string("/a/\xff\x01\n="), std::string("/a/[x] #;~-_.")}) {
    const QVTrashInfo info{path, "2026-01-31T12:00:00", QVFileObjectID::folderOrAliasID(12), 99};
    const std::string text = QVEncodeTrashInfo(info);
    auto values = readAsOthersDo(text);
    EXPECT_EQ(decodeAsOthersDo(values["Path"]), path);
    EXPECT_EQ(values["DeletionDate"], "2026-01-31T12:00:00");
    EXPECT_EQ(QVParseTrashInfo(text), info);
  }
}

TEST(TrashInfo, ofAnotherProgramIsUnderstood) {
  const auto info = QVParseTrashInfo(
      "# a comment\r\n\r\n[Trash Info]\r\nDeletionDate = "
      "2020-05-04T01:02:03\r\nPath=/a/b%20c\r\nX-Other=1\r\n"
      "[Other Group]\r\nPath=/other\r\n");
  ASSERT_TRUE(info);
  EXPECT_EQ(info->path, "/a/b c");
  EXPECT_EQ(info->deletionDate, "2020-05-04T01:02:03");
  EXPECT_FALSE(info->folder);
}

TEST(TrashInfo, thatIsHostileIsNone) {
  for (const char *path : {"", "relative", "a/b", "/", "/..", "/a/../b", "/a/%2e%2e/b", "/a/%00b", "/a%",
                           "/a%2", "/a%zz", "//a", "/a/", "/a//b", "/a/./b"})
    EXPECT_FALSE(QVParseTrashInfo(noteWithPath(path))) << path;
  for (const char *text : {"", "Path=/a\n", "[Other]\nPath=/a\n", "[Trash Info]\n", "[Trash Info]\nPath\n"})
    EXPECT_FALSE(QVParseTrashInfo(text)) << text;
  EXPECT_FALSE(QVParseTrashInfo(std::string(60'000, '\0')));
  EXPECT_FALSE(QVParseTrashInfo(std::string(60'000, '[')));
}

TEST(TrashInfo, whoseFolderMakesNoSenseHasNone) {
  for (const char *folder : {"d12", "", "i0", "x", "../i12"}) {
    const auto info = QVParseTrashInfo(noteWithPath("/a") + "X-Droxa-Folder=" + folder + "\n");
    ASSERT_TRUE(info) << folder;
    EXPECT_FALSE(info->folder) << folder;
  }
  const auto first = QVParseTrashInfo(noteWithPath("/a") + "Path=/b\nX-Droxa-Folder=i1\nX-Droxa-Folder=i2\n");
  ASSERT_TRUE(first);
  EXPECT_EQ(first->path, "/a");
  EXPECT_EQ(first->folder, QVFileObjectID::folderOrAliasID(1));
}

TEST(TrashInfo, theDateIsThatOfTheClockOnTheWall) {
  const std::string date = QVTrashDateNow();
  std::tm parts{};
  const char *end = ::strptime(date.c_str(), "%Y-%m-%dT%H:%M:%S", &parts);
  ASSERT_TRUE(end && *end == '\0') << date;
  parts.tm_isdst = -1;
  EXPECT_NEAR(static_cast<double>(std::mktime(&parts)), static_cast<double>(std::time(nullptr)), 60);
}

}  // namespace droxa
