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

// Reads the channels that drivers and processes publish: each file `*.json` of one directory, unless its name
// begins with a dot, holds the channels of one driver. docs/driver-channels.md describes the format.
//
// The contents are kept in memory, so a file that has not changed is neither read nor parsed again.
//
// Any thread; concurrent calls wait for each other.
class PublishedChannels {
 public:
  static constexpr std::size_t kMaxFileBytes = std::size_t{1} << 20;
  // Limits for the whole directory. In the order of file names, the rest is left out.
  static constexpr std::size_t kMaxEntries = 4096;  // with any name
  static constexpr std::size_t kMaxFiles = 256;
  static constexpr std::size_t kMaxBytes = std::size_t{8} << 20;
  static constexpr std::size_t kMaxChannels = 32768;

  // `log` must outlive this object. If the directory does not exist, there are no channels.
  PublishedChannels(std::string directory, const LogCategory& log)
      : directory_(std::move(directory)), log_(log) {}

  // Appends the current records of the chosen channels, in the order of file names and then in the order of
  // each file. A file that cannot be read or does not have the right form is left out as a whole, and is
  // logged once until its problem changes. The first such file of a chosen driver sets `error`.
  void read(const ChannelChoice& choice, ChanmeterRecords& records, std::optional<ChanmeterError>& error);

 private:
  // The state of one file.
  struct File {
    std::optional<FileStamp> stamp;  // of `text`; none if a change might not alter the stamp
    std::string text;
    ChanmeterRecords records;    // parsed from `text`
    ChannelFileProblem problem;  // of the file or its text; code 0 for none
    // Kept after a later problem, to tell whose channels are missing.
    std::optional<std::string> driver;
    std::string logged;  // the text of the problem that was logged last

    // Frees the contents; the next read() reads the file again.
    void clearContents();
  };
  // How much of the limits the files have used so far.
  struct Sums {
    std::size_t bytes = 0;
    std::size_t channels = 0;
  };

  // The names of the channel files, sorted.
  std::vector<std::string> fileNames(std::optional<ChanmeterError>& error) REQUIRES(mutex_);
  void forgetFilesExcept(const std::vector<std::string>& names) REQUIRES(mutex_);
  [[nodiscard]] static ChannelFileProblem refresh(const std::string& path, File& file, Sums& sums);
  static void readAgain(const std::string& path, File& file);
  // Logs a problem unless it is the one in `logged`.
  void logProblem(const std::string& path, const ChannelFileProblem& problem, std::string& logged) const;

  const std::string directory_;
  const LogCategory& log_;
  Mutex mutex_;
  std::map<std::string, File> files_ GUARDED_BY(mutex_);  // by name
  std::string loggedDirectoryProblem_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
