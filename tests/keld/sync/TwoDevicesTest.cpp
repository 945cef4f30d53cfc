#include <sys/stat.h>

#include "tests/keld/sync/TwoDevices.h"

namespace droxa::keld {
namespace {

TEST_F(TwoDevices, aDocumentMadeOnOneAppearsDatalessOnTheOther) {
  const std::string contents(100'000, 'a');
  share("notes.txt", contents);
  EXPECT_TRUE(ben.isDataless("notes.txt"));
  struct stat status = {};
  ASSERT_EQ(::stat(ben.keld.at("notes.txt").c_str(), &status), 0);
  EXPECT_EQ(static_cast<std::size_t>(status.st_size), contents.size());
  EXPECT_LE(status.st_blocks, 8) << "more than what the marker takes";
  EXPECT_EQ(anna.status("notes.txt").contents, QVContentsState::present);
  EXPECT_EQ(anna.status("notes.txt").upload, QVUploadState::inCloud);
}

TEST_F(TwoDevices, aDownloadedDocumentHasItsContentsAndDates) {
  share("notes.txt", "hello");
  EXPECT_EQ(ben.contents("notes.txt"), "hello");
  EXPECT_EQ(ben.status("notes.txt").contents, QVContentsState::present);
  EXPECT_EQ(ben.status("notes.txt").upload, QVUploadState::inCloud);
  EXPECT_EQ(std::filesystem::last_write_time(ben.keld.at("notes.txt")),
            std::filesystem::last_write_time(anna.keld.at("notes.txt")));
}

TEST_F(TwoDevices, foldersAndWhatIsInThemAppear) {
  anna.keld.folder("a/b/c");
  anna.keld.write("a/b/c/deep.txt", "deep");
  anna.keld.write("a/one.txt", "1");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(ben.knowsSoon("a/b/c/deep.txt"));
  EXPECT_TRUE(ben.knowsSoon("a/one.txt"));
  EXPECT_EQ(ben.contents("a/b/c/deep.txt"), "deep");
}

TEST_F(TwoDevices, anEditReplacesADatalessDocument) {
  share("notes.txt", "old");
  anna.keld.write("notes.txt", "newer");
  ASSERT_FALSE(anna.waitForUploads("notes.txt"));
  ASSERT_TRUE(eventually([&] { return ben.status("notes.txt").size == 5; }));
  EXPECT_EQ(ben.contents("notes.txt"), "newer");
}

TEST_F(TwoDevices, anEditReplacesAPresentDocumentByItsNewContents) {
  share("notes.txt", "old");
  ASSERT_EQ(ben.contents("notes.txt"), "old");
  anna.keld.write("notes.txt", "newer");
  ASSERT_FALSE(anna.waitForUploads("notes.txt"));
  EXPECT_TRUE(eventually([&] { return ben.read("notes.txt") == "newer"; }));
  EXPECT_TRUE(eventually([&] { return ben.status("notes.txt").upload == QVUploadState::inCloud; }));
  EXPECT_EQ(ben.status("notes.txt").contents, QVContentsState::present);
}

TEST_F(TwoDevices, aRenameAndAMoveFollow) {
  anna.keld.folder("to");
  share("notes.txt", "hello");
  anna.keld.rename("notes.txt", "letter.txt");
  ASSERT_TRUE(ben.knowsSoon("letter.txt"));
  EXPECT_TRUE(ben.losesSoon("notes.txt"));
  anna.keld.rename("letter.txt", "to/letter.txt");
  ASSERT_TRUE(ben.knowsSoon("to/letter.txt"));
  EXPECT_TRUE(ben.losesSoon("letter.txt"));
  EXPECT_EQ(ben.contents("to/letter.txt"), "hello");
}

TEST_F(TwoDevices, anItemKeepsItsNumberThroughAMoveFromElsewhere) {
  share("notes.txt", "hello");
  const ItemNumber number = ben.keld.number("notes.txt");
  anna.keld.rename("notes.txt", "letter.txt");
  ASSERT_TRUE(ben.knowsSoon("letter.txt"));
  EXPECT_EQ(ben.keld.number("letter.txt"), number);
}

TEST_F(TwoDevices, aDeletionFollows) {
  anna.keld.folder("gone");
  share("gone/notes.txt", "hello");
  anna.keld.remove("gone");
  EXPECT_TRUE(ben.losesSoon("gone/notes.txt"));
  EXPECT_TRUE(ben.losesSoon("gone"));
}

TEST_F(TwoDevices, anEditOnBothSidesKeepsBoth) {
  share("notes.txt", "base");
  ASSERT_EQ(ben.contents("notes.txt"), "base");
  // Ben is away while both write.
  ben.keld.stop();
  anna.keld.write("notes.txt", "from anna");
  ASSERT_FALSE(anna.waitForUploads("notes.txt"));
  ben.keld.write("notes.txt", "from ben!");
  ben.keld.start();
  const auto conflictCopy = [](Device &device) {
    for (const auto &entry : std::filesystem::directory_iterator(device.keld.at("")))
      if (entry.path().filename().string().find("conflict, ben") != std::string::npos)
        return entry.path().filename().string();
    return std::string();
  };
  ASSERT_TRUE(eventually([&] { return !conflictCopy(ben).empty(); }));
  const std::string copy = conflictCopy(ben);
  EXPECT_EQ(ben.read(copy), "from ben!");
  EXPECT_TRUE(ben.saysSoon("notes.txt", "from anna"));
  ASSERT_TRUE(anna.knowsSoon(copy));
  EXPECT_EQ(anna.contents(copy), "from ben!");
  EXPECT_EQ(anna.read("notes.txt"), "from anna");
}

TEST_F(TwoDevices, theSameEditOnBothSidesIsNoConflict) {
  share("notes.txt", "base");
  ASSERT_EQ(ben.contents("notes.txt"), "base");
  ben.keld.stop();
  anna.keld.write("notes.txt", "same words");
  ASSERT_FALSE(anna.waitForUploads("notes.txt"));
  ben.keld.write("notes.txt", "same words");
  ben.keld.start();
  ASSERT_FALSE(ben.waitForUploads());
  EXPECT_EQ(ben.keld.namesIn("").size(), anna.keld.namesIn("").size());
  EXPECT_EQ(ben.read("notes.txt"), "same words");
}

TEST_F(TwoDevices, aDocumentDeletedThereAndEditedHereLives) {
  share("notes.txt", "base");
  ASSERT_EQ(ben.contents("notes.txt"), "base");
  ben.keld.stop();
  anna.keld.remove("notes.txt");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.write("notes.txt", "written meanwhile");
  ben.keld.start();
  ASSERT_FALSE(ben.waitForUploads());
  EXPECT_EQ(ben.read("notes.txt"), "written meanwhile");
  ASSERT_TRUE(anna.knowsSoon("notes.txt"));
  EXPECT_EQ(anna.contents("notes.txt"), "written meanwhile");
}

TEST_F(TwoDevices, twoNewDocumentsOfOneNameAreBothKept) {
  ben.keld.stop();
  anna.keld.write("plan.txt", "anna's plan");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.write("plan.txt", "ben's own plan");
  ben.keld.start();
  ASSERT_FALSE(ben.waitForUploads());
  ASSERT_TRUE(eventually([&] { return ben.keld.namesIn("").size() == anna.keld.namesIn("").size(); }));
  std::vector<std::string> found;
  for (const std::string &name : anna.keld.namesIn(""))
    if (name.find("plan") == 0) found.push_back(anna.contents(name));
  std::sort(found.begin(), found.end());
  EXPECT_EQ(found, (std::vector<std::string>{"anna's plan", "ben's own plan"}));
}

TEST_F(TwoDevices, foldersOfOneNameBecomeOne) {
  ben.keld.stop();
  anna.keld.folder("shared");
  anna.keld.write("shared/anna.txt", "a");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.folder("shared");
  ben.keld.write("shared/ben.txt", "b");
  ben.keld.start();
  ASSERT_FALSE(ben.waitForUploads());
  ASSERT_TRUE(anna.knowsSoon("shared/ben.txt"));
  EXPECT_TRUE(ben.knowsSoon("shared/anna.txt"));
}

TEST_F(TwoDevices, evictionGivesTheSpaceBackAndTheContentsComeAgain) {
  const std::string contents(100'000, 'a');
  share("notes.txt", contents);
  EXPECT_FALSE(anna.evict("notes.txt"));
  struct stat status = {};
  ASSERT_EQ(::stat(anna.keld.at("notes.txt").c_str(), &status), 0);
  EXPECT_LE(status.st_blocks, 8) << "more than what the marker takes";
  EXPECT_EQ(static_cast<std::size_t>(status.st_size), contents.size());
  EXPECT_TRUE(anna.isDataless("notes.txt"));
  // It is looked at once more, since its file has changed.
  EXPECT_TRUE(eventually([&] { return anna.status("notes.txt").upload == QVUploadState::inCloud; }));
  EXPECT_EQ(anna.contents("notes.txt"), contents);
}

TEST_F(TwoDevices, whatIsUnsentPinnedOrOpenIsNotEvicted) {
  share("notes.txt", "hello");
  const int open = ::open(anna.keld.at("notes.txt").c_str(), O_RDONLY | O_CLOEXEC);
  EXPECT_TRUE(anna.evict("notes.txt").is(QVTessalyErrorDomain, QVErrorDocumentInUse));
  ::close(open);
  EXPECT_FALSE(anna.pin("notes.txt"));
  EXPECT_TRUE(anna.status("notes.txt").isPinned);
  EXPECT_TRUE(anna.evict("notes.txt").is(QVTessalyErrorDomain, QVErrorPinned));
  EXPECT_FALSE(anna.pin("notes.txt", false));
  {
    std::ofstream(anna.keld.at("notes.txt"), std::ios::app) << " there";
    EXPECT_TRUE(anna.evict("notes.txt").is(QVTessalyErrorDomain, QVErrorUnsentChanges));
  }
  EXPECT_EQ(anna.read("notes.txt"), "hello there");
}

TEST_F(TwoDevices, anEditWithItsDatesPutBackIsNotEvicted) {
  share("notes.txt", "hello");
  const auto date = std::filesystem::last_write_time(anna.keld.at("notes.txt"));
  anna.keld.settle();
  {
    std::fstream file(anna.keld.at("notes.txt"), std::ios::in | std::ios::out);
    file << "HELLO";
  }
  std::filesystem::last_write_time(anna.keld.at("notes.txt"), date);
  EXPECT_TRUE(anna.evict("notes.txt").is(QVTessalyErrorDomain, QVErrorUnsentChanges));
  EXPECT_EQ(anna.read("notes.txt"), "HELLO");
}

TEST_F(TwoDevices, aPinnedFolderFetchesWhatComesIntoIt) {
  anna.keld.folder("kept");
  share("kept/one.txt", "1");
  EXPECT_FALSE(ben.pin("kept"));
  EXPECT_TRUE(eventually([&] { return ben.read("kept/one.txt") == "1"; }));
  anna.keld.write("kept/two.txt", "2");
  EXPECT_TRUE(eventually([&] { return ben.read("kept/two.txt") == "2"; }));
}

TEST_F(TwoDevices, linksAreLinksThereToo) {
  share("notes.txt", "hello");
  std::filesystem::create_symlink("notes.txt", anna.keld.at("link"));
  ASSERT_TRUE(ben.knowsSoon("link"));
  EXPECT_EQ(std::filesystem::read_symlink(ben.keld.at("link")), "notes.txt");
}

TEST_F(TwoDevices, aLargeDocumentGoesThereAndBack) {
  std::string large(9 << 20, 'x');
  for (std::size_t index = 0; index < large.size(); index += 4099)
    large[index] = static_cast<char>(index % 251);
  share("large.bin", large);
  EXPECT_EQ(ben.contents("large.bin"), large);
}

TEST_F(TwoDevices, anEmptyDocumentIsPresentEverywhere) {
  share("empty", "");
  EXPECT_EQ(ben.status("empty").contents, QVContentsState::present);
  EXPECT_EQ(ben.contents("empty"), "");
}

TEST_F(TwoDevices, namesThatAreHardToWriteArriveAsTheyAre) {
  const std::vector<std::string> names{std::string(255, 'n'), "line\nbreak", "e\xCC\x81 and \xC3\xA9",
                                       "\xFF\xFE bytes", " spaces . "};
  for (const std::string &name : names) anna.keld.write(name, name);
  ASSERT_FALSE(anna.waitForUploads());
  for (const std::string &name : names) {
    ASSERT_TRUE(ben.knowsSoon(name)) << name;
    EXPECT_EQ(ben.contents(name), name);
  }
}

}  // namespace
}  // namespace droxa::keld
