#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "keld/AccountKeeper.h"
#include "keld/SharedContainer.h"
#include "keld/sync/SharedZones.h"
#include "platform/cloudkit/CKShare.h"
#include "tests/keld/sync/TwoDevices.h"

namespace droxa::keld {

using Permission = CKShareParticipantPermission;
using Participants = std::map<std::string, Permission>;

// An account's daemon on a cloud in which others have accounts, too. Thread contract: the test's thread.
class AccountDevice {
 public:
  AccountDevice(const std::string &cloudFolder, const std::string &account)
      : name(account), cloud(open(cloudFolder, account)), device(options(account, cloud)) {}

  // Shares what is at the path, or changes how it is shared.
  CKShare share(const std::string &path, const Participants &participants,
                Permission publicPermission = Permission::none) {
    CKShare share = CKShare::shareWithRootRecordID({recordAt(path), DriveZone()});
    return save(std::move(share), participants, publicPermission);
  }
  CKShare change(const CKShare &known, const Participants &participants) {
    const CKFetchReply reply = cloud->fetchRecords({known.recordID}, std::nullopt, {});
    CKShare share = CKShare::shareWithRecord(reply.results.at(0).record).value_or(known);
    share.participants.clear();
    return save(std::move(share), participants, Permission::none);
  }
  void takeBack(const CKShare &share) {
    CKModifyRequest request;
    request.recordsToDelete.push_back({share.recordID, ""});
    EXPECT_FALSE(cloud->modifyRecords(request, {}).error);
  }
  // Where it is on this device; "" with the error.
  std::string accept(const CKShare &share, NSError *error = nullptr) {
    Once<NSURL, NSError> answer("acceptance of " + share.URL.description());
    device.keld.session()->acceptShareWithURL(share.URL, answer.completion());
    if (error)
      *error = answer.value<1>();
    else
      EXPECT_FALSE(answer.value<1>()) << answer.value<1>().description();
    return answer.value<1>() ? "" : answer.value<0>().path();
  }

  // The place of what that account shares, and of a path in it.
  std::string by(const std::string &owner, const std::string &path = "") {
    return device.keld.documents(SharedContainerOf(owner)) + (path.empty() ? "" : "/" + path);
  }
  std::string stateOf(const std::string &owner) {
    return DroxaHome(device.keld.home().root()).state() + "/shared/" + SharedContainerOf(owner) + ".sqlite";
  }
  bool hasSentAll(const std::string &path = "") {
    const NSError error = device.waitForUploads(path);
    EXPECT_FALSE(error) << error.description();
    return !error;
  }
  std::string recordAt(const std::string &path) {
    const auto row = device.keld.daemon().sync().store().byItem(device.keld.number(path));
    EXPECT_TRUE(row) << path;
    return row ? row->record : "";
  }
  // Once the sync has said why the document at the path can't be sent.
  std::int64_t refusalOf(const std::string &path) {
    std::int64_t code = 0;
    EXPECT_TRUE(eventually([&] {
      const QVContentsStatus status = device.status(path);
      code = status.error ? status.error.code() : 0;
      return code != 0;
    })) << path;
    return code;
  }

  const std::string name;
  const std::shared_ptr<EmbeddedCloud> cloud;
  Device device;

 private:
  static std::shared_ptr<EmbeddedCloud> open(const std::string &folder, const std::string &account) {
    NSError error;
    auto cloud = EmbeddedCloud::open(folder, account, account + "s-device", &error);
    EXPECT_TRUE(cloud) << error.description();
    return cloud;
  }
  static KeldOptions options(const std::string &account, const std::shared_ptr<CKCloud> &cloud) {
    KeldOptions options;
    options.sync.cloud = cloud;
    options.sync.device = cloud->deviceName();
    if (AccountKeeper::isValidName(account)) options.sync.account = account;
    return options;
  }
  CKShare save(CKShare share, const Participants &participants, Permission publicPermission) {
    for (const auto &[account, permission] : participants) {
      CKShareParticipant participant;
      participant.userIdentity.accountName = account;
      participant.permission = permission;
      share.participants.push_back(participant);
    }
    share.publicPermission = publicPermission;
    CKModifyRequest request;
    request.recordsToSave.push_back(share.record());
    const CKModifyReply reply = cloud->modifyRecords(request, {});
    EXPECT_FALSE(reply.error) << (reply.saved.empty() ? reply.error : reply.saved.at(0).error).description();
    if (reply.error) return share;
    return CKShare::shareWithRecord(reply.saved.at(0).record).value_or(share);
  }
};

// Anna, who shares with Ben.
class TwoAccounts : public testing::Test {
 protected:
  TwoAccounts() : cloudFolder(folder.path() + "/cloud"), anna(cloudFolder, "anna"), ben(cloudFolder, "ben") {}

  // Anna's folder "project" with "plan.txt", shared with Ben, who has accepted it and sees both.
  CKShare shareProject(Permission permission) {
    anna.device.keld.folder("project");
    anna.device.keld.write("project/plan.txt", "the plan");
    EXPECT_TRUE(anna.hasSentAll());
    const CKShare share = anna.share("project", {{"ben", permission}});
    EXPECT_EQ(ben.accept(share), ben.by("anna", "project"));
    EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/plan.txt")));
    return share;
  }
  // The container isn't there any more, nor what was known of it.
  bool hasNothingOf(AccountDevice &account, const std::string &owner) {
    return eventually([&] {
      return !account.device.exists(account.by(owner) + "/..") &&
             !std::filesystem::exists(account.stateOf(owner)) &&
             !account.device.keld.daemon().sharedZones().engineOf(SharedContainerOf(owner));
    });
  }

  const TemporaryFolder folder;
  const std::string cloudFolder;
  AccountDevice anna, ben;
};

}  // namespace droxa::keld
