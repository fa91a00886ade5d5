// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <vector>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"
#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// Runs collectors one after the other, with limits to the time and the bytes of each. A collector that
// exceeds its time is listed among the problems, and its thread keeps running. It is not called again until
// it has returned.
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

  // Runs all collectors. One thread at a time.
  [[nodiscard]] DiagnosticEvidence run();

  // Any thread. A running run() returns soon with the evidence collected so far; later ones return at once.
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
