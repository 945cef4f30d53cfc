@0xb860ee87be5b72fe;
# Values that cross every connection. Nil is a null pointer. Names, paths and texts are bytes: any are allowed.

using Cxx = import "/capnp/c++.capnp";
$Cxx.namespace("droxa::schema");

# An object whose descriptor crosses with it (platform/xpc/capnp/Descriptors.h).
interface Descriptor {}

struct Url {
  union {
    path @0 :Data;  # of a file URL
    text @1 :Data;  # of any other
  }
  physical @2 :Bool;
}

struct Error {
  domain @0 :Data;
  code @1 :Int64;
  userInfo @2 :List(UserInfo);

  struct UserInfo {
    key @0 :Data;
    union {
      text @1 :Data;
      integer @2 :Int64;
      error @3 :Error;
      url @4 :Url;
      item @5 :Item;
      description @6 :Data;  # of an object that doesn't cross
    }
  }
}

struct Item {
  itemIdentifier @0 :Data;
  parentItemIdentifier @1 :Data;
  filename @2 :Data;
  typeIdentifier @3 :Data;
  tagData @4 :Data;
  documentSize @5 :UInt64;
  creationDate @6 :Int64;  # nanoseconds since 1970
  contentModificationDate @7 :Int64;
  lastUsedDate @8 :Int64;
  changeRank @9 :UInt64;
  favoriteRank @10 :UInt64;
  permissions @11 :UInt32;
  kind @12 :UInt8;
  hasCreationDate @13 :Bool;
  hasContentModificationDate @14 :Bool;
  hasLastUsedDate @15 :Bool;
  isTrashed @16 :Bool;
  isExcludedFromSync @17 :Bool;
  isDownloaded @18 :Bool;
  isUploaded @19 :Bool;
  isShared @20 :Bool;
}
