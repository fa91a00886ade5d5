// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>

namespace tonewerk {

// Which overloads of audio I/O are worth a stall trace. One of the process's single objects: every worker
// that is made reads it anew, for all workers. On the work queue.
struct TWReportingDPSettings {
  std::int32_t ioBufferSize = 0;  // smallest buffer that counts, in frames
  std::int32_t ioCycle = 0;       // smallest I/O cycle that counts
  std::chrono::microseconds waitTime{0};
};

}  // namespace tonewerk
