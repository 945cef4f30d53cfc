@0xd3a0c57f1e94b286;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface FPDThumbnails {
  # Answered when there are some, or none are to come.
  next @0 () -> (thumbnails :List(FPDThumbnail), isLast :Bool, error :Values.Error);
  getProgress @1 () -> (completed :Int64, total :Int64);
  cancel @2 ();
}

struct FPDThumbnail {
  identifier @0 :Data;
  imageData @1 :Data;
  contentType @2 :Data;
  error @3 :Values.Error;
}
