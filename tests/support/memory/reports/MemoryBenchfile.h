// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <system_error>

#include "platform/Benchfile.h"
#include "support/memory/MemoryFileSystem.h"

namespace tonewerk {

// Writes benchmark data as lines of text in a MemoryFileSystem: "TWReporting 4", then for example "decode
// 1.5" for each value, or "decode 1.5 at 1763633880" where it is known when it began.
class MemoryBenchfile final : public Benchfile {
 public:
  // `files` outlives this.
  explicit MemoryBenchfile(MemoryFileSystem& files) : files_(files) {}

  [[nodiscard]] std::unique_ptr<BenchfileWriter> open(const std::string& path, const BenchfileFacts& facts,
                                                      int& systemError) override;

  std::int64_t reporterID = 0;  // of the newest file
  int openFailure = 0;          // opening fails with this error number
  std::errc closeFailure{};     // closing fails with it

 private:
  MemoryFileSystem& files_;
};

}  // namespace tonewerk
