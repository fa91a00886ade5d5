// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Writes a benchmark data file. One thread. Destroying it without close() leaves no file.
class BenchfileWriter {
 public:
  virtual ~BenchfileWriter() = default;

  // Adds one measurement of `name`, in milliseconds, and when it began, in seconds since 1970, where that is
  // known. A name may repeat. close() reports a failure.
  virtual void newValue(std::string_view name, double milliseconds, std::optional<double> beginTime) = 0;

  // Finishes the file. Call once. After an error there is no file.
  [[nodiscard]] virtual std::error_code close() = 0;
};

// What a benchmark data file has.
struct BenchfileFacts {
  std::string_view dataName;
  int resultsVersion = 0;
  std::int64_t reporterID = 0;  // of the session that it is of
};

// Makes benchmark data files. Any thread.
class Benchfile {
 public:
  virtual ~Benchfile() = default;

  // Begins a new file. It replaces a file of the same user at `path`. Returns null on failure; `systemError`
  // is then the system's error number.
  [[nodiscard]] virtual std::unique_ptr<BenchfileWriter> open(const std::string& path,
                                                              const BenchfileFacts& facts,
                                                              int& systemError) = 0;
};

}  // namespace tonewerk
