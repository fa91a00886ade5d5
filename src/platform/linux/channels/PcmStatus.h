// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// What the kernel says of one substream of a sound card, in /proc/asound/card*/pcm*/sub*/status.
struct PcmStatus {
  std::string state;                    // as "RUNNING"; "closed" when nobody has it open
  std::int64_t hardwarePosition = 0;    // frames since it was prepared; 0 when closed
  std::int64_t delay = 0;               // frames on their way; 0 when closed
  std::uint64_t stateMilliseconds = 0;  // for how long it has been in its state; 0 when nobody knows

  // `status` and `parameters` are the files of these names ("status", "hw_params"). None when `status` is not
  // in the kernel's form.
  //
  // How long the state lasts is the time stamp's distance from the last trigger. Most programs let the kernel
  // take time stamps; where none does, a running substream's position at its rate says as much.
  [[nodiscard]] static std::optional<PcmStatus> parse(std::string_view status, std::string_view parameters);
};

}  // namespace tonewerk
