// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TraceBenchfile.h"

#include <cassert>
#include <string_view>

#include "platform/Benchfile.h"
#include "platform/Clock.h"
#include "platform/FileSystem.h"
#include "platform/JsonService.h"
#include "platform/Kolvi.h"
#include "platform/Log.h"
#include "session/LocalTime.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/diagnostics/TWReportingSessionTraceWorker.h"

namespace tonewerk {
namespace {

constexpr std::string_view kBenchfileName = "TWReporting";
constexpr int kResultsVersion = 4;
constexpr std::string_view kProjectName = "tonewerk";
constexpr std::string_view kTemporaryName = "temp_benchfile.bdj";
constexpr unsigned kDirectoryMode = 0777;
constexpr double kMillisecondsPerSecond = 1000.0;

std::string_view className(const Value& value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return "boolean";
    case Value::Kind::kInteger:
    case Value::Kind::kUnsigned:
      return "integer";
    case Value::Kind::kDouble:
      return "double";
    case Value::Kind::kString:
      return "string";
    case Value::Kind::kDate:
      return "date";
    case Value::Kind::kArray:
      return "array";
    case Value::Kind::kMap:
      return "map";
  }
  return "";
}

const Platform& platform() { return TWReportingContext::current().platform(); }

}  // namespace

TraceBenchfile::TraceBenchfile(const TWReportingSession& session)
    : configuration_(session.configuration()),
      serviceName_(session.serviceName()),
      reporterID_(session.reporterID()) {}

TraceBenchfile::~TraceBenchfile() = default;

void TraceBenchfile::processTraceKolvi(const std::optional<std::string>& finalTraceURL) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  debugLog(TWReportingTraceCategory(), "Starting Kolvi Process Trace. Path: %@", finalTraceURL);
  if (!finalTraceURL || !platform().files.exists(*finalTraceURL)) {
    errorLog(TWReportingTraceCategory(), "No traceResults at path: %@", finalTraceURL);
    return;
  }
  const std::optional<ValueArray> dictionaries = readProbeList();
  if (!dictionaries || dictionaries->empty()) {
    errorLog(TWReportingTraceCategory(), "%@ failed to get KolviProbes from %@",
             TWReportingSessionTraceWorker::kWorkerClass, configuration_.find(TWReportingKolviPlistFilePath));
    return;
  }
  std::string problem;
  const auto model = platform().kolvi.openModel(*finalTraceURL, problem);
  if (model == nullptr) {
    errorLog(TWReportingTraceCategory(), "failed to create Kolvi model: %@", problem);
    return;
  }
  createBDWriter();
  for (const KolviProbe& probe : model->makeProbes(*dictionaries)) processProbe(probe, *model);
  if (closeWriter()) moveIntoPlace();
}

// Returns nullopt when the probe list cannot be read or holds no list.
std::optional<ValueArray> TraceBenchfile::readProbeList() const {
  std::string text;
  if (platform().files.readFile(configuration_.text(TWReportingKolviPlistFilePath), text)) {
    return std::nullopt;
  }
  std::string problem;
  const std::optional<Value> root = platform().json.parse(text, problem);
  if (!root) return std::nullopt;
  std::optional<ValueArray> dictionaries = probeDictionariesOf(*root);
  if (!dictionaries) errorLog(TWReportingTraceCategory(), "unsupported root class %@", className(*root));
  return dictionaries;
}

void TraceBenchfile::createBDWriter() {
  const Value* directory = configuration_.find(TWReportingKolviOutputFileDirectory);
  directory_ = directory == nullptr ? TWReportingSessionTraceWorker::TWReportingTracingLogsDirectory()
                                    : directory->text();
  if (const std::error_code error = platform().files.createDirectories(directory_, kDirectoryMode)) {
    errorLog(TWReportingTraceCategory(), "can't create logging directory at %@: %@", directory_,
             error.message());
  }
  const Value* name = configuration_.find(TWReportingKolviOutputFileName);
  mOutputFile_ = name == nullptr ? generatedFileName() : name->text();
  fullWriterPath_ = directory_ + "/" + mOutputFile_;
  tempWriterPath_ = platform().temporaryDirectory + "/" + std::string(kTemporaryName);
  debugLog(TWReportingTraceCategory(), "tempWriterPath: %@", tempWriterPath_);
  int systemError = 0;
  mWriter_ = platform().benchfile.open(
      tempWriterPath_,
      {.dataName = kBenchfileName, .resultsVersion = kResultsVersion, .reporterID = reporterID_},
      systemError);
  if (mWriter_ != nullptr) return;
  errorLog(TWReportingTraceCategory(), "Failed to open benchfile writer. errno: %d", systemError);
}

std::string TraceBenchfile::generatedFileName() const {
  const double now = platform().clock.now();
  return localTimeText(now, platform().clock.utcOffset(now)) + "-" + std::string(kProjectName) + "-" +
         TWReportingUtilityRetrieveAppName(configuration_).string() + "-" + serviceName_ + ".bdj";
}

void TraceBenchfile::processProbe(const KolviProbe& probe, const KolviModel& model) {
  debugLog(TWReportingTraceCategory(), "%@, %@", probe, probe.name);
  for (const KolviProbe& child : probe.children) processProbe(child, model);
  if (!probe.isIntervalProbe) return;
  for (const KolviEvent& event : probe.events) {
    const double milliseconds =
        model.timeModel().secondsFromSystemTimeDuration(event.timeDuration) * kMillisecondsPerSecond;
    debugLog(TWReportingTraceCategory(), "name:%@ time:%f ms", probe.name, milliseconds);
    if (mWriter_ != nullptr) mWriter_->newValue(probe.name, milliseconds, event.beginTime);
  }
}

bool TraceBenchfile::closeWriter() {
  const std::error_code error = mWriter_ == nullptr ? std::error_code() : mWriter_->close();
  mWriter_.reset();
  if (!error) return true;
  errorLog(TWReportingTraceCategory(), "Failed to close benchfile writer: %@", error.message());
  return false;
}

void TraceBenchfile::moveIntoPlace() {
  debugLog(TWReportingTraceCategory(), "Moving file from tempWriterPath: %@ to %@", tempWriterPath_,
           fullWriterPath_);
  if (platform().files.moveFile(tempWriterPath_, directory_, mOutputFile_)) {
    errorLog(TWReportingTraceCategory(), "Failed to move file");
  }
}

}  // namespace tonewerk
