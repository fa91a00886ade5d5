// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/channels/ChannelChoice.h"
#include "platform/linux/channels/ChannelFile.h"
#include "platform/linux/files/FileStamp.h"
#include "values/Mutex.h"

namespace tonewerk {

// The channels that drivers and processes publish: each `*.json` of one directory, unless its name begins
// with a dot, is one driver's. See docs/driver-channels.md.
//
// What was read is kept, so that a file that did not change is neither read nor parsed again.
//
// Any thread; one reads at a time.
class PublishedChannels {
 public:
  static constexpr std::size_t kMaxFileBytes = std::size_t{1} << 20;
  // In the whole directory. What comes after, in the order of names, is left out.
  static constexpr std::size_t kMaxEntries = 4096;  // of whatever name
  static constexpr std::size_t kMaxFiles = 256;
  static constexpr std::size_t kMaxBytes = std::size_t{8} << 20;
  static constexpr std::size_t kMaxChannels = 32768;

  // `log` outlives this. Without a directory there are no channels.
  PublishedChannels(std::string directory, const LogCategory& log)
      : directory_(std::move(directory)), log_(log) {}

  // Appends the chosen channels' current records, in the order of file names and then as they stand in their
  // file. A file that cannot be read or is not as it must be is left out whole; the first such among the
  // chosen drivers' becomes `error`, and is logged once until its state changes.
  void read(const ChannelChoice& choice, ChanmeterRecords& records, std::optional<ChanmeterError>& error);

 private:
  // What is known of one file.
  struct File {
    std::optional<FileStamp> stamp;  // of `text`; none when it cannot be trusted to tell a later state
    std::string text;
    ChanmeterRecords records;    // out of `text`
    ChannelFileProblem problem;  // with the file, or with its text; code 0 for none
    // Outlives what goes wrong later: these channels are then missing.
    std::optional<std::string> driver;
    std::string logged;  // what was last said of it

    // Frees what was read; it is read anew the next time.
    void letGo();
  };
  // What files have used up of the bounds.
  struct Sums {
    std::size_t bytes = 0;
    std::size_t channels = 0;
  };

  // Ascending.
  std::vector<std::string> fileNames(std::optional<ChanmeterError>& error) REQUIRES(mutex_);
  void forgetAllBut(const std::vector<std::string>& names) REQUIRES(mutex_);
  [[nodiscard]] static ChannelFileProblem refresh(const std::string& path, File& file, Sums& sums);
  static void readAgain(const std::string& path, File& file);
  void complain(const std::string& path, const ChannelFileProblem& problem, std::string& logged) const;

  const std::string directory_;
  const LogCategory& log_;
  Mutex mutex_;
  std::map<std::string, File> files_ GUARDED_BY(mutex_);  // by name
  std::string loggedOfDirectory_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
