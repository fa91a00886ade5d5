// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryBenchfile.h"

#include <utility>

#include "values/Value.h"

namespace tonewerk {
namespace {

class MemoryWriter final : public BenchfileWriter {
 public:
  MemoryWriter(MemoryFileSystem& files, std::string path, std::string text, std::errc failure)
      : files_(files), path_(std::move(path)), text_(std::move(text)), failure_(failure) {}

  void newValue(std::string_view name, double milliseconds, std::optional<double> beginTime) override {
    text_ += std::string(name) + " " + Value(milliseconds).text();
    if (beginTime) text_ += " at " + Value(*beginTime).text();
    text_ += "\n";
  }
  [[nodiscard]] std::error_code close() override {
    if (failure_ != std::errc()) return std::make_error_code(failure_);
    files_.addFile(path_, text_);
    return {};
  }

 private:
  MemoryFileSystem& files_;
  const std::string path_;
  std::string text_;
  const std::errc failure_;
};

}  // namespace

std::unique_ptr<BenchfileWriter> MemoryBenchfile::open(const std::string& path, const BenchfileFacts& facts,
                                                       int& systemError) {
  systemError = openFailure;
  reporterID = facts.reporterID;
  if (openFailure != 0) return nullptr;
  return std::make_unique<MemoryWriter>(
      files_, path, std::string(facts.dataName) + " " + std::to_string(facts.resultsVersion) + "\n",
      closeFailure);
}

}  // namespace tonewerk
