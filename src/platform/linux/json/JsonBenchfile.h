// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Benchfile.h"

namespace tonewerk {

class Clock;

// Benchmark data as JSON in the layout that Google Benchmark's comparison tools read: a "context", which here
// holds the data's name and version, and "benchmarks", one entry a line for each value. A trace knows nothing
// of processor time, which those tools ask for: "cpu_time" repeats "real_time".
//
// What stands at a file's path is removed first, so that a new file is made and no link followed.
class JsonBenchfile final : public Benchfile {
 public:
  // `clock` outlives this.
  explicit JsonBenchfile(const Clock& clock) : clock_(clock) {}

  [[nodiscard]] std::unique_ptr<BenchfileWriter> open(const std::string& path, std::string_view dataName,
                                                      int resultsVersion, int& systemError) override;

 private:
  const Clock& clock_;
};

}  // namespace tonewerk
