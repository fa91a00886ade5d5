// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "bridges/pipewire/graph/AudioFormat.h"
#include "bridges/pipewire/graph/StreamVolume.h"

struct spa_pod;

namespace tonewerk {

// What a node's parameters say, out of PipeWire's binary form. Both take any well-formed pod; what it does
// not hold is not in the result.

StreamVolume volumeOf(const spa_pod& properties);

// None when it is no format of sound, or lacks rate or coding.
[[nodiscard]] std::optional<AudioFormat> formatOf(const spa_pod& format);

}  // namespace tonewerk
