// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/Kolvi.h"

namespace tonewerk {

// Provides traces that a test defines: the intervals of each signpost, in the test's own unit of time. One
// thread.
//
//   kolvi.intervals["decode"] = {1000, 2500};       // microseconds
class MemoryKolvi final : public Kolvi {
 public:
  static constexpr double kUnitSeconds = 1e-6;

  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;

  std::map<std::string, std::vector<std::uint64_t>> intervals;  // by signpost
  std::optional<double> beginTime;                              // of each interval; seconds since 1970
  std::optional<std::string> failure;                           // opening fails with it
  std::vector<std::string> opened;                              // the locations that were opened
};

}  // namespace tonewerk
