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

// What performance tracing is made of. Everything referred to outlives it.
struct TracingParts {
  std::string directory;        // where traces lie while somebody wants them; absolute, for nothing else
  std::string signpostLibrary;  // as dlopen() takes it
  std::string traceReader;      // the path of tw-trace-reader
  const FileSystem& files;
  const JsonService& json;
  TimerService& timers;
  const LogCategory& log;
};

// Performance tracing, by way of what this build has for it.
struct Tracing {
  std::unique_ptr<Runtrace> runtrace;
  std::unique_ptr<Kolvi> kolvi;
};
Tracing makeTracing(const TracingParts& parts);

// Whether this build has anything.
bool isTracingBuiltIn();

}  // namespace tonewerk
