// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Writes a benchmark data file. One thread. Destroying it without close() leaves no file.
class BenchfileWriter {
 public:
  virtual ~BenchfileWriter() = default;

  // Adds one measurement of `name`, in milliseconds. A name may repeat. close() reports a failure.
  virtual void newValue(std::string_view name, double milliseconds) = 0;

  // Finishes the file. Call once. After an error there is no file.
  [[nodiscard]] virtual std::error_code close() = 0;
};

// Makes benchmark data files. Any thread.
class Benchfile {
 public:
  virtual ~Benchfile() = default;

  // Begins a new file. It replaces a file of the same user at `path`. Returns null on failure; `systemError`
  // is then the system's error number.
  [[nodiscard]] virtual std::unique_ptr<BenchfileWriter> open(const std::string& path,
                                                              std::string_view dataName, int resultsVersion,
                                                              int& systemError) = 0;
};

}  // namespace tonewerk
