@0xd3a7c06f1e5b9284;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface QVCancellable {
  invalidate @0 () -> ();
}

interface QVOperationClient extends(QVCancellable) {
  progressCallbackWithTopic @0 (topic :Data, userInfo :List(Values.Error.UserInfo)) -> ();
  setRemoteOperationProxy @1 (proxy :QVCancellable, userInfo :List(Values.Error.UserInfo)) -> ();
}

# What is nil is left out.
interface QVShareOperationProtocol {
  copySharingInfoAtURL @0 (op :QVOperationClient, url :Values.Url)
      -> (share :CKShare, url :Values.Url, error :Values.Error);
  copyShareURLForShare @1 (op :QVOperationClient, share :CKShare, appName :Data)
      -> (share :CKShare, url :Values.Url, error :Values.Error);
  saveSharingInfo @2 (op :QVOperationClient, share :CKShare) -> (share :CKShare, error :Values.Error);
  createSharingInfoForURL @3 (url :Values.Url) -> (share :CKShare, error :Values.Error);
  unshareShare @4 (op :QVOperationClient, share :CKShare, forceDelete :Bool) -> (error :Values.Error);
  modifyRecordAccessAtURL @5 (op :QVOperationClient, url :Values.Url, allowAccess :Bool)
      -> (data :Data, text :Data, error :Values.Error);
  copyParticipantTokenAtURL @6 (op :QVOperationClient, url :Values.Url)
      -> (first :Data, second :Data, error :Values.Error);
  prepFolderForSharingAt @7 (op :QVOperationClient, url :Values.Url) -> (error :Values.Error);
  copyCurrentUserNameAndDisplayHandle @8 ()
      -> (name :PersonName, first :Data, second :Data, third :Data, error :Values.Error);
  processSubitemsAtURL @9 (op :QVOperationClient, url :Values.Url, maxSubsharesFailures :UInt64, processType :UInt64)
      -> (error :Values.Error);
  lookupShareParticipants @10 (op :QVOperationClient, participants :List(Participant))
      -> (participants :List(Participant), error :Values.Error);
  copyDocumentURLForRecordID @11 (op :QVOperationClient, recordID :RecordID, syncIfNeeded :Bool)
      -> (url :Values.Url, descriptor :Values.Descriptor, error :Values.Error);
}

struct RecordID {
  recordName @0 :Data;
  zoneName @1 :Data;
  ownerName @2 :Data;
}

struct Participant {
  accountName @0 :Data;
  displayName @1 :Data;
  handle @2 :Data;
  role @3 :UInt8;
  permission @4 :UInt8;
  acceptanceStatus @5 :UInt8;
}

struct CKShare {
  recordID @0 :RecordID;
  recordChangeTag @1 :Data;
  hasModificationDate @2 :Bool;
  modificationDate @3 :Int64;  # nanoseconds since 1970
  modifiedByDevice @4 :Data;
  rootRecordID @5 :RecordID;
  participants @6 :List(Participant);
  publicPermission @7 :UInt8;
  url @8 :Values.Url;
  fields @9 :List(Field);
}

# Assets don't cross.
struct Field {
  key @0 :Data;
  union {
    none @1 :Void;
    integer @2 :Int64;
    real @3 :Float64;
    text @4 :Data;
    data @5 :Data;
    date @6 :Int64;  # nanoseconds since 1970
    texts @7 :List(Data);
    nilData @8 :Void;
    nilDate @9 :Void;
  }
}

struct PersonName {
  namePrefix @0 :Data;
  givenName @1 :Data;
  middleName @2 :Data;
  familyName @3 :Data;
  nameSuffix @4 :Data;
  nickname @5 :Data;
}
