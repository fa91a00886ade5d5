// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// `text` in gzip's format; none when there is no memory for it.
[[nodiscard]] std::optional<std::string> gzip(std::string_view text);

}  // namespace tonewerk
