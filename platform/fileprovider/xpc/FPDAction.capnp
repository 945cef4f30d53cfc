@0xc9e4d31b7a5f6082;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface FPDAction {
  waitWithReply @0 () -> (item :Values.Item, error :Values.Error);  # answered when it has ended
  getProgress @1 () -> (completed :Int64, total :Int64);
  cancel @2 ();
}

struct FPDActionRequest {
  kind @0 :UInt8;
  identifier @1 :Data;
  parentIdentifier @2 :Data;
  name @3 :Data;
  url @4 :Values.Url;
  tagData @5 :Data;
  date @6 :Int64;  # nanoseconds since 1970
  favoriteRank @7 :UInt64;
  hasDate @8 :Bool;
  hasFavoriteRank @9 :Bool;
}
