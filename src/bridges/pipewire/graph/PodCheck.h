// SPDX-License-Identifier: Apache-2.0
#pragma once

struct spa_pod;

namespace tonewerk {

// Returns whether everything inside `pod` lies within it: elements, properties, and the values of arrays and
// choices, whose sizes must be those of their types. PipeWire checks only that the pod itself lies within its
// message, and its functions for reading pods rely on the rest. The parts come from any of its clients.
//
// The pod's own size must be right. Pods that nest too deep are refused.
[[nodiscard]] bool isWellFormed(const spa_pod& pod);

}  // namespace tonewerk
