#include <filesystem>
#include <map>
#include <set>
#include <sstream>

#include "tests/system/SharingFixture.h"

namespace droxa::testing {
namespace {

const std::map<std::string, std::set<std::string>> kCallsOf = {
    {kSharingProxy,
     {"toCopySharingInfoAtURL", "toCopyShareURLForShare", "toSaveSharingInfo", "createSharingInfoForURL",
      "toUnshareShare", "toModifyRecordAccessAtURL", "toLookupShareParticipants"}},
    {kSharingPrivateInterface,
     {"toCopyParticipantTokenAtURL", "toPrepFolderForSharingAt", "copyCurrentUserNameAndDisplayHandle",
      "toCopyDocumentURLForRecordID"}},
    {kFolderSharingProxy, {"toProcessSubitemsAtURL"}}};
const std::map<std::string, std::string> kPrivilegeOf = {
    {kSharingProxy, "isSharingProxyEntitled privilege required"},
    {kSharingPrivateInterface, "isSharingPrivateInterfaceEntitled privilege required"},
    {kFolderSharingProxy, "isFolderSharingProxyEntitled privilege required"}};

// What an application that is entitled to so much is answered to each of the twelve calls.
class SharingPrivileges : public EntitledSharingTests {
 protected:
  void SetUp() override {
    EntitledSharingTests::SetUp();
    if (IsSkipped()) return;
    drive.start();
    makeDocument(drive, "letter.txt", "dear");
  }

  // Refused for want of which privilege, by call; "" when it wasn't.
  std::map<std::string, std::string> refusals() {
    const Result result = runShareClient(drive, "letter.txt", {"calls"});
    EXPECT_EQ(result.status, 0) << result.errors;
    std::map<std::string, std::string> all;
    std::istringstream lines(result.output);
    for (std::string line; std::getline(lines, line);) {
      std::istringstream words(line);
      std::string name, domain, code, text;
      std::getline(words, name, '\t');
      std::getline(words, domain, '\t');
      std::getline(words, code, '\t');
      std::getline(words, text);
      EXPECT_NE(domain, "NSCocoaErrorDomain") << line;
      const bool isRefused = domain == "QVTessalyErrorDomain" && code == "26";
      all[name] = isRefused ? text : "";
    }
    EXPECT_EQ(all.size(), 12U) << result.output;
    return all;
  }
  void expectToPass(const std::set<std::string> &entitlements) {
    const auto refused = refusals();
    for (const auto &[entitlement, calls] : kCallsOf)
      for (const std::string &call : calls)
        EXPECT_EQ(refused.at(call), entitlements.count(entitlement) != 0 ? "" : kPrivilegeOf.at(entitlement))
            << call;
  }

  Drive drive;
};

TEST_F(SharingPrivileges, withoutAnyEachCallNamesTheOneThatIsMissing) {
  expectToPass({});
}

TEST_F(SharingPrivileges, eachLetsItsOwnCallsPassAndNoOther) {
  for (const auto &[entitlement, calls] : kCallsOf) {
    entitleClients({entitlement});
    expectToPass({entitlement});
  }
  entitleClients(allSharingEntitlements());
  expectToPass({kSharingProxy, kSharingPrivateInterface, kFolderSharingProxy});
  OwnEtc::revokeAll();
  expectToPass({});
}

TEST_F(SharingPrivileges, aGrantThatOthersCanWriteIsNone) {
  entitleClients(allSharingEntitlements());
  std::filesystem::permissions("/etc/droxa/entitlements.d/tests.json", std::filesystem::perms::others_write,
                               std::filesystem::perm_options::add);
  expectToPass({});
}

}  // namespace
}  // namespace droxa::testing
