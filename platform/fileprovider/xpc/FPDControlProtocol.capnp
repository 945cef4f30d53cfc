@0xe208404b88662568;

using Cxx = import "/capnp/c++.capnp";
using Action = import "/platform/fileprovider/xpc/FPDAction.capnp";
using Enumerator = import "/platform/fileprovider/xpc/NSFileProviderRemoteEnumerator.capnp";
using Providing = import "/platform/fileprovider/xpc/FPDProviding.capnp";
using Service = import "/platform/fileprovider/xpc/FPDService.capnp";
using Thumbnails = import "/platform/fileprovider/xpc/FPDThumbnails.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface FPDControlProtocol {
  getStatus @0 () -> (status :FPDStatus);
  itemForIdentifier @1 (identifier :Data) -> (item :Values.Item, error :Values.Error);
  itemAtPath @2 (path :Data) -> (item :Values.Item, error :Values.Error);
  urlForItemIdentifier @3 (identifier :Data) -> (url :Values.Url);
  identifierForItemAtURL @4 (url :Values.Url) -> (identifier :Data);
  enumeratorForContainer @5 (identifier :Data)
      -> (enumerator :Enumerator.NSFileProviderRemoteEnumerator, error :Values.Error);
  watchContainer @6 (identifier :Data, observer :FPDWatchObserver) -> (watch :FPDWatch, error :Values.Error);
  startProvidingItemWithIdentifier @7 (identifier :Data, readingOptions :UInt64)
      -> (providing :Providing.FPDProviding, url :Values.Url, error :Values.Error);
  startProvidingItemAtPath @8 (path :Data, readingOptions :UInt64)
      -> (providing :Providing.FPDProviding, url :Values.Url, error :Values.Error);
  stopProvidingItemAtURL @9 (url :Values.Url) -> (error :Values.Error);
  movingItemAtURL @10 (url :Values.Url, destination :Values.Url)
      -> (requiresProviding :Bool, error :Values.Error);
  performAction @11 (request :Action.FPDActionRequest) -> (action :Action.FPDAction, error :Values.Error);
  listenerEndpointForServiceName @12 (name :Data, identifier :Data)
      -> (service :Service.FPDService, error :Values.Error);
  fetchThumbnails @13 (identifiers :List(Data), width :Float64, height :Float64)
      -> (thumbnails :Thumbnails.FPDThumbnails, error :Values.Error);
  defaultContainer @14 (identifier :Data) -> (item :Values.Item, error :Values.Error);
  fillDesktopThumbnails @15 (identifier :Data) -> (error :Values.Error);
  mountAtPath @16 (path :Data) -> (mountPoint :Data, error :Values.Error);
  unmount @17 () -> (error :Values.Error);
}

interface FPDWatch {
  stop @0 ();
}

interface FPDWatchObserver {
  receiveChanges @0 (changes :List(FPDChange)) -> ();
}

struct FPDChange {
  kind @0 :UInt8;
  identifier @1 :Data;
  item @2 :Values.Item;
  oldName @3 :Data;
}

struct FPDStatus {
  processIdentifier @0 :UInt32;
  startedNanoseconds @1 :Int64;
  extensionProcessIdentifier @2 :UInt32;
  extensionStartedNanoseconds @3 :Int64;
  extensionLaunches @4 :UInt64;
  cachedItems @5 :UInt64;
  followedContainers @6 :UInt64;
  watchers @7 :UInt64;
  signals @8 :UInt64;
  lastExtensionEnd @9 :Data;
  mountPoint @10 :Data;
  mountProblem @11 :Data;
}
