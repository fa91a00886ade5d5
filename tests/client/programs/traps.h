/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TONEWERK_TESTS_TRAPS_H
#define TONEWERK_TESTS_TRAPS_H

/*
 * Traps notice forbidden actions of a real-time thread. In a program that is linked with them, they record
 * the first allocation or lock of a thread with traps, and its first system call if the kernel allows the
 * thread to be watched. The thread continues, and the program asks for the records afterwards.
 *
 * Compile without sanitizers, which replace the same functions.
 */

#ifdef __cplusplus
extern "C" {
#endif

/* To be called once, before the thread starts. */
void traps_prepare(void);

/* From now on the calling thread may make no system call except that of traps_exit(). This cannot be undone.
 * Returns 0, or the errno with which the kernel refused. */
int traps_forbid_system_calls(void);

/* Between these two calls, the calling thread must not allocate or lock. */
void traps_begin(void);
void traps_end(void);

/* Ends the calling thread, which may be joined. Its objects stay: destroying them takes system calls. */
void traps_exit(void);

/* The first function that a thread called within its traps; NULL for none. */
const char* traps_function(void);
/* The number of the first system call; -1 for none. */
int traps_system_call(void);

#ifdef __cplusplus
}
#endif

#endif
