#include "zt/fnd/osdep/LockUntil.h"

#include <gtest/gtest.h>

#include <ctime>
#include <thread>

namespace zt::fnd::osdep {
namespace {

constexpr int64_t kMillisecond = 1000000;

int64_t Now() {
  timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return int64_t{now.tv_sec} * 1000 * kMillisecond + now.tv_nsec;
}

TEST(LockUntil, AFreeMutexIsLockedEvenAfterTheMoment) {
  pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
  ASSERT_TRUE(LockUntil(mutex, Now() - kMillisecond));
  EXPECT_NE(pthread_mutex_trylock(&mutex), 0);
  pthread_mutex_unlock(&mutex);
}

TEST(LockUntil, AHeldMutexIsGivenUpAtTheMoment) {
  pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
  pthread_mutex_lock(&mutex);
  const int64_t end = Now() + 20 * kMillisecond;
  std::thread([&] { EXPECT_FALSE(LockUntil(mutex, end)); }).join();
  EXPECT_GE(Now(), end);
  pthread_mutex_unlock(&mutex);
}

TEST(LockUntil, AMutexThatBecomesFreeIsLocked) {
  pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
  pthread_mutex_lock(&mutex);
  bool locked = false;
  std::thread waiter([&] {
    locked = LockUntil(mutex, Now() + 60000 * kMillisecond);
    if (locked) pthread_mutex_unlock(&mutex);
  });
  pthread_mutex_unlock(&mutex);
  waiter.join();
  EXPECT_TRUE(locked);
}

}  // namespace
}  // namespace zt::fnd::osdep
