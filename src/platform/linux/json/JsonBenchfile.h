// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Benchfile.h"

namespace tonewerk {

class Clock;

// Writes benchmark data as JSON in the layout that Google Benchmark's comparison tools read: a "context" with
// the name and the version of the data, and "benchmarks" with one entry per value and line. Those tools
// require processor times, which a trace does not have; so "cpu_time" repeats "real_time".
//
// open() first removes any file at the path. So it always creates a new file and follows no link.
class JsonBenchfile final : public Benchfile {
 public:
  // `clock` must outlive this object.
  explicit JsonBenchfile(const Clock& clock) : clock_(clock) {}

  [[nodiscard]] std::unique_ptr<BenchfileWriter> open(const std::string& path, std::string_view dataName,
                                                      int resultsVersion, int& systemError) override;

 private:
  const Clock& clock_;
};

}  // namespace tonewerk
