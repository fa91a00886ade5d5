// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>

namespace tonewerk {

// Writes the channel files of many drivers into a directory. Each driver has channels in all sampled groups:
// half are simple, a quarter are histograms of eight buckets, a quarter have four states.
class PublishedDrivers {
 public:
  // The directory must exist.
  PublishedDrivers(std::string directory, std::size_t drivers, std::size_t channelsOfEach)
      : directory_(std::move(directory)), drivers_(drivers), channelsOfEach_(channelsOfEach) {}

  // Replaces the file of every driver by one in which every channel has a new value. Ends the process when a
  // file cannot be written.
  void publishNextValues();

  std::size_t channels() const { return drivers_ * channelsOfEach_; }
  // Size of all files together.
  std::size_t bytes() const { return bytes_; }

  // Reads every file without parsing it, and returns the number of bytes.
  std::size_t readFiles() const;

 private:
  std::string pathOf(std::size_t driver) const;

  const std::string directory_;
  const std::size_t drivers_;
  const std::size_t channelsOfEach_;
  std::int64_t time_ = 0;
  std::size_t bytes_ = 0;
};

}  // namespace tonewerk
