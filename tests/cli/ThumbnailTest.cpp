#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>

#include "platform/fileprovider/FPDThumbnailStream.h"
#include "platform/foundation/ReadFile.h"
#include "platform/imaging/PNGImage.h"
#include "tests/cli/ActionsFixture.h"
#include "tests/support/ScratchHome.h"

namespace droxa::testing {
namespace {

using Json = nlohmann::json;
namespace fs = std::filesystem;

NSData picture(std::uint32_t width, std::uint32_t height) {
  return PNGImage(width, height, std::vector<std::uint8_t>(std::size_t{width} * height * 4, 9)).file();
}

class ScriptedThumbnails final : public FPDThumbnails {
 public:
  void nextWithReply(FPDThumbnailsReply reply) override { stream.next(std::move(reply)); }
  void getProgress(FPDProgressCompletion completion) override { completion(0, -1); }
  void cancel() override {
    wasCancelled = true;
    stream.abandon(NSError(NSCocoaErrorDomain, NSUserCancelledError));
  }
  FPDThumbnailStream stream;
  std::atomic<bool> wasCancelled{false};
};

class ThumbnailCommand : public ActionsTest {
 protected:
  ThumbnailCommand() {
    options.folder = scratch.root() + "/out";
    host->listings["i2"] = {{item("d3", "b.txt"), folder("i7", "below"), item("d4", "c.txt")}};
    host->fetchThumbnails = [this](const std::vector<std::string> &identifiers, CGSize size) {
      requests.push_back({identifiers, size});
      auto thumbnails = std::make_shared<ScriptedThumbnails>();
      for (const std::string &identifier : identifiers) {
        const auto found = answers.find(identifier);
        thumbnails->stream.add(
            found == answers.end()
                ? FPDThumbnail{identifier, picture(100, 50), std::nullopt, {}}
                : FPDThumbnail{identifier, found->second.imageData, std::nullopt, found->second.error});
      }
      if (ends) thumbnails->stream.end(outcome);
      last = thumbnails;
      return thumbnails;
    };
  }
  int thumbnail(const Words &arguments) {
    options.arguments = arguments;
    return run([&](CommandContext &made) { return runThumbnail(made, options); });
  }
  std::optional<PNGImage> written(const std::string &name) const {
    return PNGImage::read(NSData::dataWithString(ReadFile(options.folder + "/" + name, 1 << 20).bytes),
                          nullptr);
  }
  bool shows(const std::string &words) const { return out.str().find(words) != std::string::npos; }

