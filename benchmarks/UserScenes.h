// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <string>
#include <vector>

#include "support/users/Attacker.h"

namespace tonewerk {

// Says what one user does while another user's quiet client asks.
struct UserScene {
  std::string what;
  // Calls the function when the daemon has something to do, and goes on until its process is killed.
  std::function<void(Attacker&, const std::function<void()>& begun)> attack;
};

// Nothing, one and a hundred flooding connections, a large message that names one session thousands of
// times, and broadcasts to thousands of sessions.
std::vector<UserScene> userScenes();

// Runs `program` in a directory of its own, with the scene's user beside the quiet one, and returns how
// long each answer to the quiet one took. The users' clients are processes of their own. Only root can call
// it. A failure throws std::runtime_error.
std::vector<std::chrono::nanoseconds> measureBeside(const UserScene& scene, const std::string& program,
                                                    std::chrono::milliseconds duration);

}  // namespace tonewerk
