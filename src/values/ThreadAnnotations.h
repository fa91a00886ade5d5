// SPDX-License-Identifier: Apache-2.0
#pragma once

// Declare which locks code needs; clang checks it (-Wthread-safety, an error in the presets `dev` and
// `tsan`). Other compilers ignore it.
//
//   int count_ GUARDED_BY(mutex_) = 0;         // read and written only while mutex_ is held
//   void removeOldest() REQUIRES(mutex_);      // the caller holds mutex_
//   void stop() EXCLUDES(mutex_);              // takes mutex_ itself, so the caller must not hold it
#if defined(__clang__)
#define TONEWERK_THREAD_ATTRIBUTE(x) __attribute__((x))
#else
#define TONEWERK_THREAD_ATTRIBUTE(x)
#endif

#define CAPABILITY(name) TONEWERK_THREAD_ATTRIBUTE(capability(name))
#define SCOPED_CAPABILITY TONEWERK_THREAD_ATTRIBUTE(scoped_lockable)
#define GUARDED_BY(mutex) TONEWERK_THREAD_ATTRIBUTE(guarded_by(mutex))
#define PT_GUARDED_BY(mutex) TONEWERK_THREAD_ATTRIBUTE(pt_guarded_by(mutex))
#define REQUIRES(...) TONEWERK_THREAD_ATTRIBUTE(requires_capability(__VA_ARGS__))
#define ACQUIRE(...) TONEWERK_THREAD_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define RELEASE(...) TONEWERK_THREAD_ATTRIBUTE(release_capability(__VA_ARGS__))
#define TRY_ACQUIRE(...) TONEWERK_THREAD_ATTRIBUTE(try_acquire_capability(__VA_ARGS__))
#define EXCLUDES(...) TONEWERK_THREAD_ATTRIBUTE(locks_excluded(__VA_ARGS__))
#define RETURN_CAPABILITY(mutex) TONEWERK_THREAD_ATTRIBUTE(lock_returned(mutex))
#define ASSERT_CAPABILITY(mutex) TONEWERK_THREAD_ATTRIBUTE(assert_capability(mutex))
#define NO_THREAD_SAFETY_ANALYSIS TONEWERK_THREAD_ATTRIBUTE(no_thread_safety_analysis)
