// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <filesystem>
#include <fstream>
#include <map>
#include <sched.h>
#include <string>

#include "bridges/pipewire/kernel/KernelCalls.h"
#include "bridges/pipewire/kernel/KernelSampler.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {

// A kernel with threads and a machine as a test describes them, in a copy of the layout of /proc and /sys.
class FakeKernel final : public KernelCalls {
 public:
  // What the kernel says about a thread.
  struct Thread {
    std::string name = "data-loop.0";
    char state = 'S';
    long long ranMs = 0;
    long long waitedMs = 0;
    int majorFaults = 0;
    int policy = SCHED_OTHER;
    int priority = 0;
    long flags = 0;
  };

  FakeKernel() { write("proc/self", ""); }

  KernelSampler::Roots roots() const { return {directory_.path("proc"), directory_.path("sys")}; }

  void write(const std::string& name, const std::string& text) const {
    const std::filesystem::path path = directory_.path(name);
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path, std::ios::binary) << text;
  }
  void set(std::int32_t pid, std::int32_t tid, const Thread& thread) {
    const std::string task = "proc/" + std::to_string(pid) + "/task/" + std::to_string(tid) + "/";
    std::string stat = std::to_string(tid) + " (" + thread.name + ") " + thread.state + " 1 1 1 0 -1 " +
                       std::to_string(thread.flags) + " 7 0 " + std::to_string(thread.majorFaults);
    for (int field = 13; field < 39; ++field) stat += " 0";
    stat += " 1 " + std::to_string(thread.priority) + " " + std::to_string(thread.policy) + " 0 0 0\n";
    write(task + "stat", stat);
    write(task + "schedstat",
          std::to_string(thread.ranMs * 1000000) + " " + std::to_string(thread.waitedMs * 1000000) + " 9\n");
    write("proc/" + std::to_string(pid) + "/comm", "process" + std::to_string(pid) + "\n");
    policies_[tid] = thread.policy;
  }
  // The thread's open files can no longer be read.
  void end(std::int32_t pid, std::int32_t tid) {
    const std::string task = "proc/" + std::to_string(pid) + "/task/" + std::to_string(tid);
    for (const char* name : {"/stat", "/schedstat"}) write(task + name, "");
    std::filesystem::remove_all(directory_.path(task));
    policies_.erase(tid);
  }
  void setPressure(const std::string& kind, long long totalMs) const {
    write("proc/pressure/" + kind,
          "some avg10=0.00 avg60=0.00 avg300=0.00 total=" + std::to_string(totalMs * 1000) +
              "\nfull avg10=0.00 avg60=0.00 avg300=0.00 total=0\n");
  }
  void remove(const std::string& name) const { std::filesystem::remove_all(directory_.path(name)); }

  void advance(std::chrono::milliseconds time) {
    times_.monotonic += time;
    times_.boot += time;
    times_.wall += time;
  }
  void suspend(std::chrono::milliseconds time) {
    times_.boot += time;
    times_.wall += time;
  }
  void setClock(std::chrono::milliseconds ahead) { times_.wall += ahead; }

  ClockTimes clocks() const override { return times_; }
  int policyOf(std::int32_t tid) const override {
    const auto policy = policies_.find(tid);
    return policy == policies_.end() ? -1 : policy->second;
  }

 private:
  const TemporaryDirectory directory_;
  std::map<std::int32_t, int> policies_;
  ClockTimes times_{std::chrono::seconds(100), std::chrono::seconds(100), std::chrono::hours(500000)};
};

}  // namespace tonewerk
