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

// Hears what a trace session says, and lets the test wait for it.
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

  // False when nothing comes.
  bool waitForStart() { return started_->wait(kPatience); }
  bool waitForCompletion() { return completed_->wait(kPatience); }

  // To be read after the wait.
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

// The real thing: a session daemon, this very process's signposts, the trace reader. One test of the
// machine's at a time has it, since root's session daemon is one for all.
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

  // A session that has been asked to start.
  std::shared_ptr<RuntraceSession> start(const std::shared_ptr<TraceListener>& listener,
                                         const std::string& probes) {
    auto session = runtrace->makeSession({.probeListPath = writeProbes(probes)});
    session->setDelegate(listener);
    session->startRuntrace();
    return session;
  }

  // This process's private session daemon, 0 without one.
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
  std::unique_ptr<LttngRuntrace> runtrace;  // last: it uses all above
};

}  // namespace tonewerk
