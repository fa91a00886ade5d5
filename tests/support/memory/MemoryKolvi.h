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

// Traces that a test makes up: which intervals a signpost has, in a unit of time of its own. One thread.
//
//   kolvi.intervals["decode"] = {1000, 2500};       // microseconds
class MemoryKolvi final : public Kolvi {
 public:
  static constexpr double kUnitSeconds = 1e-6;

  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;

  std::map<std::string, std::vector<std::uint64_t>> intervals;  // by signpost
  std::optional<std::string> failure;                           // opening fails with it
  std::vector<std::string> opened;                              // the locations so far
};

}  // namespace tonewerk
