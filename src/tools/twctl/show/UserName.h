// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

namespace tonewerk {

// Returns the name of a user, or its number when it has none, printable.
std::string userName(std::uint64_t user);

}  // namespace tonewerk
