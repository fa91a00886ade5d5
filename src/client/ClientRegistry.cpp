// SPDX-License-Identifier: Apache-2.0
#include "client/ClientRegistry.h"

#include <mutex>
#include <pthread.h>

#include "client/ClientEngine.h"

namespace tonewerk::clientRegistry {
namespace {

// Nothing here is ever constructed or destroyed: other objects of the program's may outlive any order.
constinit std::mutex mutex;
constinit ClientEngine* first = nullptr;  // the others by their links
constinit bool isForkObserved = false;

// Whoever forks holds all locks meanwhile, so that the child finds nothing half done, and can open them.
void beforeFork() {
  mutex.lock();
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient) engine->beforeFork();
}

void afterForkInParent() {
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient) engine->afterFork();
  mutex.unlock();
}

void afterForkInChild() {
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient) {
    engine->becomeForked();
    engine->afterFork();
  }
  mutex.unlock();
}

ClientEngine* firstWithThread() {
  const std::lock_guard lock(mutex);
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient)
    if (engine->hasThread()) return engine;
  return nullptr;
}

// The library is unloaded, or the program ends. The clients' memory stays: somebody may still hold them.
__attribute__((destructor)) void endThreads() {
  while (ClientEngine* engine = firstWithThread()) engine->abandon();
}

}  // namespace

bool add(ClientEngine& engine) {
  const std::lock_guard lock(mutex);
  if (!isForkObserved) {
    if (::pthread_atfork(beforeFork, afterForkInParent, afterForkInChild) != 0) return false;
    isForkObserved = true;
  }
  engine.nextClient = first;
  first = &engine;
  return true;
}

void remove(ClientEngine& engine) {
  const std::lock_guard lock(mutex);
  for (ClientEngine** link = &first; *link != nullptr; link = &(*link)->nextClient) {
    if (*link != &engine) continue;
    *link = engine.nextClient;
    return;
  }
}

bool isClientThread() {
  const std::lock_guard lock(mutex);
  for (const ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient)
    if (engine->isThisThread()) return true;
  return false;
}

}  // namespace tonewerk::clientRegistry
