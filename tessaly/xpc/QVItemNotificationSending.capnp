@0xf064018402325c76;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface QVItemNotificationSending {
  boostPriority @0 () -> ();  # answered when the boost ends
  watchItemAtURL @1 (url :Values.Url, options :UInt64) -> (error :Values.Error);
  invalidate @2 () -> ();
}
