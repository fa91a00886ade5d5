// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>

#include "platform/Kolvi.h"

namespace tonewerk {

// Reads traces in a process of its own, tw-trace-reader, within bounds of time and size: a damaged trace may
// hang or end whoever reads it.
//
// A trace is only good with the daemon's own signpost at its beginning and its end (see LttngRuntrace).
class TraceReaderKolvi final : public Kolvi {
 public:
  static constexpr std::chrono::seconds kTimeout{60};
  static constexpr std::size_t kMaxBytes = std::size_t{512} << 20;  // some 30 million intervals

  explicit TraceReaderKolvi(std::string readerPath, std::chrono::milliseconds timeout = kTimeout);

  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;

 private:
  const std::string readerPath_;
  const std::chrono::milliseconds timeout_;
};

}  // namespace tonewerk
