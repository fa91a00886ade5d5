/* SPDX-License-Identifier: Apache-2.0 */
#include "traps.h"

#include <dlfcn.h>
#include <errno.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <pthread.h>
#include <semaphore.h>
#include <signal.h>
#include <stdatomic.h>
#include <stddef.h>
#include <stdlib.h>
#include <string.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

static _Thread_local int has_traps;
static const char* _Atomic first_function;
static atomic_int first_system_call = -1;

static void notice(const char* function) {
  const char* none = NULL;
  if (has_traps) atomic_compare_exchange_strong(&first_function, &none, function);
}

/* ---- allocation: the C library has second names for its functions. new and delete call these. ---- */

extern void* __libc_malloc(size_t size);
extern void* __libc_calloc(size_t count, size_t size);
extern void* __libc_realloc(void* memory, size_t size);
extern void* __libc_memalign(size_t alignment, size_t size);
extern void __libc_free(void* memory);

void* malloc(size_t size) {
  notice("malloc");
  return __libc_malloc(size);
}

void* calloc(size_t count, size_t size) {
  notice("calloc");
  return __libc_calloc(count, size);
}

void* realloc(void* memory, size_t size) {
  notice("realloc");
  return __libc_realloc(memory, size);
}

void* aligned_alloc(size_t alignment, size_t size) {
  notice("aligned_alloc");
  return __libc_memalign(alignment, size);
}

void* memalign(size_t alignment, size_t size) {
  notice("memalign");
  return __libc_memalign(alignment, size);
}

int posix_memalign(void** memory, size_t alignment, size_t size) {
  notice("posix_memalign");
  *memory = __libc_memalign(alignment, size);
  return *memory != NULL ? 0 : ENOMEM;
}

void free(void* memory) {
  notice("free");
  __libc_free(memory);
}

/* ---- locks ---- */

/* Notes the call and passes it on. The union converts the pointer, because C does not convert a pointer to an
 * object into one to a function. */
#define TRAP(name, parameters, arguments)    \
  int name parameters {                      \
    static _Atomic(void*) known;             \
    union {                                  \
      void* object;                          \
      int(*function) parameters;             \
    } next;                                  \
    notice(#name);                           \
    next.object = atomic_load(&known);       \
    if (next.object == NULL) {               \
      next.object = dlsym(RTLD_NEXT, #name); \
      atomic_store(&known, next.object);     \
    }                                        \
    return next.function arguments;          \
  }

TRAP(pthread_mutex_lock, (pthread_mutex_t * mutex), (mutex))
TRAP(pthread_mutex_trylock, (pthread_mutex_t * mutex), (mutex))
TRAP(pthread_mutex_timedlock, (pthread_mutex_t * mutex, const struct timespec* until), (mutex, until))
TRAP(pthread_mutex_clocklock, (pthread_mutex_t * mutex, clockid_t clock, const struct timespec* until),
     (mutex, clock, until))
TRAP(pthread_mutex_unlock, (pthread_mutex_t * mutex), (mutex))
TRAP(pthread_rwlock_rdlock, (pthread_rwlock_t * lock), (lock))
TRAP(pthread_rwlock_tryrdlock, (pthread_rwlock_t * lock), (lock))
TRAP(pthread_rwlock_wrlock, (pthread_rwlock_t * lock), (lock))
TRAP(pthread_rwlock_trywrlock, (pthread_rwlock_t * lock), (lock))
TRAP(pthread_rwlock_unlock, (pthread_rwlock_t * lock), (lock))
TRAP(pthread_cond_wait, (pthread_cond_t * condition, pthread_mutex_t* mutex), (condition, mutex))
TRAP(pthread_cond_timedwait,
     (pthread_cond_t * condition, pthread_mutex_t* mutex, const struct timespec* until),
     (condition, mutex, until))
TRAP(pthread_cond_clockwait,
     (pthread_cond_t * condition, pthread_mutex_t* mutex, clockid_t clock, const struct timespec* until),
     (condition, mutex, clock, until))
TRAP(pthread_cond_signal, (pthread_cond_t * condition), (condition))
TRAP(pthread_cond_broadcast, (pthread_cond_t * condition), (condition))
TRAP(pthread_spin_lock, (pthread_spinlock_t * lock), (lock))
TRAP(pthread_spin_trylock, (pthread_spinlock_t * lock), (lock))
TRAP(pthread_spin_unlock, (pthread_spinlock_t * lock), (lock))
TRAP(sem_wait, (sem_t * semaphore), (semaphore))
TRAP(sem_trywait, (sem_t * semaphore), (semaphore))
TRAP(sem_timedwait, (sem_t * semaphore, const struct timespec* until), (semaphore, until))
TRAP(sem_clockwait, (sem_t * semaphore, clockid_t clock, const struct timespec* until),
     (semaphore, clock, until))
TRAP(sem_post, (sem_t * semaphore), (semaphore))

/* ---- system calls ---- */

/* Runs on the thread that made the call, which then continues as if the call had failed. */
static void on_system_call(int signal, siginfo_t* information, void* context) {
  int none = -1;
  (void)signal;
  (void)context;
  atomic_compare_exchange_strong(&first_system_call, &none, information->si_syscall);
}

void traps_prepare(void) {
  struct sigaction action;
  memset(&action, 0, sizeof action);
  action.sa_sigaction = on_system_call;
  action.sa_flags = SA_SIGINFO;
  sigaction(SIGSYS, &action, NULL);
}

int traps_forbid_system_calls(void) {
  /* Allows the system calls that end the thread and return from a signal handler. */
  struct sock_filter filter[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_exit, 2, 0),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_rt_sigreturn, 1, 0),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_TRAP),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  const struct sock_fprog program = {sizeof filter / sizeof filter[0], filter};
  if (prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) return errno;
  return syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, 0, &program) == 0 ? 0 : errno;
}

void traps_begin(void) { has_traps = 1; }

void traps_end(void) { has_traps = 0; }

void traps_exit(void) { syscall(SYS_exit, 0); }

const char* traps_function(void) { return atomic_load(&first_function); }

int traps_system_call(void) { return atomic_load(&first_system_call); }
