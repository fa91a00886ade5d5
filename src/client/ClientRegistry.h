// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <utility>

#include "client/ClientEngine.h"

// What callers hold of a client.
struct twr_client {  // NOLINT(readability-identifier-naming)
  explicit twr_client(tonewerk::ClientSettings settings) : engine(std::move(settings)) {}

  tonewerk::ClientEngine engine;
};

namespace tonewerk {

// A client that is in the registry and holds itself until it is destroyed. Null without memory.
[[nodiscard]] twr_client* makeClient(ClientSettings settings);

// The process's clients: for fork(), whose child has copies of them, and for the library's end.
namespace clientRegistry {

// False without memory for what fork() is to call.
[[nodiscard]] bool add(ClientEngine& engine);
// Its owner, which is gone when the caller drops it, unless the library's end still holds it, too.
[[nodiscard]] std::shared_ptr<void> remove(ClientEngine& engine);
// Removes and destroys the clients that were destroyed inside their own callbacks and have come to their end.
// Not inside a callback.
void reapDetached();

}  // namespace clientRegistry
}  // namespace tonewerk
