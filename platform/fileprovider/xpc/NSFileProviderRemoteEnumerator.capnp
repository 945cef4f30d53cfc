@0xaaf9944ebf1932b7;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface NSFileProviderRemoteEnumerator {
  enumerateItems @0 (page :Data) -> (items :List(Values.Item), nextPage :Data, error :Values.Error);
  enumerateChanges @1 (anchor :Data)
      -> (updated :List(Values.Item), deleted :List(Data), anchor :Data, moreComing :Bool, error :Values.Error);
  currentSyncAnchor @2 () -> (anchor :Data);
  invalidate @3 ();
}
