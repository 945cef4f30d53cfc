@0xb3f9eba90ffc7f39;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface NSFileProviderHostProtocol {
  signalEnumerator @0 (containerIdentifier :Data) -> (error :Values.Error);
}
