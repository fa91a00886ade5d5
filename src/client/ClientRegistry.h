// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <utility>

#include "client/ClientEngine.h"

// The object behind the pointer that callers hold.
struct twr_client {  // NOLINT(readability-identifier-naming)
  explicit twr_client(tonewerk::ClientSettings settings) : engine(std::move(settings)) {}

  tonewerk::ClientEngine engine;
};

namespace tonewerk {

// Makes a client, adds it to the registry, and lets it keep itself alive until it is destroyed. Null without
// memory.
[[nodiscard]] twr_client* makeClient(ClientSettings settings);

// Lists the process's clients. fork() needs them, because the child has copies of them, and so does the
// unloading of the library.
namespace clientRegistry {

// False when there is no memory to register the functions that fork() calls.
[[nodiscard]] bool add(ClientEngine& engine);
// Returns the client's owner. Dropping it destroys the client, unless the unloading of the library holds it,
// too.
[[nodiscard]] std::shared_ptr<void> remove(ClientEngine& engine);
// Removes and frees the clients that were destroyed inside their own callbacks and whose threads have
// finished. Must not be called inside a callback.
void reapDetached();

}  // namespace clientRegistry
}  // namespace tonewerk
