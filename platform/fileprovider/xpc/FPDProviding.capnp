@0x9050f02771c6978c;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface FPDProviding {
  waitWithReply @0 () -> (error :Values.Error);  # answered when it has ended
  cancel @1 ();
  getProgress @2 () -> (completed :Int64, total :Int64);
}
