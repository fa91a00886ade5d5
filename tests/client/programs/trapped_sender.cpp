// SPDX-License-Identifier: Apache-2.0
//
// A real-time thread that sends while everything it must not do is trapped. Prints "taken N dropped N" when
// nothing was trapped and ends with status 0; else "trapped WHAT" and 1. Status 3 where the kernel does not
// let system calls be trapped.
//
//   trapped_sender ACTION [without-system-calls]
//
// ACTION is "send", or something that has to be trapped, which is done once among the sending.

#include <atomic>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <map>
#include <mutex>
#include <new>
#include <pthread.h>
#include <semaphore.h>
#include <shared_mutex>
#include <string>
#include <thread>
#include <unistd.h>

#include "client/MessageRing.h"
#include "client/programs/traps.h"

namespace {

constexpr std::uint32_t kMessages = 100'000;
constexpr std::size_t kRingBytes = 4096;

// Compilers may leave out an allocation whose result goes nowhere.
void* volatile theMemory = nullptr;

// What the traps have to catch.
const std::map<std::string, std::function<void()>>& misdeeds() {
  static void* const memory = std::malloc(16);
  static std::mutex mutex;
  static std::shared_mutex sharedMutex;
  static pthread_spinlock_t spinLock;
  static pthread_cond_t condition = PTHREAD_COND_INITIALIZER;
  static sem_t semaphore;
  pthread_spin_init(&spinLock, PTHREAD_PROCESS_PRIVATE);
  sem_init(&semaphore, 0, 1);
  static const std::map<std::string, std::function<void()>> all = {
      {"send", [] {}},
      {"malloc", [] { theMemory = std::malloc(16); }},
      {"calloc", [] { theMemory = std::calloc(1, 16); }},
      {"realloc", [] { theMemory = std::realloc(memory, 32); }},
      {"free", [] { std::free(memory); }},
      {"aligned_alloc", [] { theMemory = std::aligned_alloc(64, 64); }},
      {"new", [] { theMemory = ::operator new(16); }},
      {"delete", [] { ::operator delete(memory); }},
      {"mutex", [] { mutex.lock(); }},
      {"rwlock", [] { sharedMutex.lock_shared(); }},
      {"spin", [] { pthread_spin_lock(&spinLock); }},
      {"cond", [] { pthread_cond_signal(&condition); }},
      {"sem", [] { sem_post(&semaphore); }},
      {"getppid", [] { std::ignore = ::getppid(); }},
  };
  return all;
}

struct Run {
  tonewerk::MessageRing ring{kRingBytes};
  const std::function<void()>* misdeed = nullptr;
  bool forbidsSystemCalls = true;
  int problem = 0;  // why they cannot be
  std::uint64_t sent = 0;
  std::uint64_t taken = 0;
  std::atomic<bool> isDone{false};
};

// Every function that builds, one failure, and the ring's answer to each, whatever it is.
void sendOne(Run& run, std::uint32_t number) {
  unsigned char memory[256];
  twr_payload payload;
  twr_payload_init(&payload, memory, sizeof memory);
  twr_put_uint(&payload, "number", number);
  twr_put_int(&payload, "offset", -5);
  twr_put_bool(&payload, "running", 1);
  twr_put_double(&payload, "level", 0.5 + number);
  twr_put_date(&payload, "at", 1763633999.25 + number);
  twr_put_text(&payload, "device", "Kopfh\xC3\xB6rer");
  twr_open_map(&payload, "inner");
  twr_open_list(&payload, "list");
  twr_put_text_n(&payload, nullptr, "abcdef", 3);
  twr_close(&payload);
  twr_close(&payload);
  if (number % 1000 == 0) twr_put_text(&payload, "bad", "\xFF");
  if (run.ring.push(TWR_CATEGORY_IO, TWR_TYPE_STATE, payload) == TWR_OK) ++run.sent;
}

void* sendAll(void* given) {
  Run& run = *static_cast<Run*>(given);
  if (run.forbidsSystemCalls) run.problem = traps_forbid_system_calls();
  if (run.problem == 0) {
    traps_begin();
    for (std::uint32_t number = 0; number < kMessages; ++number) {
      if (number == kMessages / 2) (*run.misdeed)();
      sendOne(run, number);
    }
    traps_end();
  }
  run.isDone = true;
  traps_exit();
  return nullptr;
}

void takeAll(Run& run) {
  bool isDone = false;
  while (!isDone) {
    isDone = run.isDone;
    // Lets the ring run full once, however the threads are scheduled.
    if (run.ring.dropped() < 2 && !isDone) continue;
    for (; run.ring.front(); run.ring.pop()) ++run.taken;
  }
}

int report(const Run& run) {
  if (run.problem != 0) {
    std::printf("%s\n", std::strerror(run.problem));
    return 3;
  }
  if (traps_function() != nullptr) {
    std::printf("trapped %s\n", traps_function());
    return 1;
  }
  if (traps_system_call() >= 0) {
    std::printf("trapped system call %d\n", traps_system_call());
    return 1;
  }
  const auto dropped = static_cast<unsigned long long>(run.ring.dropped());
  std::printf("taken %llu dropped %llu\n", static_cast<unsigned long long>(run.taken), dropped);
  return run.taken == run.sent && run.taken + dropped == kMessages ? 0 : 4;
}

}  // namespace

int main(int count, char** arguments) {
  const auto& all = misdeeds();
  const auto chosen = count > 1 ? all.find(arguments[1]) : all.end();
  if (chosen == all.end()) return 2;
  Run run;
  run.misdeed = &chosen->second;
  run.forbidsSystemCalls = count == 2;

  traps_prepare();
  pthread_t thread{};
  if (pthread_create(&thread, nullptr, sendAll, &run) != 0) return 2;
  takeAll(run);
  pthread_join(thread, nullptr);
  return report(run);
}
