// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as what the kernel says about processes, sound cards and temperatures: texts with their
// lengths before them, one for each file.
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <optional>
#include <sched.h>
#include <string>

#include "FuzzInput.h"
#include "bridges/pipewire/kernel/KernelCalls.h"
#include "bridges/pipewire/kernel/KernelSampler.h"
#include "platform/Log.h"
#include "platform/linux/channels/KernelSoundChannels.h"
#include "platform/linux/diagnostics/collectors/LoadCollector.h"
#include "platform/linux/diagnostics/collectors/ProcessTable.h"
#include "platform/linux/diagnostics/collectors/ProcessTableCollector.h"
#include "platform/linux/diagnostics/collectors/SoundStatusCollector.h"
#include "platform/linux/system/LinuxProcessInformation.h"
#include "platform/linux/system/ThermalZones.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "tools/memory-usage/ProcReader.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// In the order of their texts in the input.
constexpr std::array kFiles = {"proc/1/stat",
                               "proc/1/status",
                               "proc/meminfo",
                               "proc/stat",
                               "proc/asound/card0/id",
                               "proc/asound/card0/pcm0p/sub0/status",
                               "proc/asound/card0/pcm0p/sub0/hw_params",
                               "sys/class/sound/card0/device/power/runtime_status",
                               "sys/class/sound/card0/device/power/runtime_active_time",
                               "sys/class/sound/card0/device/power/runtime_suspended_time",
                               "thermal/thermal_zone0/mode",
                               "thermal/thermal_zone0/temp",
                               "thermal/thermal_zone0/trip_point_0_temp",
                               "thermal/thermal_zone0/trip_point_0_type",
                               "proc/1/comm",
                               "proc/self/status",
                               "proc/loadavg",
                               "proc/1/task/1/stat",
                               "proc/1/task/1/schedstat",
                               "proc/pressure/cpu",
                               "sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq",
                               "sys/devices/system/cpu/cpu0/cpufreq/scaling_cur_freq",
                               "sys/devices/system/cpu/cpu0/thermal_throttle/core_throttle_count"};

class KernelFiles {
 public:
  KernelFiles() {
    for (const char* name : kFiles) {
      std::filesystem::create_directories(std::filesystem::path(path(name)).parent_path());
    }
  }
  void write(FuzzInput& input) const {
    for (const char* name : kFiles) std::ofstream(path(name), std::ios::binary) << input.longText();
  }
  std::string path(const std::string& name) const { return directory_.path(name); }

 private:
  const TemporaryDirectory directory_;
};

void readProcesses(const std::string& proc) {
  for (const ProcessRow& row : readProcessTable(proc)) expect(isUtf8(row.name) && row.processorSeconds >= 0);
  expect(isUtf8(ProcessTableCollector(proc).collect().text) && isUtf8(LoadCollector(proc).collect().text));
  const LinuxProcessInformation information(proc);
  expect(isUtf8(information.processName(1).value_or("")));
  (void)information.physicalFootprint();
  std::string problem;
  const auto usage = ProcReader(proc, 100.0).read(problem);
  expect(usage.has_value() == problem.empty());
}

void readSoundCards(const std::string& root) {
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  KernelSoundChannels channels(root, category);
  const std::optional<std::string> all;
  ChanmeterRecords records;
  std::optional<ChanmeterError> error;
  channels.read(ChannelChoice(all, all), records, error);
  for (const auto& record : records) {
    expect(isUtf8(record->key.driver.value()) && isUtf8(record->key.name.value()));
    for (const ChanmeterState& state : record->states) expect(isUtf8(state.name));
  }
  expect(isUtf8(SoundStatusCollector(root + "/proc/asound").collect().text));
}

// Each thread is a real-time one.
class RealTimeKernel final : public KernelCalls {
 public:
  ClockTimes clocks() const override { return {time_, time_, time_}; }
  int policyOf(std::int32_t) const override { return SCHED_FIFO; }
  void advance() { time_ += KernelSampler::kInterval; }

 private:
  std::chrono::nanoseconds time_{0};
};

// Reads the same files before and after they change.
class SampledKernel {
 public:
  explicit SampledKernel(const KernelFiles& files)
      : sampler_(kernel_, {files.path("proc"), files.path("sys")}) {
    const std::array<std::int32_t, 1> processes = {1};
    sampler_.watch(processes);
  }
  void sample() {
    kernel_.advance();
    sampler_.sample();
  }
  void check() const {
    const std::chrono::nanoseconds begin(0);
    const std::chrono::nanoseconds end = kernel_.clocks().monotonic;
    for (const ThreadMoment& moment : sampler_.threadMoments(1, begin, end)) {
      expect(moment.ran.count() >= 0 && moment.waited.count() >= 0 && moment.interval.count() >= 0);
    }
    for (const MachineMoment& moment : sampler_.machineMoments(begin, end)) {
      expect(moment.cpuStall.count() >= 0 && moment.frequencyPerMille <= 1000 && moment.hogCount <= 1);
    }
  }

 private:
  RealTimeKernel kernel_;
  KernelSampler sampler_;
};

void read(FuzzInput input) {
  static const KernelFiles files;
  files.write(input);
  SampledKernel kernel(files);
  kernel.sample();
  readProcesses(files.path("proc"));
  readSoundCards(files.path(""));
  const int level = thermalLevelOf(files.path("thermal"));
  expect(level >= 0 && level <= 3);
  files.write(input);
  kernel.sample();
  kernel.check();
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({data, size});
  return 0;
}
