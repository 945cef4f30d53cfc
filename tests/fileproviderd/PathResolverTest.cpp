#include <filesystem>
#include <gtest/gtest.h>

#include "fileproviderd/PathResolver.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

constexpr char kRoot[] = "com.quorva.Tessaly.default";

class PathResolverTest : public ::testing::Test {
 protected:
  PathResolverTest() {
    replica =
        (std::filesystem::path(::testing::TempDir()) / ("replica-" + std::to_string(getpid()))).native();
    std::filesystem::remove_all(replica);
    addContainer(NSFileProviderRootContainerItemIdentifier, kRoot, "Drive");
    resolver = std::make_unique<PathResolver>(
        std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension)), replica);
  }
  ~PathResolverTest() override { std::filesystem::remove_all(replica); }

  std::string documents(const std::string &container) {
    return replica + "/" + container + (container == "com.quorva.Tessaly.trash" ? "/files" : "/Documents");
  }
  void addContainer(const std::string &identifier, const std::string &container, const std::string &name) {
    std::filesystem::create_directories(documents(container));
    NSFileProviderItemFields fields;
    fields.filename = name;
    extension->add(identifier, documents(container), fields);
  }
  void add(const std::string &identifier, const std::string &path, const std::string &container = kRoot) {
    extension->add(identifier, documents(container) + "/" + path, {});
  }
  // The identifier at the path, else the code of the error.
  std::string at(const std::string &path) {
    NSError error;
    const auto item = resolver->itemAtPath(path, &error);
    return item ? item->itemIdentifier() : std::to_string(error.code());
  }

  std::string replica;
  std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  std::unique_ptr<PathResolver> resolver;
};

TEST_F(PathResolverTest, theRootHasManyNames) {
  for (const char *path : {"/", "", ".", "//", "/a/..", "/../.."})
    EXPECT_EQ(at(path), NSFileProviderRootContainerItemIdentifier) << path;
}

TEST_F(PathResolverTest, pathsLeadToTheItemsOfTheRoot) {
  add("d1", "a.txt");
  add("d2", "folder/b.txt");
  EXPECT_EQ(at("a.txt"), "d1");
  EXPECT_EQ(at("/a.txt"), "d1");
  EXPECT_EQ(at("folder//./b.txt"), "d2");
  EXPECT_EQ(at("other/../folder/b.txt"), "d2");
}

TEST_F(PathResolverTest, theFirstComponentMayNameAContainer) {
  addContainer("i5", "org.example.notes", "Notes");
  add("d9", "inner/n.txt", "org.example.notes");
  add("i8", "inner", "org.example.notes");
  EXPECT_EQ(at("Notes"), "i5");
  EXPECT_EQ(at("/Notes/inner/n.txt"), "d9");
  EXPECT_EQ(at("inner/Notes"), "-1005");
}

TEST_F(PathResolverTest, aContainerThatAppearsLaterIsFound) {
  EXPECT_EQ(at("Late"), "-1005");
  addContainer("i6", "org.example.late", "Late");
  EXPECT_EQ(at("Late"), "i6");
  std::filesystem::remove_all(replica + "/org.example.late");
  EXPECT_EQ(at("Late"), "-1005");
}

TEST_F(PathResolverTest, theTrashIsAContainerToo) {
  addContainer("i7", "com.quorva.Tessaly.trash", ".Trash");
  add("d3", "gone.txt", "com.quorva.Tessaly.trash");
  EXPECT_EQ(at(".Trash/gone.txt"), "d3");
}

TEST_F(PathResolverTest, absolutePathsOfTheReplicaAreTakenAsTheyAre) {
  add("d1", "a.txt");
  EXPECT_EQ(at(documents(kRoot) + "/a.txt"), "d1");
  EXPECT_EQ(at(replica + "/no/such"), "-1005");
}

TEST_F(PathResolverTest, anAliasIsItselfAtItsPathAndAWayToWhatIsBelowItsTarget) {
  addContainer("i5", "org.example.notes", "Notes");
  add("i8", "inner", "org.example.notes");
  add("d9", "inner/n.txt", "org.example.notes");
  add("i3", "link");
  // By its identifier the alias is its target.
  extension->paths["i3"] = documents("org.example.notes") + "/inner";
  extension->items["i3"] = extension->items["i8"];
  NSError error;
  const auto alias = resolver->itemAtPath("link", &error);
  ASSERT_TRUE(alias) << error.description();
  EXPECT_EQ(alias->itemIdentifier(), "i3");
  EXPECT_EQ(alias->fields().filename, "link");
  EXPECT_EQ(alias->fields().kind, NSFileProviderItemKind::alias);
  EXPECT_EQ(alias->fields().parentItemIdentifier, NSFileProviderRootContainerItemIdentifier);
  EXPECT_EQ(at("link/n.txt"), "d9");
}

TEST_F(PathResolverTest, namesOfAnyBytesPass) {
  add("d4", "new\nline");
  add("d5", "\xff\xfe");
  add("d6", "..almost");
  EXPECT_EQ(at("new\nline"), "d4");
  EXPECT_EQ(at("\xff\xfe"), "d5");
  EXPECT_EQ(at("..almost"), "d6");
  EXPECT_EQ(at(std::string("a\0b", 3)), "-1005");
}

TEST_F(PathResolverTest, whatIsMissingIsNamed) {
  NSError error;
  EXPECT_FALSE(resolver->itemAtPath("no/such", &error));
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_EQ(error.localizedDescription(), "there is no item at no/such");
}

TEST_F(PathResolverTest, withoutARootTheReasonIsTold) {
  extension->paths.clear();
  extension->items.clear();
  EXPECT_EQ(at("a.txt"), std::to_string(NSFileProviderErrorServerUnreachable));
  extension->failure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated);
  EXPECT_EQ(at("a.txt"), std::to_string(NSFileProviderErrorNotAuthenticated));
}

TEST_F(PathResolverTest, aPathInTheRootTakesOneQuestionForItsIdentifier) {
  add("d1", "a.txt");
  at("a.txt");
  EXPECT_EQ(extension->asked.take(), std::string("url ") + NSFileProviderRootContainerItemIdentifier);
  EXPECT_EQ(extension->asked.take(), "identifier " + documents(kRoot) + "/a.txt");
  EXPECT_EQ(extension->asked.take(), "item d1");
  EXPECT_EQ(extension->asked.size(), 0U);
}

}  // namespace
}  // namespace droxa::testing
