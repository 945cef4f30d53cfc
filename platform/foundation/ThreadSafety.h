#pragma once

#include <mutex>

// Lock types that the compiler's thread-safety analysis understands (clang, -Wthread-safety).

#if defined(__clang__)
#define DROXA_TSA(x) __attribute__((x))
#else
#define DROXA_TSA(x)
#endif

#define CAPABILITY(name) DROXA_TSA(capability(name))
#define SCOPED_CAPABILITY DROXA_TSA(scoped_lockable)
#define GUARDED_BY(lock) DROXA_TSA(guarded_by(lock))
#define PT_GUARDED_BY(lock) DROXA_TSA(pt_guarded_by(lock))
#define REQUIRES(...) DROXA_TSA(requires_capability(__VA_ARGS__))
#define ACQUIRE(...) DROXA_TSA(acquire_capability(__VA_ARGS__))
#define RELEASE(...) DROXA_TSA(release_capability(__VA_ARGS__))
#define TRY_ACQUIRE(...) DROXA_TSA(try_acquire_capability(__VA_ARGS__))
#define EXCLUDES(...) DROXA_TSA(locks_excluded(__VA_ARGS__))
#define RETURN_CAPABILITY(x) DROXA_TSA(lock_returned(x))
#define NO_THREAD_SAFETY_ANALYSIS DROXA_TSA(no_thread_safety_analysis)

namespace droxa {

// A std::mutex under a name that the analysis can follow. Usable with std::condition_variable_any.
class CAPABILITY("mutex") Mutex {
 public:
  void lock() ACQUIRE() { mutex_.lock(); }
  void unlock() RELEASE() { mutex_.unlock(); }
  bool try_lock() TRY_ACQUIRE(true) { return mutex_.try_lock(); }

 private:
  std::mutex mutex_;
};

// An object's own monitor: may be taken again by the thread that holds it.
class CAPABILITY("mutex") RecursiveMutex {
 public:
  void lock() ACQUIRE() { mutex_.lock(); }
  void unlock() RELEASE() { mutex_.unlock(); }

 private:
  std::recursive_mutex mutex_;
};

// Holds a lock for a scope; may be released early and taken again within it.
template <class M>
class SCOPED_CAPABILITY ScopedLock {
 public:
  explicit ScopedLock(M &mutex) ACQUIRE(mutex) : mutex_(mutex) { mutex_.lock(); }
  ~ScopedLock() RELEASE() {
    if (held_) mutex_.unlock();
  }
  ScopedLock(const ScopedLock &) = delete;
  ScopedLock &operator=(const ScopedLock &) = delete;

  void lock() ACQUIRE() {
    mutex_.lock();
    held_ = true;
  }
  void unlock() RELEASE() {
    held_ = false;
    mutex_.unlock();
  }

 private:
  M &mutex_;
  bool held_ = true;
};

using Lock = ScopedLock<Mutex>;
using RecursiveLock = ScopedLock<RecursiveMutex>;

}  // namespace droxa
