// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/FileSystem.h"
#include "values/Mutex.h"

namespace tonewerk {

// Holds directories and files in memory, and fails when a test asks for it. Any thread.
//
//   MemoryFileSystem files;
//   files.failWrite(2, std::errc::no_space_on_device);       // the second write() from now on
//   ...
//   EXPECT_EQ(files.contents("/logs/Audio/summary.json"), "{}");
//
// It compares paths as they are written. They begin with a slash and do not end with one.
class MemoryFileSystem final : public FileSystem {
 public:
  MemoryFileSystem();

  [[nodiscard]] std::error_code createDirectories(const std::string& path, unsigned mode) override;
  [[nodiscard]] std::unique_ptr<NewFile> createFile(const std::string& directory, const std::string& name,
                                                    std::error_code& error) override;
  bool exists(const std::string& path) const override;
  [[nodiscard]] std::error_code readFile(const std::string& path, std::string& text) const override;
  [[nodiscard]] std::error_code moveFile(const std::string& from, const std::string& directory,
                                         const std::string& name) override;
  // A new file's time is the number of files that were written before it.
  [[nodiscard]] std::vector<FileEntry> listFiles(const std::string& directory,
                                                 std::error_code& error) const override;
  [[nodiscard]] std::error_code removeFile(const std::string& path) override;
  void removeLeftovers(const std::string& directory) override;

  // From now on the call fails with `error`; std::errc() makes it succeed again.
  void failCreateDirectories(std::errc error);
  void failCreateFile(std::errc error);
  // The `nth` write() from now on fails; 1 is the next one. All others succeed, even for the same file, so
  // that a test sees what its user does after a single failure. The file cannot be placed.
  void failWrite(int nth, std::errc error);
  // place() then fails also for a file that was written without an error.
  void failPlace(std::errc error);
  void failReadFile(std::errc error);
  void failMoveFile(std::errc error);
  void failRemoveFile(std::errc error);
  // Adds a file with this text, and its directories. `modifiedAt` in seconds since 1970.
  void addFile(const std::string& path, std::string text, double modifiedAt = 0.0);
  void addSymbolicLink(const std::string& path);

  // Returns none when there is no such file. A new file has no contents before it is placed.
  std::optional<std::string> contents(const std::string& path) const;
  std::vector<std::string> files() const;
  // Returns the mode with which the directory was made; none when there is no such directory.
  std::optional<unsigned> directoryMode(const std::string& path) const;
  // Returns the directories whose leftovers were removed.
  std::vector<std::string> swept() const;
  // Returns how many new files have been neither placed nor destroyed.
  int openFiles() const;

 private:
  struct State {
    Mutex mutex;
    std::map<std::string, unsigned> directories GUARDED_BY(mutex);
    std::map<std::string, std::string> files GUARDED_BY(mutex);
    std::set<std::string> links GUARDED_BY(mutex);
    std::errc createDirectoriesFailure GUARDED_BY(mutex){};
    std::errc createFileFailure GUARDED_BY(mutex){};
    std::errc writeFailure GUARDED_BY(mutex){};
    int writesUntilFailure GUARDED_BY(mutex) = 0;  // 0 for none
    std::errc placeFailure GUARDED_BY(mutex){};
    std::errc readFailure GUARDED_BY(mutex){};
    std::errc moveFailure GUARDED_BY(mutex){};
    std::errc removeFailure GUARDED_BY(mutex){};
    std::map<std::string, double> times GUARDED_BY(mutex);
    std::vector<std::string> swept GUARDED_BY(mutex);
    int placed GUARDED_BY(mutex) = 0;
    int openFiles GUARDED_BY(mutex) = 0;

    // Returns whether `path` exists.
    bool holds(const std::string& path) const REQUIRES(mutex) {
      return files.contains(path) || directories.contains(path) || links.contains(path);
    }
  };
  class File;

  std::shared_ptr<State> state_;  // shared with the open files
};

}  // namespace tonewerk
