// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "bridges/pipewire/graph/AudioFormat.h"
#include "bridges/pipewire/graph/StreamVolume.h"

struct spa_pod;

namespace tonewerk {

// These functions read a node's parameters from PipeWire's binary form. Both accept any pod whose own size is
// right; a value that the pod does not hold is missing in the result. Of a pod that is not well-formed
// (PodCheck.h), every value is missing.

StreamVolume volumeOf(const spa_pod& properties);

// None when the format is not one of audio, or lacks the rate or the encoding.
[[nodiscard]] std::optional<AudioFormat> formatOf(const spa_pod& format);

}  // namespace tonewerk
