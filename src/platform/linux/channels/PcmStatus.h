// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// The kernel's status of one substream of a sound card, from /proc/asound/card*/pcm*/sub*/status.
struct PcmStatus {
  std::string state;                    // such as "RUNNING"; "closed" if no process has it open
  std::int64_t hardwarePosition = 0;    // frames since it was prepared; 0 if closed
  std::int64_t delay = 0;               // frames between the program and the hardware's output; 0 if closed
  std::uint64_t stateMilliseconds = 0;  // time in the present state; 0 if unknown

  // `status` and `parameters` are the contents of the files "status" and "hw_params". None if `status` does
  // not have the kernel's form.
  //
  // The time in the state is the difference between the time stamp and the last trigger. Most programs let
  // the kernel take time stamps. Without them, a running substream's time is its position divided by its
  // rate.
  [[nodiscard]] static std::optional<PcmStatus> parse(std::string_view status, std::string_view parameters);
};

}  // namespace tonewerk
