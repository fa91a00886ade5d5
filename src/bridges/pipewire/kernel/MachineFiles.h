// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "bridges/pipewire/kernel/KernelFile.h"
#include "bridges/pipewire/kernel/KernelMoments.h"

namespace tonewerk {

// Reads the pressure on processors, memory and storage, and how fast the processors run.
class MachineFiles {
 public:
  // To read a frequency can cost tens of microseconds, so each sample reads that of one processor.
  static constexpr int kMaxProcessors = 16;

  // The directories are "/proc" and "/sys", or copies of their layout.
  MachineFiles(const std::string& proc, const std::string& sys);

  void sample(MachineMoment& moment);
  // Closes the files. They are opened again by the next sample, whose numbers begin anew.
  void close();

 private:
  struct Pressure {
    KernelFile file;
    std::optional<std::chrono::nanoseconds> total;
  };
  struct Processor {
    KernelFile frequency;
    std::uint64_t greatestFrequency = 0;
    std::uint32_t perMille = 0;
    std::array<KernelFile, 2> throttles;  // counts of the core and of its package
    std::array<std::optional<std::uint64_t>, 2> counts;
    bool isThrottled = false;
  };

  void open();
  std::chrono::nanoseconds growthOf(Pressure& pressure);
  void read(Processor& processor);

  const std::string proc_;
  const std::string sys_;
  bool isOpen_ = false;
  std::array<Pressure, 3> pressures_;  // processor, memory, storage
  std::vector<Processor> processors_;
  std::size_t turn_ = 0;
  KernelFile::Buffer buffer_{};
};

}  // namespace tonewerk
