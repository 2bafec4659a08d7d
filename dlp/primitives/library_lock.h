#pragma once

#include <pthread.h>

#include "primitives/thread_annotations.h"

// How the library shares its state between threads.
//
// One lock, `dlp::libraryLock`, guards every piece of shared state: `mProcessMap`, the static
// members of `HashMap` (the entries per pid, the pending inodes, `mMapIterator`) and the store's
// duration cache. Binder threads and the file-event thread call in at the same time.
//
// - Every exported function that reads or changes that state takes the lock exactly once, with
//   a `LibraryLockGuard`, and holds it for one section: from its first use of the state to its
//   last. Work on files outside that section runs without it: command 4 reads the opened file's
//   attribute before it takes the lock, and `setExpiryforFile` reads and writes the new file's
//   attribute after it has let go. The lock is not recursive, so an entry point never calls
//   another entry point that takes it; it calls the internal form instead.
// - Functions that need the lock and do not take it say so with REQUIRES(dlp::libraryLock): the
//   internal forms, and the members of `HashMap` that are not exported.
// - Within its section an entry point may name a process (a read of /proc, for the reject list
//   and the whitelist) and the store may run SQLite: the store holds the lock from the cache to
//   the database and back, so that its cache and the rows it writes change together. Two threads
//   that store durations for one id end with the cache and the file agreeing on the last one, and
//   a reader never caches a value that a write in flight is about to replace. Between processes,
//   SQLite's own locking keeps each look-up and write together.
// - Stateless entry points take no lock: the attribute and the device primitives,
//   `getProcessNameByPid`, `getExtensions`, `getCurrentTimeInSec` and `getEndOfDay`.
// - At process exit the lock is taken for good before any of the state is destroyed, so a call
//   racing the exit waits instead of touching freed memory.
namespace dlp {

class CAPABILITY("mutex") LibraryLock {
  public:
    constexpr LibraryLock() = default;
    LibraryLock(const LibraryLock&) = delete;
    LibraryLock& operator=(const LibraryLock&) = delete;

    void lock() ACQUIRE() { pthread_mutex_lock(&mutex_); }
    void unlock() RELEASE() { pthread_mutex_unlock(&mutex_); }

  private:
    // Constant-initialised and never destroyed: usable from any static constructor and by
    // threads that are still running while the process exits.
    pthread_mutex_t mutex_ = PTHREAD_MUTEX_INITIALIZER;
};

extern LibraryLock libraryLock;

class SCOPED_CAPABILITY LibraryLockGuard {
  public:
    LibraryLockGuard() ACQUIRE(libraryLock) { libraryLock.lock(); }
    ~LibraryLockGuard() RELEASE() { libraryLock.unlock(); }
    LibraryLockGuard(const LibraryLockGuard&) = delete;
    LibraryLockGuard& operator=(const LibraryLockGuard&) = delete;
};

}  // namespace dlp
