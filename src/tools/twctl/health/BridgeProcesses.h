// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

struct BridgeProcess {
  std::int32_t identifier = 0;
  std::uint32_t user = 0;
};

// Finds the PipeWire bridges that the caller can see. `processes` is "/proc", or a copy of its layout.
[[nodiscard]] std::vector<BridgeProcess> findBridges(const std::string& processes = "/proc");

}  // namespace tonewerk
