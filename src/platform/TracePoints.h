// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// Marks points in the daemon's run to which a tracer can listen. Any thread. Costs next to nothing while
// nobody listens.
class TracePoints {
 public:
  virtual ~TracePoints() = default;

  virtual void emit(std::uint32_t code) = 0;

  // Mark an interval for performance traces. It begins and ends on the same thread. `identifier`
  // distinguishes intervals with the same name.
  virtual void beginInterval(const char* name, std::int64_t identifier) = 0;
  virtual void endInterval(const char* name, std::int64_t identifier) = 0;
};

}  // namespace tonewerk
