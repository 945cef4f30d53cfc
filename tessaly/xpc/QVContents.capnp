@0xc3b3a061c2ad9e54;

using Cxx = import "/capnp/c++.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

struct QVContentsStatus {
  contents @0 :UInt8;
  upload @1 :UInt8;
  isPinned @2 :Bool;
  size @3 :UInt64;
  transferred @4 :UInt64;
  checksum @5 :Data;
  error @6 :Values.Error;
  documents @7 :UInt64;
  dataless @8 :UInt64;
  unsent @9 :UInt64;
  failed @10 :UInt64;
}

struct QVTransferCounts {
  active @0 :UInt64;
  queued @1 :UInt64;
  done @2 :UInt64;
  failed @3 :UInt64;
  bytesDone @4 :UInt64;
  bytesLeft @5 :UInt64;
  bytesPerSecond @6 :UInt64;
}

struct QVTransferStatus {
  downloads @0 :QVTransferCounts;
  uploads @1 :QVTransferCounts;
  cloud @2 :Data;
  isCloudReachable @3 :Bool;
  cloudProblem @4 :Data;
  heldDeletions @5 :UInt64;
  conflicts @6 :UInt64;
}

struct QVContentsResult {
  documents @0 :UInt64;
  bytes @1 :UInt64;
  refused @2 :UInt64;
  failures @3 :List(Failure);

  struct Failure {
    path @0 :Data;
    error @1 :Values.Error;
  }
}
