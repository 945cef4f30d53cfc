@0x91334e50fad0068e;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface QVTransfer {
  waitWithReply @0 () -> (error :Values.Error);  # answered when the transfer has ended
  getProgress @1 () -> (completedBytes :UInt64, totalBytes :UInt64);
  cancel @2 () -> ();
}
