// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "bridges/pipewire/kernel/KernelFile.h"
#include "bridges/pipewire/kernel/KernelMoments.h"

namespace tonewerk {

// Reads the state of the sound cards' open substreams.
class SoundCardFiles {
 public:
  static constexpr std::size_t kMaxFiles = 64;

  // `proc` is "/proc" or a copy of its layout.
  explicit SoundCardFiles(std::string proc);

  void sample(MachineMoment& moment);
  // Looks for cards that have come or gone.
  void look();
  // Closes the files until the next look().
  void close() { substreams_.clear(); }

 private:
  struct Substream {
    std::int32_t card = 0;
    std::int32_t device = 0;
    std::int32_t number = 0;
    bool isPlayback = false;
    KernelFile status;
    bool isListed = false;
  };

  void lookAtCard(std::int32_t card);
  void lookAtDevice(Substream substream, const KernelPath& path);
  void add(Substream substream, const KernelPath& path);

  const std::string directory_;
  std::vector<Substream> substreams_;
  KernelFile::Buffer buffer_{};
};

}  // namespace tonewerk
