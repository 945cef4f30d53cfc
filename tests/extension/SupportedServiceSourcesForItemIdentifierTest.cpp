#include <filesystem>
#include <gtest/gtest.h>

#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

constexpr char kShareOperations[] = "com.quorva.Tessaly.private.SharingOperation";
const Lines kOfDocuments{kShareOperations, "com.quorva.PlendaCollaboration", "com.quorva.Tessaly.SharingV1"};
const Lines kOfFolders{kShareOperations, "com.quorva.Tessaly.SharingV1"};

class SupportedServiceSources : public ExtensionTest {
 protected:
  // The names of the services on the item.
  Lines names(const std::string &identifier) {
    NSError untouched("Domain", 1);
    Lines names;
    for (const auto &source : extension->supportedServiceSourcesForItemIdentifier(identifier, &untouched))
      names.push_back(source->serviceName());
    EXPECT_TRUE(untouched.is("Domain", 1));
    return names;
  }
  // What was logged about services, without the lines of the lookups on the way.
  Lines serviceLines() const {
    Lines lines;
    for (const std::string &line : logged())
      if (line.find("shar") != std::string::npos || line.find("alias file key") != std::string::npos)
        lines.push_back(line);
    return lines;
  }
  // A document at a path of the replica; its file is made by the test.
  std::string addDocument(const std::string &name, std::string *identifier) {
    *identifier = daemon.addDocument(name).asString();
    const std::string path = daemon.url(name).path();
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    return path;
  }

  const std::shared_ptr<QVFileProviderExtension> extension = makeExtension();
};

TEST_F(SupportedServiceSources, anyOtherIdentifierHasTheShareOperationsAlone) {
  for (const std::string &identifier :
       {std::string(NSFileProviderRootContainerItemIdentifier),
        std::string(NSFileProviderWorkingSetContainerItemIdentifier), std::string("x7"), std::string()}) {
    EXPECT_EQ(names(identifier), Lines{kShareOperations}) << identifier;
  }
  EXPECT_EQ(asked(), Lines()) << "nobody needs the daemon for that";
  EXPECT_EQ(serviceLines(), Lines());
}

TEST_F(SupportedServiceSources, aDocumentIsOfferedWithoutAnyLine) {
  std::string identifier;
  std::ofstream(addDocument("a.txt", &identifier)) << "contents";
  EXPECT_EQ(names(identifier), kOfDocuments);
  EXPECT_EQ(serviceLines(), Lines());
}

TEST_F(SupportedServiceSources, anAliasIsNotShared) {
  std::string identifier;
  const std::string path = addDocument("link", &identifier);
  std::filesystem::create_symlink("/nowhere", path);
  EXPECT_EQ(names(identifier), Lines{kShareOperations});
  EXPECT_EQ(serviceLines(),
            Lines{"debug: [DEBUG] Not allowing sharing of " + path + " because it's a rovan bookmark"});
}

TEST_F(SupportedServiceSources, aDocumentWhoseFileCantBeLookedAtIsToldOfAndOfferedAllTheSame) {
  std::string identifier;
  const std::string path = addDocument("gone.txt", &identifier);
  EXPECT_EQ(names(identifier), kOfDocuments);
  const Lines lines = serviceLines();
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_EQ(lines[0].find("error: [ERROR] Failed to get alias file key at " + path + " - Error Domain="), 0U)
      << lines[0];
}

TEST_F(SupportedServiceSources, aDocumentThatDoesntExistIsToldOf) {
  EXPECT_EQ(names("d4711"), kOfDocuments);
  ASSERT_EQ(serviceLines().size(), 1U);
  EXPECT_EQ(serviceLines()[0].find("error: [ERROR] Failed to get alias file key at  - Error Domain="), 0U);
}

TEST_F(SupportedServiceSources, aFolderIsAskedOfTheDaemon) {
  const QVFileObjectID folder = daemon.addFolder("Plans");
  EXPECT_EQ(names(folder.asString()), kOfFolders);
  EXPECT_EQ(asked(), Lines{"checkIfItemIsShareableWithInode(" + std::to_string(folder.number()) + ")"});
  EXPECT_EQ(serviceLines(), Lines());
}

TEST_F(SupportedServiceSources, aFolderThatIsNotShareableIsWarnedOf) {
  FakeSharing::Answers answers;
  answers.isShareable = false;
  daemon.sharing().setAnswers(answers);
  EXPECT_EQ(names("i5"), Lines{kShareOperations});
  EXPECT_EQ(serviceLines(), Lines{"default: [WARNING] i5 is not shareable - (null)"});

  clear();
  answers.notShareable = NSError("Domain", 3);
  daemon.sharing().setAnswers(answers);
  EXPECT_EQ(names("i5"), Lines{kShareOperations});
  EXPECT_EQ(serviceLines(),
            Lines{"default: [WARNING] i5 is not shareable - " + answers.notShareable.description()});
}

TEST_F(SupportedServiceSources, aDaemonThatCantBeReachedMakesAFolderNotShareable) {
  const NSError lost(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  fake.connection->setUnreachable(lost);
  EXPECT_EQ(names("i5"), Lines{kShareOperations});
  EXPECT_EQ(serviceLines(), Lines{"default: [WARNING] i5 is not shareable - " + lost.description()});
}

TEST_F(SupportedServiceSources, eachAskingMakesSourcesOfItsOwn) {
  NSError error;
  const auto first = extension->supportedServiceSourcesForItemIdentifier("x", &error);
  EXPECT_NE(first, extension->supportedServiceSourcesForItemIdentifier("x", &error));
}

}  // namespace
}  // namespace droxa
