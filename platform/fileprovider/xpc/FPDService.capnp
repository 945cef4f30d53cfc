@0xa41b7d90e2c35f68;

using Cxx = import "/capnp/c++.capnp";
$Cxx.namespace("droxa::schema");

# The descriptor of the listener's endpoint crosses with it.
interface FPDService {}
