#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

using FPCreateSubFolder = OperationsOnFileSystems;
INSTANTIATE_TEST_SUITE_P(On, FPCreateSubFolder, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(FPCreateSubFolder, makesIt) {
  EXPECT_EQ(create(url(""), "🚀 new").url, url("🚀 new"));
  EXPECT_TRUE(fs::is_directory(path("🚀 new")));
}

TEST_P(FPCreateSubFolder, whereSomethingIsCollides) {
  write("a", "");
  makeFolder("b");
  fs::create_symlink("nowhere", path("link"));
  write(".c.promise", "stands for c");
  for (const std::string name : {"a", "b", "link", "c"}) expectCollision(create(url(""), name), url(name));
  EXPECT_EQ(names(), (std::vector<std::string>{".c.promise", "a", "b", "link"}));
}

TEST_P(FPCreateSubFolder, refusesWhatIsNoName) {
  for (const std::string &name :
       {std::string(), std::string(".."), std::string("a/b"), std::string(256, 'x')}) {
    const Answer answer = create(url(""), name);
    EXPECT_TRUE(answer.is(NSFileWriteInvalidFileNameError)) << answer.error.description();
  }
  EXPECT_TRUE(names().empty());
}

TEST_P(FPCreateSubFolder, withoutAParentIsNoSuchFile) {
  write("a", "");
  for (const NSURL &parent : {url("missing"), url("a"), NSURL()}) {
    EXPECT_TRUE(create(parent, "b").is(NSFileNoSuchFileError));
  }
}

TEST_P(FPCreateSubFolder, oneOfManyMakersMakesIt) {
  std::atomic<int> made = 0;
  std::vector<std::future<void>> answers;
  for (int i = 0; i < 20; ++i) {
    const auto answer = std::make_shared<std::promise<void>>();
    answers.push_back(answer->get_future());
    operations->createSubFolder(url(""), "a", [&made, answer](const NSURL &newURL, const NSError &) {
      if (newURL) ++made;
      answer->set_value();
    });
  }
  for (auto &answer : answers) answer.get();
  EXPECT_EQ(made, 1);
}

}  // namespace
}  // namespace droxa
