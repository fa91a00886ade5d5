// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>

namespace tonewerk {

// Which overloads of audio I/O cause a request for a stall trace. One of the process's single objects: each
// worker that is made reads the settings again, for all workers. Used on the work queue.
struct TWReportingDPSettings {
  std::int32_t ioBufferSize = 0;  // the smallest buffer that counts, in frames
  std::int32_t ioCycle = 0;       // the smallest I/O cycle that counts
  std::chrono::microseconds waitTime{0};
};

}  // namespace tonewerk
