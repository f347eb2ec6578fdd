#pragma once

#include <pthread.h>

#include <cstdint>

// Changes the counter atomically and returns the new value.
int ZTInterlockedInc(int* counter);
int ZTInterlockedDec(int* counter);
// The value that the counter has at some moment of the call.
int ZTInterlockedGet(int* counter);
// The calling thread, for comparison by pthread_equal only.
pthread_t ZTGetThreadId();

// Lock of one process, not recursive, that knows its owner.
//
//   state \ call   Lock                 Unlock   IsNesting
//   free           taken                -        false
//   held by me     waits indefinitely   free     true
//   held by other  waits, then taken    free     false
//
// A Lock that finds the lock taken although the underlying mutex was free aborts the process: the
// lock's memory has been overwritten. Threads: any; an object outlives its users.
class CZTMutex {
 public:
  CZTMutex();
  virtual ~CZTMutex();
  CZTMutex(const CZTMutex&) = delete;
  CZTMutex& operator=(const CZTMutex&) = delete;

  void Lock();
  void Unlock();
  // For code that would otherwise wait for itself.
  bool IsNesting() const;

 private:
  struct State;
  State* m_state;
};
