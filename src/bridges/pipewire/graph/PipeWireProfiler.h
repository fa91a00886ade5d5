// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "bridges/pipewire/graph/ProfileObserver.h"

struct pw_context;
struct pw_registry;

namespace tonewerk {

// Listens to a graph's profiler while setWanted() asks for it. While any program listens, the graph records
// the times of every cycle of every driver, which costs it time.
//
// Used on the loop's thread only.
class PipeWireProfiler {
 public:
  // Loads the profiler's part of the protocol into the context. Call it once, before any connection. False
  // when the library lacks it: a graph's profiler then cannot be used.
  [[nodiscard]] static bool loadProtocol(pw_context* context);

  // Both outlive this object.
  PipeWireProfiler(pw_registry* registry, ProfileObserver& observer);
  PipeWireProfiler(const PipeWireProfiler&) = delete;
  PipeWireProfiler& operator=(const PipeWireProfiler&) = delete;
  ~PipeWireProfiler();

  // The graph has a profiler of this number. Of several, the first is used.
  void appeared(std::uint32_t identifier);
  void removed(std::uint32_t identifier);
  void setWanted(bool isWanted);

 private:
  class Bound;

  void update();

  pw_registry* registry_;
  ProfileObserver& observer_;
  bool isWanted_ = false;
  std::optional<std::uint32_t> identifier_;
  std::unique_ptr<Bound> bound_;
};

}  // namespace tonewerk
