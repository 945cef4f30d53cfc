@0xd2df0ee80fcab4ca;

using Cxx = import "/capnp/c++.capnp";
$Cxx.namespace("droxa::schema");

interface QVDaemonNotificationReceiving {
  receiveNotification @0 (name :Data) -> ();
}
