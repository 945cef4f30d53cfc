@0xd6c395da8393624f;

using Cxx = import "/capnp/c++.capnp";
using Item = import "/tessaly/xpc/QVQueryItem.capnp";
$Cxx.namespace("droxa::schema");

interface QVItemNotificationReceiving {
  receiveUpdates @0 (items :List(Item.QVQueryItem), logicalExtensions :List(Data), physicalExtensions :List(Data))
      -> ();
  receiveProgressUpdates @1 (updates :List(Data)) -> ();
}
