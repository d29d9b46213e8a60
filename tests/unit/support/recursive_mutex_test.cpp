// The recursive mutex.
#include "support/recursive_mutex.h"

#include <gtest/gtest.h>

#include <thread>

namespace lmx {
namespace {

int tryLockElsewhere(pthread_mutex_t& mutex) {
  int result = -1;
  std::thread([&] {
    result = pthread_mutex_trylock(&mutex);
    if (result == 0) pthread_mutex_unlock(&mutex);
  }).join();
  return result;
}

TEST(RecursiveMutex, IsReleasedOnlyByTheLastUnlock) {
  pthread_mutex_t mutex;
  agent_init_recursive_mutex(&mutex);
  pthread_mutex_lock(&mutex);
  pthread_mutex_lock(&mutex);
  pthread_mutex_unlock(&mutex);
  EXPECT_EQ(tryLockElsewhere(mutex), EBUSY);
  pthread_mutex_unlock(&mutex);
  EXPECT_EQ(tryLockElsewhere(mutex), 0);
  pthread_mutex_destroy(&mutex);
}

}  // namespace
}  // namespace lmx
