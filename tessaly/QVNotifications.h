#pragma once

namespace droxa {

// Posted on NSNotificationCenter::defaultCenter(), on a thread of the daemon connection.

// Somebody signed in or out. Also posted when the daemon came back after it had gone, because what happened
// in between isn't known.
inline constexpr char QVAccountTokenDidChangeNotification[] = "QVAccountTokenDidChangeNotification";
// A container appeared, vanished or moved; also posted when the daemon came back.
inline constexpr char QVContainerListDidChangeNotification[] = "QVContainerListDidChangeNotification";

}  // namespace droxa
