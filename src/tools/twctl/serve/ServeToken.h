// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// A new secret of 160 bits as 40 hexadecimal digits, from the system's random numbers. None when the system
// has none.
[[nodiscard]] std::optional<std::string> newServeToken();

// Compares in a time that depends on the length of `given` only, so that nobody can guess a secret letter by
// letter.
[[nodiscard]] bool isSameSecret(std::string_view given, std::string_view secret);

}  // namespace tonewerk
