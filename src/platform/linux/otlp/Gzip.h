// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// Compresses `text` in gzip's format; none if there is not enough memory.
[[nodiscard]] std::optional<std::string> gzip(std::string_view text);

}  // namespace tonewerk
