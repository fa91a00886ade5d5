// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// Points in the daemon's run that a tracer can listen to. Any thread; costs next to nothing when nobody
// listens.
class TracePoints {
 public:
  virtual ~TracePoints() = default;

  virtual void emit(std::uint32_t code) = 0;

  // Something takes from here to its end, on this thread; for performance traces. `identifier` tells those of
  // one name apart.
  virtual void beginInterval(const char* name, std::int64_t identifier) = 0;
  virtual void endInterval(const char* name, std::int64_t identifier) = 0;
};

}  // namespace tonewerk
