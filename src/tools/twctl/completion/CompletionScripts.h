// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <optional>
#include <string_view>

namespace tonewerk {

// The shells that twctl knows.
inline constexpr std::array<std::string_view, 3> kCompletionShells = {"bash", "zsh", "fish"};

// The script that makes a shell ask twctl; none for another shell. The packages install the same texts.
[[nodiscard]] std::optional<std::string_view> completionScriptFor(std::string_view shell);

}  // namespace tonewerk
