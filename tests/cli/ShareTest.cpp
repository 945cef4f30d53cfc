// `droxa share` with scripted services, reached through real listeners as those of the extension are.

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "cli/CommandLine.h"
#include "cli/Share.h"
#include "cli/ShareText.h"
#include "platform/cloudkit/CKError.h"
#include "tessaly/QVCClientPrivilegesDescriptor.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"
#include "tests/cli/ActionsFixture.h"
#include "tests/sharing/Entitled.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/ScratchHome.h"
#include "tests/support/ScriptedSharingService.h"

namespace droxa::testing {
namespace {

using Json = nlohmann::json;
using Permission = CKShareParticipantPermission;

// A service at a listener of its own, for as long as it is held.
class ListeningService final : public FPDService {
 public:
  class Delegate final : public NSXPCListenerDelegate {
   public:
    std::function<void(NSXPCConnection &)> exportObject;
    bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &,
                                           const std::shared_ptr<NSXPCConnection> &connection) override {
      exportObject(*connection);
      connection->resume();
      return true;
    }
  };
  explicit ListeningService(std::function<void(NSXPCConnection &)> exportObject) {
    delegate_->exportObject = std::move(exportObject);
    listener_->setDelegate(delegate_);
    listener_->resume();
  }
  ~ListeningService() override { listener_->invalidate(); }
  NSXPCListenerEndpoint endpoint() const override { return listener_->endpoint(); }

 private:
  const std::shared_ptr<Delegate> delegate_ = std::make_shared<Delegate>();
  const std::shared_ptr<NSXPCListener> listener_ = NSXPCListener::anonymousListener(nullptr);
};

template <class Protocol>
std::shared_ptr<FPDService> listening(const NSXPCInterface &interface, std::shared_ptr<Protocol> object) {
  return std::make_shared<ListeningService>([&interface, object](NSXPCConnection &connection) {
    connection.setExportedObject<Protocol>(interface, object);
  });
}

CKShareParticipant participant(const std::string &account, CKShareParticipantRole role,
                               Permission permission = Permission::readOnly) {
  CKShareParticipant one;
  one.userIdentity = {account, "", account + "@example.org"};
  one.role = role;
  one.permission = permission;
  return one;
}

// The document "a.txt" (d1), shared by vera with bob; the folder "in" (i2) through the share operations.
class ShareCommand : public ActionsTest {
 protected:
  ShareCommand() {
    stop = [] { return false; };
    service->share = shared();
    service->savesShare = true;
    host->services["com.quorva.Tessaly.SharingV1"] = [this](const std::string &identifier) {
      askedFor.push_back(identifier);
      return listening<QVSharingService>(getSharingServiceInterface(), service);
    };
    host->services["com.quorva.Tessaly.private.SharingOperation"] = [this](const std::string &) {
      return listening<QVShareOperationProtocol>(QVCXPCSharingOperationInterface(), fake.daemon);
    };
    host->urls["i2"] = "/replica/in";
    daemon = fake.connection;
  }
  static CKShare shared() {
    CKShare share = CKShare::shareWithRootRecordID({"root", {"zone"}});
    share.recordChangeTag = "tag";
    share.URL = NSURL::URLWithString("https://drive.example/s/1");
    share.fields[CKShareTitleKey] = std::string("Plans");
    share.participants = {participant("vera", CKShareParticipantRole::owner),
                          participant("bob", CKShareParticipantRole::privateUser)};
    return share;
  }
  static CKShare unshared() {
    CKShare share = shared();
    share.recordChangeTag = "";
    share.participants.clear();
    return share;
  }
  void foldersShareIs(const std::optional<CKShare> &share) const {
    FakeSharing::Answers answers;
    answers.share = share;
    answers.url = NSURL::URLWithString("https://drive.example/s/2");
    answers.participants = QVShareParticipants({participant("eve", CKShareParticipantRole::privateUser)});
    fake.daemon->sharing().setAnswers(answers);
  }
  int with(const std::function<int(CommandContext &, const ShareArguments &)> &command,
           const std::string &item = "a.txt", bool json = false) {
    return run([&](CommandContext &made) { return command(made, ShareArguments{item, json}); });
  }
  int add(const Words &names, const std::string &item = "a.txt") {
    return with(
        [&](auto &made, const auto &arguments) {
          return runShareAdd(made, arguments, names, Permission::readWrite);
        },
        item);
  }
  int permit(const std::optional<std::string> &name, Permission permission) {
    return with([&](auto &made, const auto &arguments) {
      return runSharePermission(made, arguments, name, permission);
    });
  }
  int remove(const std::optional<std::string> &name, const std::string &item = "a.txt") {
    return with([&](auto &made, const auto &arguments) { return runShareRemove(made, arguments, name); },
                item);
  }
  // Refuses the operations to this program.
  void refusePrivilege(const char *call, const std::string &privilege = "isSharingProxyEntitled") {
    fake.daemon->replies().failNext(call,
                                    qvc_error(QVErrorPrivilegeRequired, privilege + " privilege required"));
  }

