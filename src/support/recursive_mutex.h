// The agent's only kind of mutex. It is recursive, and failing to create one ends the process.
#pragma once
#include <pthread.h>

namespace lmx {

/// Initialises `mutex` as a recursive mutex. On failure the process exits at once with status 71 and without
/// a message: an agent without its locks must not record.
void agent_init_recursive_mutex(pthread_mutex_t* mutex);

/// A recursive mutex made by agent_init_recursive_mutex; meets BasicLockable for std::lock_guard.
class RecursiveMutex {
 public:
  RecursiveMutex() { agent_init_recursive_mutex(&mutex_); }
  RecursiveMutex(const RecursiveMutex&) = delete;
  RecursiveMutex& operator=(const RecursiveMutex&) = delete;
  ~RecursiveMutex() { pthread_mutex_destroy(&mutex_); }

  /// @return the pthread result; 0 when locked
  int lock() noexcept { return pthread_mutex_lock(&mutex_); }
  int unlock() noexcept { return pthread_mutex_unlock(&mutex_); }

 private:
  pthread_mutex_t mutex_;
};

}  // namespace lmx
