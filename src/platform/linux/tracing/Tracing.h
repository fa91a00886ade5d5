// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>

#include "platform/Kolvi.h"
#include "platform/Runtrace.h"

namespace tonewerk {

class FileSystem;
class JsonService;
class LogCategory;
class TimerService;

// The parts that performance tracing needs. The references must outlive it.
struct TracingParts {
  std::string directory;        // holds traces while they are in use; an absolute path, for nothing else
  std::string signpostLibrary;  // name or path for dlopen()
  std::string traceReader;      // the path of tw-trace-reader
  const FileSystem& files;
  const JsonService& json;
  TimerService& timers;
  const LogCategory& log;
};

// Performance tracing, with the implementation that this build has.
struct Tracing {
  std::unique_ptr<Runtrace> runtrace;
  std::unique_ptr<Kolvi> kolvi;
};
Tracing makeTracing(const TracingParts& parts);

// Whether this build can trace.
bool isTracingBuiltIn();

}  // namespace tonewerk
