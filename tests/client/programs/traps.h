/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TONEWERK_TESTS_TRAPS_H
#define TONEWERK_TESTS_TRAPS_H

/*
 * What a real-time thread must not do, made to be noticed: in a program that is linked with these, every
 * allocation and every lock of a thread with traps is remembered, and so is every system call where the
 * kernel allows a thread to be watched. The thread goes on; what it did is told afterwards.
 *
 * Compile without sanitizers, which have the same functions for themselves.
 */

#ifdef __cplusplus
extern "C" {
#endif

/* Once, before the thread starts. */
void traps_prepare(void);

/* From now on the calling thread may make no system call but that of traps_exit(), for good. 0, or the errno
 * with which the kernel refused. */
int traps_forbid_system_calls(void);

/* Between the two, the calling thread may neither allocate nor lock. */
void traps_begin(void);
void traps_end(void);

/* Ends the calling thread, which may be joined. Nothing of it is destroyed: that would take system calls. */
void traps_exit(void);

/* The first function that a thread called within its traps; NULL for none. */
const char* traps_function(void);
/* The number of the first system call; -1 for none. */
int traps_system_call(void);

#ifdef __cplusplus
}
#endif

#endif
