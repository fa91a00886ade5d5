// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <span>
#include <vector>

#include "bridges/pipewire/glitches/GlitchEvidence.h"
#include "bridges/pipewire/glitches/Verdict.h"

namespace tonewerk {

// Says whose a glitch was. The same evidence always gives the same verdict.
//
// A cycle is a chain: a node is signalled when the nodes before it have finished, wakes, computes and
// finishes. So the node that has not finished at the end may be innocent, because it was signalled late. The
// judge goes from it back through the chain, and blames the node whose own waking or computing took longest
// beyond what is usual for it. What the kernel said then tells why.
Verdict judgeGlitch(const GlitchEvidence& evidence);

// The nodes through which audio goes from `from` to `to`, both included, by the fewest links. Empty when
// there is no way.
std::vector<std::uint32_t> wayThrough(std::span<const NodeLink> links, std::uint32_t from, std::uint32_t to);

}  // namespace tonewerk
