// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <vector>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"
#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// Runs collectors one after the other, each for a bounded time, and takes a bounded number of bytes from
// each. One that hangs is named among the problems and left behind on its thread; until it returns it is
// not asked again.
class CollectorRunner {
 public:
  struct Limits {
    std::chrono::milliseconds time{10'000};
    std::size_t bytes = std::size_t{4} << 20;
  };

  CollectorRunner(std::vector<std::shared_ptr<DiagnosticCollector>> collectors, const Limits& limits);
  CollectorRunner(const CollectorRunner&) = delete;
  CollectorRunner& operator=(const CollectorRunner&) = delete;
  ~CollectorRunner();

  // One thread.
  [[nodiscard]] DiagnosticEvidence run();

  // Any thread. A run() under way returns soon, and later ones at once: with what was collected so far.
  void interrupt();

 private:
  struct Shared;

  [[nodiscard]] DiagnosticCollector::Result runOne(std::size_t index);
  [[nodiscard]] DiagnosticCollector::Result await(std::size_t index);

  const Limits limits_;
  const std::vector<std::shared_ptr<DiagnosticCollector>> collectors_;
  const std::shared_ptr<Shared> shared_;  // used by the collectors' threads, which may outlive this
};

}  // namespace tonewerk
