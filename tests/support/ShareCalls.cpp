#include "tests/support/ShareCalls.h"

#include <gtest/gtest.h>
#include <utility>

#include "platform/oslog/LogFormat.h"

namespace droxa {
namespace {

using Answers = FakeSharing::Answers;
using Operation = std::shared_ptr<QVOperationClient>;
using Replied = ShareCall::Replied;
using Protocol = QVShareOperationProtocol;

const NSURL &url() {
  static const NSURL made = NSURL::fileURLWithPath("/replica/a b.txt");
  return made;
}

CKRecordID recordID() {
  return {"record", {"zone", "owner"}};
}

QVShareParticipants participants() {
  CKShareParticipant one;
  one.userIdentity = {"account-2", "Ada", "ada@example.org"};
  one.permission = CKShareParticipantPermission::readWrite;
  return std::vector{one, CKShareParticipant{}};
}

QVShareOutcomeReply outcome(const Replied &replied) {
  return [replied](const NSError &error) { replied({}, error); };
}
QVShareReply shareReply(const Replied &replied) {
  return [replied](const std::optional<CKShare> &share, const NSError &error) {
    Answers answers;
    answers.share = share;
    replied(answers, error);
  };
}
QVShareAndURLReply shareAndURL(const Replied &replied) {
  return [replied](const std::optional<CKShare> &share, const NSURL &reply, const NSError &error) {
    Answers answers;
    answers.share = share;
    answers.url = reply;
    replied(answers, error);
  };
}

Answers noAnswers(const Answers &) {
  return {};
}
Answers shareOnly(const Answers &all) {
  Answers some;
  some.share = all.share;
  return some;
}
Answers shareAndURLOnly(const Answers &all) {
  Answers some = shareOnly(all);
  some.url = all.url;
  return some;
}

constexpr char kProxy[] = "isSharingProxyEntitled";
constexpr char kPrivate[] = "isSharingPrivateInterfaceEntitled";
constexpr char kFolder[] = "isFolderSharingProxyEntitled";

std::vector<ShareCall> makeCalls() {
  const std::string path = "file:///replica/a%20b.txt";
  const std::string share = wholeShare().description();
  std::vector<ShareCall> calls;
  calls.push_back({"startOperation_toCopySharingInfoAtURL",
                   "startOperation:toCopySharingInfoAtURL:reply:", kProxy, true, false, 3, path,
                   [](Protocol &remote, Operation op, const Replied &replied) {
                     remote.startOperation_toCopySharingInfoAtURL(op, url(), shareAndURL(replied));
                   },
                   shareAndURLOnly});
  calls.push_back(
      {"startOperation_toCopyShareURLForShare",
       "startOperation:toCopyShareURLForShare:appName:reply:", kProxy, true, true, 3, share + ", Writer",
       [](Protocol &remote, Operation op, const Replied &replied) {
         remote.startOperation_toCopyShareURLForShare(op, wholeShare(), "Writer", shareAndURL(replied));
       },
       shareAndURLOnly});
  calls.push_back({"startOperation_toSaveSharingInfo", "startOperation:toSaveSharingInfo:reply:", kProxy,
                   true, true, 2, share,
                   [](Protocol &remote, Operation op, const Replied &replied) {
                     remote.startOperation_toSaveSharingInfo(op, wholeShare(), shareReply(replied));
                   },
                   shareOnly});
  calls.push_back({"createSharingInfoForURL", "createSharingInfoForURL:reply:", kProxy, false, false, 2, path,
                   [](Protocol &remote, const Operation &, const Replied &replied) {
                     remote.createSharingInfoForURL(url(), shareReply(replied));
                   },
                   shareOnly});
  calls.push_back({"startOperation_toUnshareShare",
                   "startOperation:toUnshareShare:forceDelete:reply:", kProxy, true, true, 1, share + ", yes",
                   [](Protocol &remote, Operation op, const Replied &replied) {
                     remote.startOperation_toUnshareShare(op, wholeShare(), true, outcome(replied));
                   },
                   noAnswers});
  calls.push_back(
      {"startOperation_toModifyRecordAccessAtURL",
       "startOperation:toModifyRecordAccessAtURL:allowAccess:reply:", kProxy, true, false, 3, path + ", yes",
       [](Protocol &remote, Operation op, const Replied &replied) {
         remote.startOperation_toModifyRecordAccessAtURL(
             op, url(), true,
             [replied](const NSData &data, const std::optional<std::string> &text, const NSError &error) {
               Answers answers;
               answers.data = data;
               answers.first = text;
               replied(answers, error);
             });
       },
       [](const Answers &all) {
         Answers some;
         some.data = all.data;
         some.first = all.first;
         return some;
       }});
  calls.push_back({"startOperation_toCopyParticipantTokenAtURL",
                   "startOperation:toCopyParticipantTokenAtURL:reply:", kPrivate, true, false, 3, path,
                   [](Protocol &remote, Operation op, const Replied &replied) {
                     remote.startOperation_toCopyParticipantTokenAtURL(
                         op, url(),
                         [replied](const std::optional<std::string> &first,
                                   const std::optional<std::string> &second, const NSError &error) {
                           Answers answers;
                           answers.first = first;
                           answers.second = second;
                           replied(answers, error);
                         });
                   },
                   [](const Answers &all) {
                     Answers some;
                     some.first = all.first;
                     some.second = all.second;
                     return some;
                   }});
  calls.push_back({"startOperation_toPrepFolderForSharingAt",
                   "startOperation:toPrepFolderForSharingAt:reply:", kPrivate, true, false, 1, path,
                   [](Protocol &remote, Operation op, const Replied &replied) {
                     remote.startOperation_toPrepFolderForSharingAt(op, url(), outcome(replied));
                   },
                   noAnswers});
  calls.push_back({"copyCurrentUserNameAndDisplayHandleWithReply",
                   "copyCurrentUserNameAndDisplayHandleWithReply:", kPrivate, false, false, 5, "",
                   [](Protocol &remote, const Operation &, const Replied &replied) {
                     remote.copyCurrentUserNameAndDisplayHandleWithReply(
                         [replied](const std::optional<NSPersonNameComponents> &name,
                                   const std::optional<std::string> &first,
                                   const std::optional<std::string> &second,
                                   const std::optional<std::string> &third, const NSError &error) {
                           Answers answers;
                           answers.name = name;
                           answers.first = first;
                           answers.second = second;
                           answers.third = third;
                           replied(answers, error);
                         });
                   },
                   [](const Answers &all) {
                     Answers some;
                     some.name = all.name;
                     some.first = all.first;
                     some.second = all.second;
                     some.third = all.third;
                     return some;
                   }});
  calls.push_back({"startOperation_toProcessSubitemsAtURL",
                   "startOperation:toProcessSubitemsAtURL:maxSubsharesFailures:processType:reply:", kFolder,
                   true, false, 1, path + ", 18446744073709551615, 7",
                   [](Protocol &remote, Operation op, const Replied &replied) {
                     remote.startOperation_toProcessSubitemsAtURL(op, url(), UINT64_MAX, 7, outcome(replied));
                   },
                   noAnswers});
  calls.push_back(
      {"startOperation_toLookupShareParticipants", "startOperation:toLookupShareParticipants:reply:", kProxy,
       true, false, 2, LogDescription(participants()),
       [](Protocol &remote, Operation op, const Replied &replied) {
         remote.startOperation_toLookupShareParticipants(
             op, participants(), [replied](const QVShareParticipants &found, const NSError &error) {
               Answers answers;
               answers.participants = found;
               replied(answers, error);
             });
       },
       [](const Answers &all) {
         Answers some;
         some.participants = all.participants;
         return some;
       }});
  calls.push_back(
      {"startOperation_toCopyDocumentURLForRecordID",
       "startOperation:toCopyDocumentURLForRecordID:syncIfNeeded:reply:", kPrivate, true, false, 2,
       recordID().description() + ", yes",
       [](Protocol &remote, Operation op, const Replied &replied) {
         remote.startOperation_toCopyDocumentURLForRecordID(
             op, recordID(), true,
             [replied](const std::shared_ptr<const FPSandboxingURLWrapper> &wrapper, const NSError &error) {
               Answers answers;
               answers.urlWrapper = wrapper;
               replied(answers, error);
             });
       },
       [](const Answers &all) {
         Answers some;
         some.urlWrapper = all.urlWrapper;
         return some;
       }});
  return calls;
}

}  // namespace

CKShare wholeShare() {
  CKShare share;
  share.recordID = {"share-1", {"zone", "owner"}};
  share.recordChangeTag = "tag";
  share.modificationDate = NSDate::dateWithNanosecondsSince1970(-1);
  share.modifiedByDevice = "desk";
  share.rootRecordID = CKRecordID{"root", {"zone", "owner"}};
  CKShareParticipant owner;
  owner.userIdentity = {"owner", "Vera", "vera@example.org"};
  owner.role = CKShareParticipantRole::owner;
  owner.permission = CKShareParticipantPermission::readWrite;
  owner.acceptanceStatus = CKShareParticipantAcceptanceStatus::accepted;
  CKShareParticipant other;
  other.userIdentity.accountName = std::string("a\0b\xff", 4);
  other.role = CKShareParticipantRole::publicUser;
  other.permission = CKShareParticipantPermission::none;
  other.acceptanceStatus = CKShareParticipantAcceptanceStatus::removed;
  share.participants = {owner, other};
  share.publicPermission = CKShareParticipantPermission::readOnly;
  share.URL = NSURL::URLWithString("https://drive.example.org/s/1");
  share.fields = {{CKShareTitleKey, std::string("Plans")},
                  {"date", NSDate::dateWithNanosecondsSince1970(5)},
                  {"data", NSData::dataWithString("bytes")},
                  {"emptyData", NSData::dataWithString("")},
                  {"integer", std::int64_t{-3}},
                  {"nilData", NSData()},
                  {"nilDate", NSDate()},
                  {"none", std::monostate()},
                  {"real", 0.5},
                  {"texts", std::vector<std::string>{"a", "", "c"}}};
  return share;
}

FakeSharing::Answers wholeAnswers() {
  Answers answers;
  answers.share = wholeShare();
  answers.share->recordChangeTag = "tag-2";
  answers.url = NSURL::URLWithString("https://drive.example.org/s/2");
  answers.data = NSData::dataWithString("token");
  answers.first = "first";
  answers.second = "";
  answers.third = "third";
  answers.name = NSPersonNameComponents{"Dr.", "Vera", "M.", "Lind", std::nullopt, "Vee"};
  answers.participants = participants();
  return answers;
}

const std::vector<ShareCall> &shareCalls() {
  static const std::vector<ShareCall> &calls = *new std::vector<ShareCall>(makeCalls());
  return calls;
}

const ShareCall &shareCall(const std::string &name) {
  for (const ShareCall &call : shareCalls())
    if (call.name == name) return call;
  ADD_FAILURE() << "there is no call " << name;
  return shareCalls().front();
}

bool sameAnswers(const Answers &one, const Answers &other) {
  const bool sameWrapper =
      one.urlWrapper && other.urlWrapper
          ? one.urlWrapper->url() == other.urlWrapper->url() &&
                (one.urlWrapper->descriptor() >= 0) == (other.urlWrapper->descriptor() >= 0)
          : one.urlWrapper == other.urlWrapper;
  return sameWrapper && one.share == other.share && one.url == other.url && one.data == other.data &&
         one.first == other.first && one.second == other.second && one.third == other.third &&
         one.name == other.name && one.participants == other.participants;
}

std::vector<std::string> loggedValues(const ShareCall &call, const Answers &answers) {
  const std::string &name = call.name;
  if (name == "startOperation_toCopySharingInfoAtURL" || name == "startOperation_toCopyShareURLForShare")
    return {LogDescription(answers.share), LogDescription(answers.url)};
  if (name == "startOperation_toSaveSharingInfo" || name == "createSharingInfoForURL")
    return {LogDescription(answers.share)};
  if (name == "startOperation_toModifyRecordAccessAtURL")
    return {LogDescription(answers.data), LogDescription(answers.first)};
  if (name == "startOperation_toCopyParticipantTokenAtURL")
    return {LogDescription(answers.first), LogDescription(answers.second)};
  if (name == "copyCurrentUserNameAndDisplayHandleWithReply")
    return {LogDescription(answers.name), LogDescription(answers.first), LogDescription(answers.second),
            LogDescription(answers.third)};
  if (name == "startOperation_toLookupShareParticipants") return {LogDescription(answers.participants)};
  if (name == "startOperation_toCopyDocumentURLForRecordID") return {LogDescription(answers.urlWrapper)};
  return {};
}

}  // namespace droxa
