@0xb94f1c63d8e7a205;

using Cxx = import "/capnp/c++.capnp";
using Progress = import "/platform/xpc/Progress.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

# What is nil is left out.
interface QVPlendaCollaboration {
  fetchVersionAndCapabilities @0 () -> (version :Int64, capabilities :Int64, error :Values.Error);
  fetchCollaborationToken @1 (progress :Progress.NSProgressWatcher)
      -> (provider :Data, first :Data, second :Data, hasExpiry :Bool, expiry :Int64, error :Values.Error);
  fetchLatestRevision @2 (progress :Progress.NSProgressWatcher) -> (error :Values.Error);
  refreshSharingState @3 (progress :Progress.NSProgressWatcher) -> (error :Values.Error);
  fetchFileProviderIdentifier @4 () -> (text :Data, error :Values.Error);
  fetchURLForSharingFile @5 () -> (url :Values.Url, error :Values.Error);
  fetchFolderSharingState @6 () -> (isShared :Bool, error :Values.Error);
  fetchSharedFolderInfo @7 () -> (isShared :Bool, text :Data, error :Values.Error);
  fetchAccountIdentifier @8 () -> (text :Data, error :Values.Error);
}
