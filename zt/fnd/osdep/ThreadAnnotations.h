#pragma once

// Lock annotations that clang checks (-Wthread-safety); nothing elsewhere.
//
//   CAPABILITY           the class is a lock
//   SCOPED_CAPABILITY    its constructor takes a lock, its destructor releases it
//   GUARDED_BY           the member is used under that lock only; PT_: what it points to
//   REQUIRES, EXCLUDES   the caller holds the lock, or must not hold it
//   ACQUIRE, RELEASE     the function ends with the lock held, or without it
//   RETURN_CAPABILITY    the function returns that very lock
//
// The raw enter() and leave() of the primitives carry none, because ownership there crosses
// functions and is recursive. Checked code takes its locks through Hold (Hold.h).
#if defined(__clang__)
#define ZT_THREAD_ANNOTATION(x) __attribute__((x))
#else
#define ZT_THREAD_ANNOTATION(x)
#endif

#define CAPABILITY(name) ZT_THREAD_ANNOTATION(capability(name))
#define SCOPED_CAPABILITY ZT_THREAD_ANNOTATION(scoped_lockable)
#define GUARDED_BY(lock) ZT_THREAD_ANNOTATION(guarded_by(lock))
#define PT_GUARDED_BY(lock) ZT_THREAD_ANNOTATION(pt_guarded_by(lock))
#define REQUIRES(...) ZT_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))
#define EXCLUDES(...) ZT_THREAD_ANNOTATION(locks_excluded(__VA_ARGS__))
#define ACQUIRE(...) ZT_THREAD_ANNOTATION(acquire_capability(__VA_ARGS__))
#define RELEASE(...) ZT_THREAD_ANNOTATION(release_capability(__VA_ARGS__))
#define RETURN_CAPABILITY(lock) ZT_THREAD_ANNOTATION(lock_returned(lock))
#define NO_THREAD_SAFETY_ANALYSIS ZT_THREAD_ANNOTATION(no_thread_safety_analysis)
