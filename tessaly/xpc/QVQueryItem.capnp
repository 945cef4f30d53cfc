@0xf661375c696473eb;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

struct QVQueryItem {
  fields @0 :Values.Item;  # its item identifier is the string form of the file object identifier
  isDead @1 :Bool;
}
