// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <sys/types.h>
#include <unistd.h>

#include "platform/Log.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/threads/ThreadSemaphores.h"
#include "platform/linux/threads/TimerThread.h"
#include "platform/linux/tracing/lttng/LttngRuntrace.h"
#include "platform/linux/tracing/lttng/TraceReaderKolvi.h"
#include "support/TemporaryDirectory.h"
#include "support/TracingLock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {

// Records the calls of a trace session's delegate, and lets the test wait for them.
class TraceListener final : public RuntraceSessionDelegate {
 public:
  static constexpr std::chrono::seconds kPatience{100};

  void runtraceDidStart(const RuntraceError& error) override {
    startError = error;
    started_->signal();
  }
  void runtraceDidStop(const RuntraceError& error) override { stopError = error; }
  void runtraceDidComplete(const std::string& traceLocation, const RuntraceToken& traceToken,
                           const RuntraceError& error) override {
    location = traceLocation;
    token = traceToken;
    completionError = error;
    completed_->signal();
  }

  // False if there is no call in time.
  bool waitForStart() { return started_->wait(kPatience); }
  bool waitForCompletion() { return completed_->wait(kPatience); }

  // Read these only after waiting.
  RuntraceError startError;
  RuntraceError stopError;
  RuntraceError completionError;
  std::string location;
  RuntraceToken token;

 private:
  ThreadSemaphores semaphores_;
  const std::unique_ptr<Semaphore> started_ = semaphores_.makeSemaphore();
  const std::unique_ptr<Semaphore> completed_ = semaphores_.makeSemaphore();
};

// Traces with a real session daemon, this process's signposts and the trace reader. Only one test on the
// machine may use it at a time, because all of root's programs share one session daemon.
class TracingRig {
 public:
  explicit TracingRig(TimerService* otherTimers = nullptr)
      : runtrace(std::make_unique<LttngRuntrace>(
            TracingParts{directory.path("traces"), TONEWERK_SIGNPOST_LIBRARY, TONEWERK_TRACE_READER_PATH,
                         files, json, otherTimers == nullptr ? timers : *otherTimers, category})) {}

  std::string writeProbes(const std::string& text) const {
    std::ofstream(directory.path("probes.json")) << text;
    return directory.path("probes.json");
  }

  // Makes a session and starts it.
  std::shared_ptr<RuntraceSession> start(const std::shared_ptr<TraceListener>& listener,
                                         const std::string& probes) {
    auto session = runtrace->makeSession({.probeListPath = writeProbes(probes)});
    session->setDelegate(listener);
    session->startRuntrace();
    return session;
  }

  // The process of the private session daemon of this process; 0 if there is none.
  static pid_t sessionDaemon() { return childNamed("lttng-sessiond", ::getpid()); }
  static pid_t writerOf(pid_t sessionDaemon) { return childNamed("lttng-consumerd", sessionDaemon); }

  const TracingLock turn;
  const TemporaryDirectory directory;
  MemoryLog log;
  const LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  LinuxFileSystem files;
  NlohmannJsonService json;
  TimerThread timers;
  TraceReaderKolvi kolvi{TONEWERK_TRACE_READER_PATH};

 private:
  static pid_t childNamed(const std::string& name, pid_t parent) {
    for (const auto& entry : std::filesystem::directory_iterator("/proc")) {
      std::ifstream file(entry.path() / "stat");
      std::string text;
      std::getline(file, text);
      // "pid (name) state parent ..."; names are cut at 15 bytes.
      const std::size_t open = text.find('(');
      const std::size_t close = text.rfind(')');
      if (open == std::string::npos || close == std::string::npos) continue;
      if (text.substr(open + 1, close - open - 1) != name.substr(0, 15)) continue;
      if (std::stol(text.substr(close + 4)) == parent) return std::stoi(text);
    }
    return 0;
  }

 public:
  std::unique_ptr<LttngRuntrace> runtrace;  // last: it uses the members above
};

}  // namespace tonewerk
