// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "values/Value.h"

namespace tonewerk {

class BenchfileWriter;
class KolviModel;
class TWReportingSession;
struct KolviProbe;

// Makes a benchmark data file from a session's finished trace. Lives on the work queue. Failures are logged.
// After a failure it does the remaining steps that are still possible.
class TraceBenchfile {
 public:
  explicit TraceBenchfile(const TWReportingSession& session);
  TraceBenchfile(const TraceBenchfile&) = delete;
  TraceBenchfile& operator=(const TraceBenchfile&) = delete;
  ~TraceBenchfile();

  void processTraceKolvi(const std::optional<std::string>& finalTraceURL);

 private:
  [[nodiscard]] std::optional<ValueArray> readProbeList() const;
  void createBDWriter();
  std::string generatedFileName() const;
  void processProbe(const KolviProbe& probe, const KolviModel& model);
  // Returns false when the values that were written are lost.
  [[nodiscard]] bool closeWriter();
  void moveIntoPlace();

  const ValueMap configuration_;
  const std::string serviceName_;
  const std::int64_t reporterID_;
  std::unique_ptr<BenchfileWriter> mWriter_;
  std::string directory_;
  std::string mOutputFile_;
  std::string fullWriterPath_;
  std::string tempWriterPath_;
};

}  // namespace tonewerk
