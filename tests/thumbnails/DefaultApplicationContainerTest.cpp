#include <sys/stat.h>
#include <unistd.h>

#include "additions/NSError+QVFPAdditions.h"
#include "platform/entitlements/EntitlementFiles.h"
#include "tessaly/QVErrors.h"
#include "tests/thumbnails/ThumbnailsFixture.h"

namespace droxa {
namespace {

constexpr char kWriter[] = "org.example.Writer";
using Item = std::shared_ptr<const NSFileProviderItem>;

class DefaultApplicationContainer : public ThumbnailsTest {
 protected:
  DefaultApplicationContainer() {
    std::filesystem::create_directories(folder);
    ::chmod(folder.c_str(), 0755);
    EntitlementFiles::setProcessFiles(EntitlementFiles(folder, getuid()));
  }
  ~DefaultApplicationContainer() override {
    EntitlementFiles::setProcessFiles(EntitlementFiles("/etc/droxa/entitlements.d", 0));
  }
  // As Flatpak exports it.
  void installWriter() const {
    std::filesystem::create_directories(share + "/applications");
    std::ofstream(share + "/applications/" + kWriter + ".desktop")
        << "[Desktop Entry]\nType=Application\nName=Writer\nExec=flatpak run " << kWriter
        << "\nX-Flatpak=" << kWriter << "\n";
  }
  void entitle(const std::string &values) const {
    const std::string file = folder + "/writer.json";
    std::ofstream(file) << R"({"applications": [{"flatpak": ")" << kWriter << R"(", "values": )" << values
                        << "}]}";
    ::chmod(file.c_str(), 0644);
  }
  std::tuple<Item, NSError> find(const std::optional<std::string> &bundle) {
    clear();
    const Once<Item, NSError> done("completion");
    extension->_defaultApplicationContainerForBundleIdentifier(bundle, done.completion());
    return done.values();
  }
  static Lines opening(const std::string &bundle) {
    return {"debug: [DEBUG] ┏<1> lookup for default location of " + bundle};
  }

  const std::string folder = home.path() + "/entitlements";
};

TEST_F(DefaultApplicationContainer, withoutAnApplicationItIsTheTopLevelDocumentsFolder) {
  for (const std::optional<std::string> &bundle : {std::optional<std::string>(), {"com.quorva.Filmont"}}) {
    std::filesystem::create_directories(daemon.url("").path());
    find(bundle);
    EXPECT_EQ(count("debug: [DEBUG] creating default Documents folder"), 1U);
    EXPECT_EQ(
        count("creating directory Documents under " + std::string(NSFileProviderRootContainerItemIdentifier)),
        1U);
    EXPECT_EQ(logged()[0], opening(bundle.value_or("(null)"))[0]);
    EXPECT_EQ(daemon.log().count("getContainerURLForID"), 0U);
  }
}

TEST_F(DefaultApplicationContainer, anUnknownApplicationIsAnInvalidParameter) {
  const auto [item, error] = find("org.example.Nobody");
  EXPECT_FALSE(item);
  EXPECT_EQ(error, qv_fileProviderError(qvc_errorInvalidParameter("bundleIdentifier", "org.example.Nobody")));
  EXPECT_EQ(logged(),
            (Lines{opening("org.example.Nobody")[0],
                   "error: [ERROR] can't find bundle with id 'org.example.Nobody'", "debug: [DEBUG] ┗<1> "}));
}

TEST_F(DefaultApplicationContainer, anApplicationThatIsNotEntitledIsRefused) {
  installWriter();
  const auto [item, error] = find(kWriter);
  EXPECT_FALSE(item);
  EXPECT_EQ(error, NSError(QVTessalyErrorDomain, 1));
  EXPECT_EQ(logged(), (Lines{opening(kWriter)[0],
                             "debug: [DEBUG] bundle 'org.example.Writer' is not entitled to used Droxa Drive",
                             "debug: [DEBUG] ┗<1> "}));
}

TEST_F(DefaultApplicationContainer, otherEntitlementsAreNoReason) {
  installWriter();
  entitle(R"({"com.quorva.Tessaly.sharing-proxy": true, "application-identifier": "org.example.Writer"})");
  EXPECT_EQ(std::get<1>(find(kWriter)), NSError(QVTessalyErrorDomain, 1));
}

TEST_F(DefaultApplicationContainer, ofSeveralContainersItIsTheFirst) {
  installWriter();
  daemon.addContainer("org.example.Second");
  daemon.addContainer(kWriter);
  entitle(R"({"com.quorva.developer.droxa-services": ["CloudDocuments"],
              "com.quorva.developer.ubiquity-container-identifiers": ["org.example.Third"],
              "com.quorva.developer.droxa-container-identifiers": ["org.example.Second", "org.example.Writer"]})");
  const auto [item, error] = find(kWriter);
  ASSERT_TRUE(item) << error.description();
  EXPECT_EQ(item->itemIdentifier(), daemon.identifier(documentsOf("org.example.Second")).asString());
  EXPECT_EQ(error, NSError());
  EXPECT_EQ(daemon.log().count("getContainerURLForID(org.example.Second, recreate 1)"), 1U);
}

TEST_F(DefaultApplicationContainer, theDaemonsErrorIsTranslated) {
  installWriter();
  entitle(R"({"com.quorva.developer.ubiquity-container-identifiers": ["org.example.Writer"]})");
  const NSError refused = qvc_errorLoggedOut();
  daemon.replies().failNext("getContainerURLForID", refused);
  const auto [item, error] = find(kWriter);
  EXPECT_FALSE(item);
  EXPECT_EQ(error, qv_fileProviderError(refused));
}

TEST_F(DefaultApplicationContainer, aDaemonThatCannotBeReachedIsToldAsItStands) {
  installWriter();
  entitle(R"({"com.quorva.developer.ubiquity-container-identifiers": ["org.example.Writer"]})");
  const NSError gone(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  daemon.replies().failNextInTransport("getContainerURLForID", gone);
  const auto [item, error] = find(kWriter);
  EXPECT_FALSE(item);
  EXPECT_TRUE(error.isSameObject(gone) || error == gone);
}

}  // namespace
}  // namespace droxa
