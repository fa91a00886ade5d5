// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

#include "platform/Chanmeter.h"
#include "platform/Log.h"
#include "platform/linux/channels/ChannelChoice.h"
#include "platform/linux/channels/ChannelFile.h"
#include "platform/linux/files/FileStamp.h"
#include "values/Mutex.h"

namespace tonewerk {

class Accounts;

// Reads the channels that drivers and processes publish: each file `*.json` of one directory, unless its name
// begins with a dot, holds the channels of one driver. docs/driver-channels.md describes the format.
//
// The contents are kept in memory, so a file that has not changed is neither read nor parsed again. If only
// its numbers have changed, only these are parsed.
//
// What the records of a reading of a file hold is charged to the file's owner (Resource::kSnapshotBytes) as
// long as anyone holds one of them, because each change of the file may leave records behind that sessions
// still need. A file for which its owner's share has no room is left out, and read again when there is room.
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

  // Several calls of read() that share a reading list the directory once and look at each file once, when the
  // first of them needs it. So no file is older than the first call. Only PublishedChannels uses its members.
  class Reading final : public ChanmeterReading {
    friend class PublishedChannels;
    std::uint64_t number_ = 0;  // 0 before the first call
    std::vector<std::string> names_;
    std::optional<ChanmeterError> error_;  // of the directory
    std::string buffer_;                   // kept from one file to the next, to save allocations
  };

  // Remembers which records of each file a choice includes. Use it with one choice only, which then costs
  // little as long as files have the same channels. Only PublishedChannels uses its members.
  class Selection {
    friend class PublishedChannels;
    struct Places {
      std::uint64_t layout = 0;
      std::vector<std::uint32_t> places;
    };
    std::map<std::string, Places> files_;  // by name
  };

  // `log` and `accounts` must outlive this object. Without accounts nothing is charged. If the directory does
  // not exist, there are no channels.
  PublishedChannels(std::string directory, const LogCategory& log, Accounts* accounts = nullptr)
      : directory_(std::move(directory)), log_(log), accounts_(accounts) {}

  // Appends the current records of the chosen channels, in the order of file names and then in the order of
  // each file. A file that cannot be read or does not have the right form is left out as a whole, and is
  // logged once until its problem changes. The first such file of a chosen driver sets `error`.
  void read(const ChannelChoice& choice, ChanmeterRecords& records, std::optional<ChanmeterError>& error);
  // Does the same in a reading, and with a selection if it is not null.
  void read(const ChannelChoice& choice, Reading& reading, Selection* selection, ChanmeterRecords& records,
            std::optional<ChanmeterError>& error);

 private:
  // The state of one file.
  struct File {
    std::uint64_t reading = 0;  // that looked at it last
    bool exists = false;     // when that reading looked at it; `bytes` and `isCurrent` are of that time, too
    std::size_t bytes = 0;   // that count for the limit
    bool isCurrent = false;  // whether the members below are those of that reading

    std::optional<FileStamp> stamp;  // of `text`; none if a change might not alter the stamp
    std::string text;
    std::optional<ChannelFile> parsed;  // from `text`
    std::uint64_t layout = 0;           // differs between texts with other channels; 0 if none was parsed
    uid_t owner = 0;                    // of the file that has `text`
    std::uint64_t refusedBytes = 0;     // of its records, if the owner had no room; `text` is then empty
    ChannelFileProblem problem;         // of the file or its text; code 0 for none
    // Kept after a later problem, to tell whose channels are missing.
    std::optional<std::string> driver;
    std::string logged;  // the text of the problem that was logged last

    std::size_t channels() const { return parsed ? parsed->records.size() : 0; }
    // Frees the contents; the next read() reads the file again.
    void clearContents();
  };
  // How much of the limits the files have used so far.
  struct Sums {
    std::size_t bytes = 0;
    std::size_t channels = 0;
  };

  void begin(Reading& reading) REQUIRES(mutex_);
  // The names of the channel files, sorted.
  std::vector<std::string> fileNames(std::optional<ChanmeterError>& error) REQUIRES(mutex_);
  [[nodiscard]] ChannelFileProblem refresh(const std::string& path, File& file, Reading& reading, Sums& sums)
      REQUIRES(mutex_);
  void lookAt(const std::string& path, File& file) const;
  void readAgain(const std::string& path, File& file, std::string& buffer) REQUIRES(mutex_);
  void parseText(File& file) REQUIRES(mutex_);
  // Charges the new records to the file's owner, or gives them up.
  void charge(File& file) const;
  // Whether the owner would have had room at this moment for records that were given up.
  bool hasRoomNow(const File& file) const;
  static void append(const ChannelChoice& choice, const File& file, ChanmeterRecords& records);
  static void append(const ChannelChoice& choice, const File& file, Selection::Places& selected,
                     ChanmeterRecords& records);
  // Logs a problem unless it is the one in `logged`.
  void logProblem(const std::string& path, const ChannelFileProblem& problem, std::string& logged) const;

  const std::string directory_;
  const LogCategory& log_;
  Accounts* const accounts_;
  Mutex mutex_;
  std::map<std::string, File> files_ GUARDED_BY(mutex_);  // by name
  std::string loggedDirectoryProblem_ GUARDED_BY(mutex_);
  std::uint64_t lastReading_ GUARDED_BY(mutex_) = 0;
  std::uint64_t lastLayout_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
