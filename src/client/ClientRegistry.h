// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

namespace tonewerk {

class ClientEngine;

// The process's clients: for fork(), whose child has copies of them, and for the library's end.
namespace clientRegistry {

// False without memory for what fork() is to call.
bool add(ClientEngine& engine);
// Its owner, which is gone when the caller drops it, unless the library's end still holds it, too.
std::shared_ptr<void> remove(ClientEngine& engine);
// Removes and destroys the clients that were destroyed inside their own callbacks and have come to their end.
// Not inside a callback.
void reapDetached();

}  // namespace clientRegistry
}  // namespace tonewerk
