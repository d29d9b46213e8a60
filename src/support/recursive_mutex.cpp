// Creates the agent's recursive mutexes.
#include "support/recursive_mutex.h"

#include <sysexits.h>
#include <unistd.h>

namespace lmx {

void agent_init_recursive_mutex(pthread_mutex_t* mutex) {
  pthread_mutexattr_t attribute;
  if (pthread_mutexattr_init(&attribute) != 0) _exit(EX_OSERR);
  const bool made = pthread_mutexattr_settype(&attribute, PTHREAD_MUTEX_RECURSIVE) == 0 &&
                    pthread_mutex_init(mutex, &attribute) == 0;
  if (!made) _exit(EX_OSERR);
  pthread_mutexattr_destroy(&attribute);
}

}  // namespace lmx
