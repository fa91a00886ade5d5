// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/MachineFiles.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "bridges/pipewire/kernel/KernelTexts.h"

namespace tonewerk {
namespace {

constexpr std::array<std::string_view, 3> kPressures = {"cpu", "memory", "io"};
constexpr std::array<std::string_view, 2> kThrottles = {"core_throttle_count", "package_throttle_count"};
constexpr std::uint64_t kPerMille = 1000;

}  // namespace

MachineFiles::MachineFiles(const std::string& proc, const std::string& sys) : proc_(proc), sys_(sys) {}

void MachineFiles::open() {
  isOpen_ = true;
  for (std::size_t i = 0; i < pressures_.size(); ++i) {
    pressures_[i].file = KernelFile(KernelPath(proc_) / "pressure" / kPressures[i]);
  }
  for (int number = 0; number < kMaxProcessors; ++number) {
    const KernelPath directory = (KernelPath(sys_) / "devices/system/cpu/cpu").add(number);
    Processor processor;
    const KernelFile greatest(directory / "cpufreq" / "cpuinfo_max_freq");
    processor.greatestFrequency = countIn(greatest.read(buffer_).value_or(std::string_view())).value_or(0);
    if (processor.greatestFrequency > 0) {
      processor.frequency = KernelFile(directory / "cpufreq" / "scaling_cur_freq");
    }
    for (std::size_t i = 0; i < kThrottles.size(); ++i) {
      processor.throttles[i] = KernelFile(directory / "thermal_throttle" / kThrottles[i]);
    }
    if (processor.frequency || processor.throttles[0] || processor.throttles[1]) {
      read(processor);
      processors_.push_back(std::move(processor));
    }
  }
}

void MachineFiles::close() {
  isOpen_ = false;
  pressures_ = {};
  processors_.clear();
  turn_ = 0;
}

void MachineFiles::sample(MachineMoment& moment) {
  if (!isOpen_) open();
  moment.cpuStall = growthOf(pressures_[0]);
  moment.memoryStall = growthOf(pressures_[1]);
  moment.ioStall = growthOf(pressures_[2]);
  if (processors_.empty()) return;
  turn_ = (turn_ + 1) % processors_.size();
  read(processors_[turn_]);
  for (const Processor& processor : processors_) {
    moment.frequencyPerMille = std::max(moment.frequencyPerMille, processor.perMille);
    moment.isThrottled = moment.isThrottled || processor.isThrottled;
  }
}

std::chrono::nanoseconds MachineFiles::growthOf(Pressure& pressure) {
  const auto total = pressureIn(pressure.file.read(buffer_).value_or(std::string_view()));
  const auto before = std::exchange(pressure.total, total);
  return total && before && *total > *before ? *total - *before : std::chrono::nanoseconds(0);
}

void MachineFiles::read(Processor& processor) {
  const auto frequency = countIn(processor.frequency.read(buffer_).value_or(std::string_view()));
  if (frequency && processor.greatestFrequency > 0) {
    const std::uint64_t bounded = std::min(*frequency, processor.greatestFrequency);
    processor.perMille = static_cast<std::uint32_t>(static_cast<double>(bounded) * kPerMille /
                                                    static_cast<double>(processor.greatestFrequency));
  }
  processor.isThrottled = false;
  for (std::size_t i = 0; i < processor.throttles.size(); ++i) {
    const auto count = countIn(processor.throttles[i].read(buffer_).value_or(std::string_view()));
    const auto before = std::exchange(processor.counts[i], count);
    if (count && before && *count > *before) processor.isThrottled = true;
  }
}

}  // namespace tonewerk