  const ScratchHome home;
  const FakeDaemonScope fake;
  const std::shared_ptr<ScriptedSharingService> service = std::make_shared<ScriptedSharingService>();
  Words askedFor;
};

TEST_F(ShareCommand, showsWithWhomAndHowADocumentIsShared) {
  EXPECT_EQ(with(runShareShow), 0) << err.str();
  EXPECT_EQ(out.str(),
            "a.txt: shared\n"
            "  link      https://drive.example/s/1\n"
            "  title     Plans\n"
            "  everyone  none\n"
            "  vera (vera@example.org): owner\n"
            "  bob (bob@example.org): read-only, invited, not accepted yet\n");
  EXPECT_EQ(askedFor, Words{"d1"});
}

TEST_F(ShareCommand, jsonHasTheSame) {
  EXPECT_EQ(with(runShareShow, "a.txt", true), 0) << err.str();
  const Json object = Json::parse(out.str());
  EXPECT_EQ(object["item"], "a.txt");
  EXPECT_EQ(object["shared"], true);
  EXPECT_EQ(object["link"], "https://drive.example/s/1");
  EXPECT_EQ(object["everyone"], "none");
  EXPECT_EQ(object["folder"], nullptr);
  EXPECT_EQ(object["participants"][1]["account"], "bob");
  EXPECT_EQ(object["participants"][1]["permission"], "read-only");
  EXPECT_EQ(object["participants"][1]["status"], "not accepted yet");
  service->share = unshared();
  EXPECT_EQ(with(runShareShow, "a.txt", true), 0);
  EXPECT_EQ(Json::parse(out.str()), Json::parse(R"({"item": "a.txt", "shared": false})"));
}

TEST_F(ShareCommand, whatIsntSharedIsSaidSo) {
  service->share = unshared();
  EXPECT_EQ(with(runShareShow), 0);
  EXPECT_EQ(out.str(), "a.txt: not shared\n");
  for (const auto &command : {runShareLink, runShareParticipants}) {
    EXPECT_EQ(with(command), 1);
    EXPECT_TRUE(said("it isn't shared; `droxa share create` shares it")) << err.str();
  }
  EXPECT_EQ(remove(std::nullopt), 1);
  EXPECT_EQ(permit("bob", Permission::none), 1);
}

TEST_F(ShareCommand, createsAShareOnce) {
  service->share = unshared();
  EXPECT_EQ(with(runShareCreate), 0) << err.str();
  EXPECT_EQ(service->log.count("save"), 1U);
  service->share = shared();
  EXPECT_EQ(with(runShareCreate), 0);
  EXPECT_EQ(service->log.count("save"), 1U) << "it is shared already";
  EXPECT_EQ(out.str().find("a.txt: shared\n"), 0U);
}

TEST_F(ShareCommand, addsParticipantsAndChangesThoseItKnows) {
  foldersShareIs(std::nullopt);
  EXPECT_EQ(add({"eve", "bob"}), 0) << err.str();
  ASSERT_EQ(service->share->participants.size(), 3U);
  EXPECT_EQ(service->share->participants[1].permission, Permission::readWrite);
  EXPECT_EQ(service->share->participants[2].userIdentity.accountName, "eve");
  EXPECT_EQ(service->share->participants[2].permission, Permission::readWrite);
  EXPECT_EQ(fake.daemon->log().count("startOperation_toLookupShareParticipants"), 1U);
  EXPECT_EQ(add({"vera"}), 1);
  EXPECT_TRUE(said("vera is its owner")) << err.str();
}

TEST_F(ShareCommand, whereItMayntLookPeopleUpItTakesTheirNamesAsTheyAre) {
  for (const std::string name : {"eve", "eve@example.org"}) {
    service->share = unshared();
    refusePrivilege("startOperation_toLookupShareParticipants");
    EXPECT_EQ(add({name}), 0) << err.str();
    const CKUserIdentity &who = service->share->participants.at(0).userIdentity;
    EXPECT_EQ(who.accountName, name == "eve" ? "eve" : "");
    EXPECT_EQ(who.handle, name == "eve" ? "" : "eve@example.org");
  }
}

TEST_F(ShareCommand, somebodyNobodyKnowsIsNotAdded) {
  FakeSharing::Answers nobody;
  fake.daemon->sharing().setAnswers(nobody);
  EXPECT_EQ(add({"zoe"}), 66);
  EXPECT_EQ(service->log.count("save"), 0U);
}

TEST_F(ShareCommand, permissionsAreAParticipantsOrEverybodys) {
  EXPECT_EQ(permit("bob@example.org", Permission::none), 0) << err.str();
  EXPECT_EQ(service->share->participants[1].permission, Permission::none);
  EXPECT_EQ(permit(std::nullopt, Permission::readWrite), 0);
  EXPECT_EQ(service->share->publicPermission, Permission::readWrite);
  EXPECT_NE(out.str().find("everyone  read-write"), std::string::npos);
  EXPECT_EQ(permit("vera", Permission::none), 1);
  EXPECT_EQ(permit("zoe", Permission::none), 1);
  EXPECT_TRUE(said("zoe is none of its participants")) << err.str();
}

TEST_F(ShareCommand, theLinkIsPrintedAlone) {
  service->url = NSURL::URLWithString("https://drive.example/s/1");
  EXPECT_EQ(with(runShareLink), 0);
  EXPECT_EQ(out.str(), "https://drive.example/s/1\n");
  EXPECT_EQ(with(runShareLink, "a.txt", true), 0);
  EXPECT_EQ(Json::parse(out.str()), Json::parse(R"({"item": "a.txt", "link": "https://drive.example/s/1"})"));
}

TEST_F(ShareCommand, aTitleIsSaved) {
  EXPECT_EQ(with([](auto &made, const auto &arguments) { return runShareSave(made, arguments, "New"); }), 0);
  EXPECT_EQ(*service->share->get<std::string>(CKShareTitleKey), "New");
}

TEST_F(ShareCommand, removesAParticipantOrTheWholeShare) {
  EXPECT_EQ(remove("bob"), 0) << err.str();
  EXPECT_EQ(service->share->participants.size(), 1U);
  EXPECT_EQ(remove("vera"), 1);
  EXPECT_EQ(remove("zoe"), 1);
  EXPECT_EQ(service->log.count("unshare"), 0U);
  EXPECT_EQ(remove(std::nullopt), 0);
  EXPECT_EQ(service->log.count("unshare"), 1U);
  EXPECT_EQ(out.str(), "a.txt: not shared\n");
}

TEST_F(ShareCommand, participantsAreALineEach) {
  EXPECT_EQ(with(runShareParticipants), 0);
  EXPECT_EQ(out.str(),
            "vera (vera@example.org): owner\n"
            "bob (bob@example.org): read-only, invited, not accepted yet\n");
}

TEST_F(ShareCommand, aFolderGoesThroughTheShareOperations) {
  foldersShareIs(shared());
  EXPECT_EQ(with(runShareShow, "in"), 0) << err.str();
  EXPECT_EQ(out.str().find("in: shared\n"), 0U);
  EXPECT_EQ(fake.daemon->calls(), (Words{"startOperation_toCopySharingInfoAtURL(file:///replica/in)",
                                         "getShareOptionsOfItemIdentifier(i2)"}));
  EXPECT_EQ(add({"eve"}, "in"), 0) << err.str();
  EXPECT_EQ(fake.daemon->sharing().lastShare()->participants.back().userIdentity.accountName, "eve");
  EXPECT_EQ(with(runShareLink, "in"), 0);
  EXPECT_EQ(out.str(), "https://drive.example/s/2\n");
  EXPECT_EQ(remove(std::nullopt, "in"), 0);
  EXPECT_EQ(fake.daemon->log().count("startOperation_toUnshareShare"), 1U);
  EXPECT_TRUE(askedFor.empty()) << "nothing of it goes through the documents' service";

  fake.daemon->replies().failNext("startOperation_toCopySharingInfoAtURL", qvc_error(QVErrorNoShare, "none"));
  foldersShareIs(unshared());
  EXPECT_EQ(with(runShareCreate, "in"), 0) << err.str();
  EXPECT_EQ(fake.daemon->log().count("createSharingInfoForURL"), 1U);
}

TEST_F(ShareCommand, whatIsSharedWithAFolderIsChangedThere) {
  FakeSharing::Answers answers;
  answers.isShared = true;
  answers.sharedFolderName = "Plans";
  fake.daemon->sharing().setAnswers(answers);
  EXPECT_EQ(with(runShareShow), 0) << "it is shown";
  EXPECT_EQ(out.str().find("a.txt: shared with the folder Plans\n"), 0U) << out.str();
  EXPECT_EQ(with(runShareShow, "a.txt", true), 0);
  EXPECT_EQ(Json::parse(out.str())["folder"], "Plans");
  EXPECT_EQ(remove(std::nullopt), 1);
  EXPECT_TRUE(said("it is shared with the folder Plans that it is in; change that folder's share"))
      << err.str();
  EXPECT_EQ(add({"eve"}), 1);
  EXPECT_EQ(service->log.count("save") + service->log.count("unshare"), 0U);
  answers.isSharedByItself = true;
  fake.daemon->sharing().setAnswers(answers);
  EXPECT_EQ(remove(std::nullopt), 0);
}

TEST_F(ShareCommand, aMissingEntitlementIsToldWithTheFileThatGrantsIt) {
  const EntitledScope entitled;
  refusePrivilege("startOperation_toCopySharingInfoAtURL");
  EXPECT_EQ(with(runShareShow, "in"), 77);
  EXPECT_TRUE(said("isn't entitled to com.quorva.Tessaly.sharing-proxy")) << err.str();
  EXPECT_TRUE(said(entitled.folder() + "/droxa-share.json")) << err.str();
  // What it says to write is what entitles it.
  const std::string text = err.str();
  entitled.write("droxa-share.json", text.substr(text.find('{')));
  const auto granted = EntitlementFiles::processFiles().read();
  ASSERT_EQ(granted.grants.size(), 1U);
  EXPECT_EQ(granted.grants[0].application, EntitledScope::ownProgram());
  EXPECT_EQ(granted.grants[0].entitlements, Words{QVSharingProxyEntitlement});
}

TEST_F(ShareCommand, errorsAreSaidInWordsWithTheirStatus) {
  service->error = CKErrorMake(CKErrorCode::serverRecordChanged, "changed");
  service->share = std::nullopt;
  EXPECT_EQ(with(runShareShow), 1);
  EXPECT_TRUE(said("somebody else changed it in the same moment")) << err.str();
  service->error = CKErrorMake(CKErrorCode::networkUnavailable, "no way");
  EXPECT_EQ(with(runShareShow), 75);
  service->error = CKErrorMake(CKErrorCode::permissionFailure, "it is vera's");
  EXPECT_EQ(with(runShareShow), 77);
  EXPECT_TRUE(said("it isn't allowed: it is vera's")) << err.str();
  EXPECT_EQ(with(runShareShow, "missing"), 66);
  host->services.clear();
  EXPECT_EQ(with(runShareShow), 1);
}

TEST_F(ShareCommand, aServiceThatDoesntAnswerIsGivenUp) {
  service->hold();
  service->progress = NSProgress::progressWithTotalUnitCount(1);
  const int status = run([&](CommandContext &made) {
    made.timeout = std::chrono::milliseconds(300);
    return runShareShow(made, {"a.txt", false});
  });
  EXPECT_EQ(status, 75);
  EXPECT_TRUE(said("no answer in time")) << err.str();
  service->release();
}

TEST_F(ShareCommand, linksAndMissingItemsAreRefused) {
  name("link", item("i9", "link", NSFileProviderItemKind::alias));
  EXPECT_EQ(with(runShareShow, "link"), 1);
  EXPECT_TRUE(said("a link isn't shared; share what it leads to")) << err.str();
}

TEST_F(ShareCommand, whatSomebodySharesIsAcceptedByItsLink) {
  FakeSharing::Answers answers;
  answers.url = NSURL::fileURLWithPath("/replica/Shared/a.txt");
  fake.daemon->sharing().setAnswers(answers);
  const auto accept = [this](const std::string &url, bool json) {
    return run([&](CommandContext &made) { return runShareAccept(made, url, json); });
  };
  EXPECT_EQ(accept("https://drive.example/s/1", false), 0) << err.str();
  EXPECT_EQ(out.str(), "/replica/Shared/a.txt\n");
  EXPECT_EQ(fake.daemon->calls(), Words{"acceptShareWithURL(https://drive.example/s/1)"});
  EXPECT_EQ(accept("https://drive.example/s/1", true), 0);
  EXPECT_EQ(Json::parse(out.str())["path"], "/replica/Shared/a.txt");
  fake.daemon->replies().failNext("acceptShareWithURL", CKErrorMake(CKErrorCode::permissionFailure, "no"));
  EXPECT_EQ(accept("https://drive.example/s/1", false), 77);
  EXPECT_EQ(accept("", false), 2);
}

TEST(SharePermissionText, isReadBackAndNothingElseIs) {
  for (const Permission one : {Permission::none, Permission::readOnly, Permission::readWrite})
    EXPECT_EQ(permissionOfText(permissionText(one)), one);
  EXPECT_FALSE(permissionOfText("all"));
}

// The words of the command line, as far as they can be told without a system.
TEST(ShareCommandLine, wrongWordsAreAUsageError) {
  const ScratchHome home;
  const auto status = [](std::vector<const char *> words) {
    std::ostringstream out, err;
    words.insert(words.begin(), {"droxa", "share"});
    return droxaMain(static_cast<int>(words.size()), words.data(), out, err);
  };
  EXPECT_EQ(status({}), 2);
  EXPECT_EQ(status({"create"}), 2);
  EXPECT_EQ(status({"add", "a"}), 2);
  EXPECT_EQ(status({"permission", "a", "bob"}), 2);
  EXPECT_EQ(status({"permission", "a", "bob", "all"}), 2);
  EXPECT_EQ(status({"permission", "a", "--everyone", "all"}), 2);
  EXPECT_EQ(status({"save", "a"}), 2);
  EXPECT_EQ(status({"accept"}), 2);
  EXPECT_EQ(status({"a"}), 69) << "nothing runs there";
  EXPECT_EQ(status({"permission", "a", "bob", "none"}), 69);
}

}  // namespace
}  // namespace droxa::testing
