#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>

namespace droxa {

// Called on the poster's thread, once for each post, never after removeObserver() has returned on the
// poster's own thread.
using NSNotificationHandler = std::function<void()>;

// Delivers named notifications to whoever registered, synchronously on the poster's thread, in the order of
// registration. No lock is held while an observer runs, so observers may register, remove and post.
// Thread contract: every member may be called on any thread.
class NSNotificationCenter {
 public:
  static NSNotificationCenter &defaultCenter();

  NSNotificationCenter();
  ~NSNotificationCenter();

  // The observer is held weakly and kept alive for the length of each call; a registration whose observer has
  // gone is dropped. `selector` is a member of the observer.
  template <class T>
  void addObserver(const std::shared_ptr<T> &observer, void (T::*selector)(), std::string_view name) {
    std::weak_ptr<T> weak = observer;
    add(
        observer.get(), weak, [raw = observer.get(), selector] { (raw->*selector)(); }, name);
  }
  // The same for an observer that removes itself in its destructor or outlives the process's posts.
  void addObserver(const void *observer, NSNotificationHandler handler, std::string_view name);

  void removeObserver(const void *observer);                         // all names
  void removeObserver(const void *observer, std::string_view name);  // one name

  void postNotificationName(std::string_view name);

  std::size_t registrationCount(const void *observer) const;  // how often `observer` is registered

 private:
  void add(const void *key, std::weak_ptr<const void> owner, NSNotificationHandler handler,
           std::string_view name);
  struct State;
  std::unique_ptr<State> state_;
};

}  // namespace droxa
