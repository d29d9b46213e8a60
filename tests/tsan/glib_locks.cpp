// Shows GLib's locks to the thread sanitizer. GLib locks by system calls of its own, so the order that its
// mutexes make between our callbacks is invisible to it; without this every object that we hand to a
// streaming thread would be reported. Linked into the programs of the tsan build only: the names here take
// the place of the library's, tell the sanitizer and call the original.
#include <dlfcn.h>
#include <glib.h>
#include <sanitizer/tsan_interface.h>

#include <atomic>

#pragma GCC diagnostic ignored "-Wpedantic"

// NOLINTBEGIN: the library's names and types

namespace {

/// The library's own function of a name, looked up once.
template <typename Function>
class Original {
 public:
  explicit constexpr Original(const char* name) : name_(name) {}
  Function operator*() {
    void* found = address_.load(std::memory_order_acquire);
    if (found == nullptr) {
      found = dlsym(RTLD_NEXT, name_);
      address_.store(found, std::memory_order_release);
    }
    return reinterpret_cast<Function>(found);
  }

 private:
  const char* name_;
  std::atomic<void*> address_{nullptr};
};

void acquired(void* lock) { __tsan_acquire(lock); }
void releasing(void* lock) { __tsan_release(lock); }

}  // namespace

#define ORIGINAL(function) \
  static constinit Original<decltype(&function)> original { #function }

#define LOCKS(function, Lock) \
  void function(Lock* lock) { \
    ORIGINAL(function);       \
    (*original)(lock);        \
    acquired(lock);           \
  }
#define TRIES(function, Lock)                 \
  gboolean function(Lock* lock) {             \
    ORIGINAL(function);                       \
    const gboolean taken = (*original)(lock); \
    if (taken) acquired(lock);                \
    return taken;                             \
  }
#define UNLOCKS(function, Lock) \
  void function(Lock* lock) {   \
    ORIGINAL(function);         \
    releasing(lock);            \
    (*original)(lock);          \
  }

extern "C" {

LOCKS(g_mutex_lock, GMutex)
TRIES(g_mutex_trylock, GMutex)
UNLOCKS(g_mutex_unlock, GMutex)
LOCKS(g_rec_mutex_lock, GRecMutex)
TRIES(g_rec_mutex_trylock, GRecMutex)
UNLOCKS(g_rec_mutex_unlock, GRecMutex)
LOCKS(g_rw_lock_reader_lock, GRWLock)
TRIES(g_rw_lock_reader_trylock, GRWLock)
UNLOCKS(g_rw_lock_reader_unlock, GRWLock)
LOCKS(g_rw_lock_writer_lock, GRWLock)
TRIES(g_rw_lock_writer_trylock, GRWLock)
UNLOCKS(g_rw_lock_writer_unlock, GRWLock)

void g_cond_wait(GCond* condition, GMutex* mutex) {
  ORIGINAL(g_cond_wait);
  releasing(mutex);
  (*original)(condition, mutex);
  acquired(mutex);
}

gboolean g_cond_wait_until(GCond* condition, GMutex* mutex, gint64 end) {
  ORIGINAL(g_cond_wait_until);
  releasing(mutex);
  const gboolean signalled = (*original)(condition, mutex, end);
  acquired(mutex);
  return signalled;
}

// The last holder of an object runs its destructor, and with it our destroy notifications: it comes after
// whatever the earlier holders did.
void g_object_unref(gpointer object) {
  ORIGINAL(g_object_unref);
  releasing(object);
  acquired(object);
  (*original)(object);
}

}  // extern "C"

// NOLINTEND
