// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/FileSystem.h"

namespace tonewerk {

// Keeps the directory of JSON summary files within its bounds: the preferences "summary_megabytes" (256) and
// "summary_days" (30) of the domain "com.orvane.tonewerk.twreporting". The oldest files go first, by the time
// at which they were written, and before them those with a time in the future; the newest one always stays.
// Only files with names of summary files count and are removed, so a file that somebody else puts there is
// safe.
//
// A file is too old when it is so by the clock and also compared with the oldest of the kWitnesses newest
// files. So a wall clock that jumps ahead takes no files along until so many sessions have ended with it, and
// so many files or fewer never become too old.
//
// On the file sinks' queue.
class SummaryDirectory {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.twreporting";
  static constexpr std::string_view kMegabytesKey = "summary_megabytes";
  static constexpr std::string_view kDaysKey = "summary_days";
  // How often the directory is read while its size is known to be within the bound.
  static constexpr std::chrono::minutes kReadInterval{10};
  static constexpr std::size_t kWitnesses = 10;

  // In the context's singletons: one for the daemon's only directory.
  explicit SummaryDirectory(std::string path) : path_(std::move(path)) {}

  // Removes what a killed daemon left behind unfinished, and what does not fit into the bounds.
  void tidy();
  // A file of so many bytes was added.
  void added(std::uint64_t bytes);

  // True for "20261120-101800+0100-77-com.orvane.player-longformaudio.json" and the like.
  static bool isSummaryName(std::string_view name);

 private:
  struct Bounds {
    double bytes = 0.0;
    double seconds = 0.0;
  };

  Bounds readBounds();
  double bound(std::string_view key, double otherwise, std::string& wrong) const;
  void trim(const Bounds& bounds);
  // False when the file is still there.
  [[nodiscard]] bool remove(const FileEntry& file);

  const std::string path_;
  double bytes_ = 0.0;  // of all files, as far as known
  std::optional<std::chrono::nanoseconds> readAt_;
  std::string loggedWrongBounds_;
  std::string loggedProblem_;
};

}  // namespace tonewerk
