// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/AudioFormat.h"

namespace tonewerk {

std::string AudioFormat::text() const {
  const std::string& name = sampleFormat.empty() ? coding : sampleFormat;
  return name + " " + std::to_string(rateHertz) + " Hz " + std::to_string(channels) + " ch";
}

}  // namespace tonewerk