  const ScratchHome scratch;
  ThumbnailOptions options;
  struct Request {
    std::vector<std::string> identifiers;
    CGSize size;
  };
  std::vector<Request> requests;
  std::map<std::string, FPDThumbnail> answers;
  NSError outcome;
  bool ends = true;
  std::shared_ptr<ScriptedThumbnails> last;
};

TEST_F(ThumbnailCommand, writesAPictureNamedAfterTheDocument) {
  EXPECT_EQ(thumbnail({"a.txt"}), 0) << err.str();
  ASSERT_TRUE(written("a.txt.png"));
  EXPECT_EQ(written("a.txt.png")->width(), 100U);
  EXPECT_TRUE(
      shows("a.txt: " + options.folder + "/a.txt.png (100 x 50)\n1 of 1 document has a thumbnail in "))
      << out.str();
  ASSERT_EQ(requests.size(), 1U);
  EXPECT_EQ(requests[0].size, (CGSize{256, 256}));
}

TEST_F(ThumbnailCommand, scalesDownToTheSize) {
  options.size = 10;
  EXPECT_EQ(thumbnail({"a.txt"}), 0);
  EXPECT_EQ(written("a.txt.png")->width(), 10U);
  EXPECT_EQ(written("a.txt.png")->height(), 5U);
}

TEST_F(ThumbnailCommand, aFolderStandsForTheDocumentsInItAndEachIsAskedForOnce) {
  EXPECT_EQ(thumbnail({"in", "in/b.txt"}), 0) << err.str();
  ASSERT_EQ(requests.size(), 1U);
  EXPECT_EQ(requests[0].identifiers, (std::vector<std::string>{"d3", "d4"}));
  EXPECT_TRUE(written("b.txt.png"));
  EXPECT_TRUE(written("c.txt.png"));
}

TEST_F(ThumbnailCommand, nothingIsWrittenOver) {
  fs::create_directories(options.folder);
  std::ofstream(options.folder + "/a.txt.png") << "somebody's";
  EXPECT_EQ(thumbnail({"a.txt"}), 0);
  EXPECT_EQ(ReadFile(options.folder + "/a.txt.png", 100).bytes, "somebody's");
  EXPECT_TRUE(written("a.txt 2.png"));
  std::size_t files = 0;
  for (const auto &entry : fs::directory_iterator(options.folder)) files += entry.is_regular_file();
  EXPECT_EQ(files, 2U);
}

TEST_F(ThumbnailCommand, saysWhichHaveNoneAndWhy) {
  answers["d3"] = {};
  answers["d4"].error = NSError::errorWithPOSIXCode(EIO, "it broke");
  EXPECT_NE(thumbnail({"in", "a.txt"}), 0);
  EXPECT_TRUE(shows("b.txt: no thumbnail: the cloud has no thumbnail of it")) << out.str();
  EXPECT_TRUE(shows("c.txt: no thumbnail: ")) << out.str();
  EXPECT_TRUE(shows("1 of 3 documents have a thumbnail")) << out.str();
}

TEST_F(ThumbnailCommand, oneThatJustHasNoneIsNoFailure) {
  answers["d1"] = {};
  EXPECT_EQ(thumbnail({"a.txt"}), 0);
}

TEST_F(ThumbnailCommand, whatIsNoPictureIsNotWritten) {
  answers["d1"].imageData = NSData::dataWithString("no picture");
  EXPECT_NE(thumbnail({"a.txt"}), 0);
  EXPECT_TRUE(fs::is_empty(options.folder));
}

TEST_F(ThumbnailCommand, printsJSON) {
  options.json = true;
  answers["d3"] = {};
  EXPECT_EQ(thumbnail({"in"}), 0);
  std::istringstream lines(out.str());
  std::string line;
  ASSERT_TRUE(std::getline(lines, line));
  EXPECT_EQ(Json::parse(line)["identifier"], "d3");
  EXPECT_TRUE(Json::parse(line)["file"].is_null());
  ASSERT_TRUE(std::getline(lines, line));
  EXPECT_EQ(Json::parse(line)["file"], options.folder + "/c.txt.png");
  EXPECT_EQ(Json::parse(line)["width"], 100);
  EXPECT_FALSE(std::getline(lines, line));
}

TEST_F(ThumbnailCommand, manyAreAskedForInBatches) {
  std::vector<NSFileProviderItemFields> page;
  for (int i = 0; i < 501; ++i) page.push_back(item("d" + std::to_string(100 + i), "n" + std::to_string(i)));
  host->listings["i2"] = {page};
  EXPECT_EQ(thumbnail({"in"}), 0) << err.str();
  ASSERT_EQ(requests.size(), 2U);
  EXPECT_EQ(requests[0].identifiers.size(), 500U);
  EXPECT_EQ(requests[1].identifiers.size(), 1U);
}

TEST_F(ThumbnailCommand, whatIsMissingIsNamedAndTheOthersAreWritten) {
  EXPECT_EQ(thumbnail({"nowhere", "a.txt"}), 66);
  EXPECT_TRUE(said("nowhere: there is no such item")) << err.str();
  EXPECT_TRUE(written("a.txt.png"));
}

TEST_F(ThumbnailCommand, aFolderThatCannotBeMadeIsNamed) {
  options.folder = "/dev/null/out";
  EXPECT_NE(thumbnail({"a.txt"}), 0);
  EXPECT_TRUE(said("/dev/null/out")) << err.str();
  EXPECT_TRUE(requests.empty());
}

TEST_F(ThumbnailCommand, controlCCancels) {
  ends = false;
  answers["d1"] = {};
  stop = [] { return true; };
  EXPECT_EQ(thumbnail({"a.txt"}), 130);
  ASSERT_TRUE(last);
  EXPECT_TRUE(last->wasCancelled);
}

TEST_F(ThumbnailCommand, theDesktopsCacheIsFilledByTheHost) {
  options.fillsCache = true;
  EXPECT_EQ(thumbnail({"in", "/"}), 0) << err.str();
  EXPECT_EQ(host->filled, (std::vector<std::string>{"i2", kRoot}));
  EXPECT_NE(thumbnail({"a.txt"}), 0);
  EXPECT_TRUE(said("a.txt: ")) << err.str();
}

class DefaultFolderCommand : public ActionsTest {
 protected:
  DefaultFolderCommand() {
    host->urls["i2"] = "/replica/in";
    host->defaultContainer = [this](const std::optional<std::string> &application,
                                    const NSFileProviderItemCompletion &completion) {
      asked = application.value_or("nil");
      if (failure) return completion(nullptr, failure);
      completion(std::make_shared<NSFileProviderPlainItem>(folder("i2", "in")), NSError());
    };
  }
  int defaultFolder(const std::optional<std::string> &application, bool json = false) {
    return run([&](CommandContext &made) { return runDefaultFolder(made, application, json); });
  }
  std::string asked;
  NSError failure;
};

TEST_F(DefaultFolderCommand, printsWhereItIs) {
  EXPECT_EQ(defaultFolder(std::nullopt), 0) << err.str();
  EXPECT_EQ(asked, "nil");
  EXPECT_EQ(out.str(), "/replica/in\n");
}

TEST_F(DefaultFolderCommand, printsJSON) {
  EXPECT_EQ(defaultFolder("org.example.Writer", true), 0);
  EXPECT_EQ(asked, "org.example.Writer");
  EXPECT_EQ(Json::parse(out.str()), (Json{{"identifier", "i2"}, {"name", "in"}, {"path", "/replica/in"}}));
}

TEST_F(DefaultFolderCommand, anApplicationWithoutAnEntitlementIsToldWhoGrantsOne) {
  failure = NSError("QVTessalyErrorDomain", 1);
  EXPECT_EQ(defaultFolder("org.example.Writer"), 1);
  EXPECT_TRUE(said("org.example.Writer: it is not entitled")) << err.str();
}

TEST_F(DefaultFolderCommand, anUnknownApplicationIsToldWhatIsMissing) {
  failure = NSError("QVTessalyErrorDomain", 22);
  EXPECT_EQ(defaultFolder("org.example.Writer"), 1);
  EXPECT_TRUE(said("org.example.Writer.desktop")) << err.str();
}

TEST_F(DefaultFolderCommand, otherErrorsAreExplainedAsAlways) {
  failure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);
  EXPECT_NE(defaultFolder("org.example.Writer"), 0);
  EXPECT_TRUE(said("org.example.Writer: ")) << err.str();
}

}  // namespace
}  // namespace droxa::testing
