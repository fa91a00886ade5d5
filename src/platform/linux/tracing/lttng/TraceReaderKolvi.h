// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>

#include "platform/Kolvi.h"

namespace tonewerk {

// Reads traces in a separate process, tw-trace-reader, with limits to its time and output. A damaged trace
// can make its reader hang or crash.
//
// A trace is valid only if the daemon's own signpost is at its beginning and its end (see LttngRuntrace).
class TraceReaderKolvi final : public Kolvi {
 public:
  static constexpr std::chrono::seconds kTimeout{60};
  static constexpr std::size_t kMaxBytes = std::size_t{512} << 20;  // about 30 million intervals

  explicit TraceReaderKolvi(std::string readerPath, std::chrono::milliseconds timeout = kTimeout);

  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;

 private:
  const std::string readerPath_;
  const std::chrono::milliseconds timeout_;
};

}  // namespace tonewerk
