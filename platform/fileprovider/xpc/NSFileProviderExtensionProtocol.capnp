@0x9b3cf3e1adf5b418;

using Cxx = import "/capnp/c++.capnp";
using Action = import "/platform/fileprovider/xpc/FPDAction.capnp";
using Enumerator = import "/platform/fileprovider/xpc/NSFileProviderRemoteEnumerator.capnp";
using Providing = import "/platform/fileprovider/xpc/FPDProviding.capnp";
using Service = import "/platform/fileprovider/xpc/FPDService.capnp";
using Thumbnails = import "/platform/fileprovider/xpc/FPDThumbnails.capnp";
using Values = import "/platform/xpc/Values.capnp";
$Cxx.namespace("droxa::schema");

interface NSFileProviderExtensionProtocol {
  itemForIdentifier @0 (identifier :Data) -> (item :Values.Item, error :Values.Error);
  urlForItemIdentifier @1 (identifier :Data) -> (url :Values.Url);
  identifierForItemAtURL @2 (url :Values.Url) -> (identifier :Data);
  enumeratorForContainer @3 (identifier :Data)
      -> (enumerator :Enumerator.NSFileProviderRemoteEnumerator, error :Values.Error);
  startProvidingItemAtURL @4 (url :Values.Url, readingOptions :UInt64)
      -> (providing :Providing.FPDProviding, error :Values.Error);
  stopProvidingItemAtURL @5 (url :Values.Url) -> (error :Values.Error);
  itemChangedAtURL @6 (url :Values.Url) -> (error :Values.Error);
  providePlaceholderAtURL @7 (url :Values.Url) -> (error :Values.Error);
  movingItemAtURL @8 (url :Values.Url, destination :Values.Url)
      -> (requiresProviding :Bool, error :Values.Error);
  performAction @9 (request :Action.FPDActionRequest) -> (action :Action.FPDAction, error :Values.Error);
  listenerEndpointForServiceName @10 (name :Data, identifier :Data)
      -> (service :Service.FPDService, error :Values.Error);
  fetchThumbnails @11 (identifiers :List(Data), width :Float64, height :Float64)
      -> (thumbnails :Thumbnails.FPDThumbnails, error :Values.Error);
  defaultContainer @12 (identifier :Data) -> (item :Values.Item, error :Values.Error);
}
