@0xa8c1f27d90e3b546;

using Cxx = import "/capnp/c++.capnp";
$Cxx.namespace("droxa::schema");

# The progress of a call, which its caller watches: `watcher` goes with the call.
interface NSProgress {
  cancel @0 () -> ();
}

interface NSProgressWatcher {
  began @0 (progress :NSProgress, completed :Int64, total :Int64) -> ();  # without a progress: there is none
  changed @1 (completed :Int64, total :Int64) -> ();
}
