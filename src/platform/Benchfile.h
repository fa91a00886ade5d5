// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// A benchmark data file being written. One thread. Destroyed without close() it leaves no file.
class BenchfileWriter {
 public:
  virtual ~BenchfileWriter() = default;

  // One measurement of what `name` stands for, in milliseconds; names repeat. A failure shows at close().
  virtual void newValue(std::string_view name, double milliseconds) = 0;

  // Once. With an error there is no file.
  [[nodiscard]] virtual std::error_code close() = 0;
};

// The benchmark data writer. Any thread.
class Benchfile {
 public:
  virtual ~Benchfile() = default;

  // Begins a new file, in the place of one of the same user's that stands there. Null when that fails; then
  // `systemError` is the system's error number.
  [[nodiscard]] virtual std::unique_ptr<BenchfileWriter> open(const std::string& path,
                                                              std::string_view dataName, int resultsVersion,
                                                              int& systemError) = 0;
};

}  // namespace tonewerk
