@0xe7b5d02c9f4a6138;

using Cxx = import "/capnp/c++.capnp";
using Operations = import "/tessaly/xpc/QVShareOperation.capnp";
using Progress = import "/platform/xpc/Progress.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

# What is nil is left out.
interface QVSharingService {
  fetchSharingInfo @0 () -> (isShared :Bool, item :Values.Item, error :Values.Error);
  preflightCheck @1 () -> (isShared :Bool, item :Values.Item, first :Texts, second :Texts, error :Values.Error);
  fetchParticipantList @2 (progress :Progress.NSProgressWatcher)
      -> (participants :List(Operations.Participant), publicPermission :Int64, error :Values.Error);
  startPreparingForShare @3 (force :Bool) -> ();
  fetchShare @4 (progress :Progress.NSProgressWatcher) -> (share :Operations.CKShare, error :Values.Error);
  fetchShareURL @5 (progress :Progress.NSProgressWatcher) -> (url :Values.Url, error :Values.Error);
  saveShare @6 (progress :Progress.NSProgressWatcher, share :Operations.CKShare)
      -> (share :Operations.CKShare, error :Values.Error);
  unshare @7 (progress :Progress.NSProgressWatcher) -> (error :Values.Error);
}

struct Texts {
  list @0 :List(Data);
}
