// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "bridges/pipewire/graph/ProfileObserver.h"

struct pw_context;
struct pw_registry;

namespace tonewerk {

// Listens to a graph's profiler, as long as somebody wants it to: while anybody listens, every cycle of every
// driver costs the graph a note of its times.
//
// For the loop's thread.
class PipeWireProfiler {
 public:
  // Teaches the context the profiler's part of the protocol. Once, before any connection; false when the
  // library lacks it: a graph's profiler then cannot be found.
  [[nodiscard]] static bool teach(pw_context* context);

  // Both outlive this.
  PipeWireProfiler(pw_registry* registry, ProfileObserver& observer);
  PipeWireProfiler(const PipeWireProfiler&) = delete;
  PipeWireProfiler& operator=(const PipeWireProfiler&) = delete;
  ~PipeWireProfiler();

  // The graph has a profiler, under this number. Of several the first counts.
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
