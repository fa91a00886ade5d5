// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tonewerk {

class ClientEngine;

// The process's clients: for fork(), whose child has copies of them, and for the library's end.
namespace clientRegistry {

// False without memory for what fork() is to call.
bool add(ClientEngine& engine);
void remove(ClientEngine& engine);
// Whether the caller is the thread of a client, of whichever: inside a callback. Under no engine's mutex.
bool isClientThread();

}  // namespace clientRegistry
}  // namespace tonewerk
