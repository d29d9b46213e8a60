// The recursive mutex.
#include "support/recursive_mutex.h"

#include <gtest/gtest.h>

#include <mutex>
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

TEST(RecursiveMutex, OneThreadLocksItTwice) {
  RecursiveMutex mutex;
  EXPECT_EQ(mutex.lock(), 0);
  EXPECT_EQ(mutex.lock(), 0);
  EXPECT_EQ(mutex.unlock(), 0);
  EXPECT_EQ(mutex.unlock(), 0);
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

TEST(RecursiveMutex, GuardsACounter) {
  RecursiveMutex mutex;
  int counter = 0;
  const auto count = [&] {
    for (int i = 0; i < 10000; ++i) {
      const std::lock_guard outer(mutex);
      const std::lock_guard inner(mutex);
      ++counter;
    }
  };
  std::thread other(count);
  count();
  other.join();
  EXPECT_EQ(counter, 20000);
}

}  // namespace
}  // namespace lmx
