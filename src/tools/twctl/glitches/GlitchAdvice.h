// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "tools/twctl/sessions/GlitchVerdict.h"

namespace tonewerk {

// What the cause of a glitch means, in a sentence for somebody who knows nothing of audio graphs.
[[nodiscard]] std::string meaningOf(const GlitchVerdict& verdict);

// What to do about it: sentences, the best first. There is always one.
[[nodiscard]] std::vector<std::string> remediesFor(const GlitchVerdict& verdict);

}  // namespace tonewerk
