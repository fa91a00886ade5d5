// SPDX-License-Identifier: Apache-2.0
#include "client/ClientRegistry.h"

#include <chrono>
#include <memory>
#include <pthread.h>
#include <type_traits>
#include <utility>

#include "values/Mutex.h"

namespace tonewerk::clientRegistry {
namespace {

// None of these objects has a constructor or destructor that runs: other objects of the program may use them
// at any time before and after main().
static_assert(std::is_trivially_destructible_v<Mutex>);
constinit Mutex mutex;
constinit ClientEngine* first GUARDED_BY(mutex) = nullptr;  // the others are linked by nextClient
constinit bool isForkObserved GUARDED_BY(mutex) = false;

// A fork holds all locks, so that the child finds consistent objects and can unlock them.
void beforeFork() ACQUIRE(mutex) {
  mutex.lock();
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient) engine->beforeFork();
}

void afterForkInParent() RELEASE(mutex) {
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient)
    engine->afterForkInParent();
  mutex.unlock();
}

void afterForkInChild() RELEASE(mutex) {
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient)
    engine->afterForkInChild();
  mutex.unlock();
}

// Keeps a client alive, even if another thread destroys it meanwhile.
struct HeldClient {
  ClientEngine* engine = nullptr;
  std::shared_ptr<void> owner;
};

template <class Predicate>
HeldClient firstOf(Predicate isWanted) {
  const MutexLock lock(mutex);
  for (ClientEngine* engine = first; engine != nullptr; engine = engine->nextClient)
    if (isWanted(*engine)) return {engine, engine->owner};
  return {};
}

// Runs when the library is unloaded or the program ends. The clients' memory is kept, because the program may
// still hold pointers to them.
__attribute__((destructor)) void endThreads() {
  const auto hasThread = [](const ClientEngine& engine) { return engine.hasThread(); };
  for (HeldClient client = firstOf(hasThread); client.engine != nullptr; client = firstOf(hasThread))
    client.engine->abandon();
}

}  // namespace

bool add(ClientEngine& engine) {
  const MutexLock lock(mutex);
  if (!isForkObserved) {
    if (::pthread_atfork(beforeFork, afterForkInParent, afterForkInChild) != 0) return false;
    isForkObserved = true;
  }
  engine.nextClient = first;
  first = &engine;
  return true;
}

std::shared_ptr<void> remove(ClientEngine& engine) {
  const MutexLock lock(mutex);
  for (ClientEngine** link = &first; *link != nullptr; link = &(*link)->nextClient) {
    if (*link != &engine) continue;
    *link = engine.nextClient;
    break;
  }
  return std::move(engine.owner);
}

void reapDetached() {
  const auto isDead = [](const ClientEngine& engine) { return engine.isReapable(); };
  for (HeldClient client = firstOf(isDead); client.engine != nullptr; client = firstOf(isDead)) {
    client.engine->end(std::chrono::milliseconds::zero());
    remove(*client.engine).reset();
  }
}

}  // namespace tonewerk::clientRegistry

namespace tonewerk {

twr_client* makeClient(ClientSettings settings) {
  if (!ClientThread::isCurrent()) clientRegistry::reapDetached();
  const auto client = std::make_shared<twr_client>(std::move(settings));
  client->engine.owner = client;
  if (clientRegistry::add(client->engine)) return client.get();
  client->engine.owner = nullptr;
  return nullptr;
}

}  // namespace tonewerk
