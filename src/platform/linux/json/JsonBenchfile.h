// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Benchfile.h"

namespace tonewerk {

class Clock;

// Writes benchmark data as JSON in the layout that Google Benchmark's comparison tools read: a "context" with
// the name and the version of the data, and "benchmarks" with one entry per value and line. Those tools
// require processor times, which a trace does not have; so "cpu_time" repeats "real_time". They ignore
// "begin", in seconds since 1970.
//
// The file is written under the path with ".new", and gets its name when it is complete and on the disk.
// open() first removes what is at both paths, so it follows no link, and an earlier file is not taken for the
// new one.
class JsonBenchfile final : public Benchfile {
 public:
  // `clock` must outlive this object.
  explicit JsonBenchfile(const Clock& clock) : clock_(clock) {}

  [[nodiscard]] std::unique_ptr<BenchfileWriter> open(const std::string& path, const BenchfileFacts& facts,
                                                      int& systemError) override;

 private:
  const Clock& clock_;
};

}  // namespace tonewerk
