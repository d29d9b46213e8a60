// Making recursive mutexes.
#include "support/recursive_mutex.h"

#include <unistd.h>

namespace lmx {

void agent_init_recursive_mutex(pthread_mutex_t* mutex) {
  constexpr int kExitOperatingSystem = 71;
  pthread_mutexattr_t attributes;
  pthread_mutexattr_init(&attributes);
  pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
  const int result = pthread_mutex_init(mutex, &attributes);
  pthread_mutexattr_destroy(&attributes);
  if (result != 0) _exit(kExitOperatingSystem);
}

}  // namespace lmx
