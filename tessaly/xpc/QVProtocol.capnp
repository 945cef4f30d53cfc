@0xfcc3f3fc6cee051c;

using Cxx = import "/capnp/c++.capnp";
using Contents = import "/tessaly/xpc/QVContents.capnp";
using DaemonNotifications = import "/tessaly/xpc/QVDaemonNotificationReceiving.capnp";
using Item = import "/tessaly/xpc/QVQueryItem.capnp";
using Receiving = import "/tessaly/xpc/QVItemNotificationReceiving.capnp";
using Sending = import "/tessaly/xpc/QVItemNotificationSending.capnp";
using Sharing = import "/tessaly/xpc/QVShareOperation.capnp";
using Transfer = import "/tessaly/xpc/QVTransfer.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

# File object identifiers cross in their string form.
interface QVProtocol extends(Sharing.QVShareOperationProtocol) {
  enumerateItemsInFolder @0 (folder :Data, sortOrder :Int64, offset :UInt64, limit :UInt64)
      -> (items :List(Item.QVQueryItem), nextOffset :UInt64, error :Values.Error);
  enumerateAllFoldersWithSortOrder @1 (sortOrder :Int64, offset :UInt64, limit :UInt64)
      -> (items :List(Item.QVQueryItem), nextOffset :UInt64, error :Values.Error);
  currentNotifRankWithReply @2 () -> (rank :UInt64, error :Values.Error);
  enumerateWorkingSetChangesFromChangeToken @3 (token :Data, limit :UInt64)
      -> (updated :List(Item.QVQueryItem), deleted :List(Data), newToken :Data, error :Values.Error);
  getItemUpdateSenderWithReceiver @4 (receiver :Receiving.QVItemNotificationReceiving)
      -> (sender :Sending.QVItemNotificationSending, information :List(Information), error :Values.Error);
  getURLForItemIdentifier @5 (identifier :Data) -> (url :Values.Url, error :Values.Error);
  getURLForFileObjectID @6 (identifier :Data) -> (url :Values.Url, error :Values.Error);
  getQueryItemForURL @7 (url :Values.Url, fakeFSEvent :Bool) -> (item :Item.QVQueryItem, error :Values.Error);
  getContainerItem @8 (containerID :Data, forceScan :Bool) -> (item :Item.QVQueryItem, error :Values.Error);
  getContainers @9 () -> (containers :List(Container), error :Values.Error);
  subscribeToNotifications @10 (receiver :DaemonNotifications.QVDaemonNotificationReceiving)
      -> (error :Values.Error);
  getAccount @11 () -> (account :Account, error :Values.Error);
  signIn @12 (name :Data) -> (account :Account, error :Values.Error);
  signOut @13 () -> (error :Values.Error);
  getStatus @14 () -> (status :Status, error :Values.Error);

  startDownloadAtURL @15 (url :Values.Url, options :UInt64)
      -> (transfer :Transfer.QVTransfer, error :Values.Error);
  evictItemAtURL @16 (url :Values.Url) -> (result :Contents.QVContentsResult, error :Values.Error);
  setPinnedAtURL @17 (url :Values.Url, isPinned :Bool) -> (error :Values.Error);
  getContentsStatusAtURL @18 (url :Values.Url) -> (status :Contents.QVContentsStatus, error :Values.Error);
  getTransferStatus @19 () -> (status :Contents.QVTransferStatus, error :Values.Error);
  waitForUploadAtURL @20 (url :Values.Url) -> (error :Values.Error);  # answered when everything is safe
  getMoveCapability @21 (source :Values.Url, destination :Values.Url)
      -> (capability :UInt64, error :Values.Error);
  confirmDeletions @22 (carryOut :Bool) -> (error :Values.Error);
  setMetadataAtURL @23 (url :Values.Url, change :MetadataChange) -> (error :Values.Error);
  allowDeletionAtURL @24 (url :Values.Url) -> (error :Values.Error);
  checkIfItemIsShareableWithInode @25 (inode :UInt64) -> (isShareable :Bool, error :Values.Error);

  getShareOptionsOfItemIdentifier @26 (identifier :Data)
      -> (isShared :Bool, isSharedByOthers :Bool, isSharedByItself :Bool, sharedFolderName :Data,
          error :Values.Error);
  refreshSharingStateForItemIdentifier @27 (identifier :Data) -> (error :Values.Error);
  acceptShareWithURL @28 (url :Values.Url) -> (url :Values.Url, error :Values.Error);
  resolveFileObjectIDsToContentRecordIDs @29 (identifiers :List(Data))
      -> (recordIDs :List(ContentRecord), error :Values.Error);
  getContainerURLForID @30 (containerID :Data, recreateDocumentsIfNeeded :Bool)
      -> (url :Values.Url, error :Values.Error);

  struct ContentRecord {
    identifier @0 :Data;
    recordID @1 :Sharing.RecordID;
  }
  struct Information {
    key @0 :Data;
    value @1 :Data;
  }
  # What isn't set stays as it is.
  struct MetadataChange {
    setsTags @0 :Bool;
    tags @1 :List(Data);
    setsLastUsed @2 :Bool;
    lastUsed @3 :Int64;
    setsFavoriteRank @4 :Bool;
    favoriteRank @5 :UInt64;
  }
  struct Container {
    containerID @0 :Data;
    url @1 :Values.Url;
    documentsURL @2 :Values.Url;
    documentsID @3 :Data;
  }
  struct Account {
    name @0 :Data;
    perAppAccountIdentifier @1 :Data;
  }
  struct Status {
    processIdentifier @0 :UInt32;
    startedNanoseconds @1 :Int64;
    rank @2 :UInt64;
    documents @3 :UInt64;
    folders @4 :UInt64;
    aliases @5 :UInt64;
    pendingScans @6 :UInt64;
    senders @7 :UInt64;
    watcher @8 :Data;
    firstScanDone @9 :Bool;
    databaseBytes @10 :UInt64;
  }
}
