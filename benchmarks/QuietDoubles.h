// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <benchmark/benchmark.h>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/LinkReport.h"
#include "platform/Log.h"
#include "platform/Metricon.h"
#include "platform/SerialQueue.h"
#include "platform/TracePoints.h"

namespace tonewerk {

// Doubles of the system's services with the cost of a quiet daemon's adapters. They keep nothing.

class QuietLog final : public Log {
 public:
  bool isEnabled(std::string_view, LogLevel level) const override { return level >= LogLevel::kDefault; }
  void write(std::string_view, std::string_view, LogLevel, std::string_view) override {}
};

class SilentTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t) override {}
  void beginInterval(const char*, std::int64_t) override {}
  void endInterval(const char*, std::int64_t) override {}
};

class RunningClock final : public Clock {
 public:
  double now() const override {
    return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  }
  std::chrono::nanoseconds monotonic() const override {
    return std::chrono::steady_clock::now().time_since_epoch();
  }
  std::chrono::minutes utcOffset(double) const override { return {}; }
  void sleep(std::chrono::nanoseconds) override {}
};

class CountingMetricon final : public Metricon {
 public:
  void sendEvent(const EventNames& names, const EventSubject& /*subject*/,
                 FunctionRef<ValueMap()> payload) override {
    benchmark::DoNotOptimize(payload());
    events += names.second.empty() ? 1 : 2;
  }
  std::uint64_t events = 0;
};

class QuietLinkReport final : public LinkReport {
 public:
  std::optional<std::string> newHierarchyTokenFromParentToken(const std::optional<std::string>&) override {
    return "token";
  }
  std::unique_ptr<LinkReportSession> initWithSessionInfo(const ValueMap&, const ValueMap&,
                                                         const ValueArray*) override {
    return std::make_unique<Session>();
  }

 private:
  class Session final : public LinkReportSession {
   public:
    void startConfigurationWithCompletionHandler(CompletionHandler handler) override {
      handler(std::vector<std::string>{"quiet"});
    }
    bool sendMessageWithCategory(std::uint16_t, std::uint16_t, const Payload& payload,
                                 std::string&) override {
      benchmark::DoNotOptimize(payload.entries.size());
      return true;
    }
    bool isQuick() const override { return true; }
    void flushMessages() override {}
    std::string description() const override { return "quiet"; }
  };
};

// Runs work at once on the queueing thread, so that the work of the sinks' threads is measured too.
class ImmediateQueues final : public SerialQueueFactory {
 public:
  std::unique_ptr<SerialQueue> makeSerialQueue(std::string name, QueuePriority) override {
    return std::make_unique<Queue>(std::move(name));
  }

 private:
  class Queue final : public SerialQueue {
   public:
    explicit Queue(std::string name) : name_(std::move(name)) {}
    void async(Task work) override {
      const bool wasRunning = std::exchange(isRunning_, true);
      work();
      isRunning_ = wasRunning;
    }
    void drain() override {}
    bool isCurrent() const override { return isRunning_; }
    const std::string& name() const override { return name_; }

   private:
    const std::string name_;
    bool isRunning_ = false;
  };
};

}  // namespace tonewerk
