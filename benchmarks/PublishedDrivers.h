// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>

namespace tonewerk {

// Drivers that publish channels in a directory: each has channels in all groups that are sampled, half of
// them simple, a quarter histograms of eight buckets, a quarter with four states.
class PublishedDrivers {
 public:
  // The directory is there already.
  PublishedDrivers(std::string directory, std::size_t drivers, std::size_t channelsOfEach)
      : directory_(std::move(directory)), drivers_(drivers), channelsOfEach_(channelsOfEach) {}

  // Every driver puts a new file in place of its old one, in which every channel has gone on. Ends the
  // process when it cannot.
  void goOn();

  std::size_t channels() const { return drivers_ * channelsOfEach_; }
  // Of all files together.
  std::size_t bytes() const { return bytes_; }

  // Reads every file and does nothing with it; the bytes read.
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
