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

// Directories and files in memory, with failures on demand. Any thread.
//
//   MemoryFileSystem files;
//   files.failWrite(2, std::errc::no_space_on_device);       // the second write() from now on
//   ...
//   EXPECT_EQ(files.contents("/logs/Audio/summary.json"), "{}");
//
// Paths are compared as they are written; they begin with a slash and do not end with one.
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

  // std::errc() makes the call succeed again.
  void failCreateDirectories(std::errc error);
  void failCreateFile(std::errc error);
  // The `nth` write() from now on fails, 1 the next one; every other succeeds.
  void failWrite(int nth, std::errc error);
  // Also of a file that was written as it should.
  void failPlace(std::errc error);
  void failReadFile(std::errc error);
  void failMoveFile(std::errc error);
  // A file with this text, its directories included.
  void addFile(const std::string& path, std::string text);
  void addSymbolicLink(const std::string& path);

  // None without such a file; a new one is none before it is placed.
  std::optional<std::string> contents(const std::string& path) const;
  std::vector<std::string> files() const;
  // The mode that the directory was made with; none without such a directory.
  std::optional<unsigned> directoryMode(const std::string& path) const;
  // How many new files have neither been placed nor given up.
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
    int openFiles GUARDED_BY(mutex) = 0;

    // Whether something stands there.
    bool holds(const std::string& path) const REQUIRES(mutex) {
      return files.contains(path) || directories.contains(path) || links.contains(path);
    }
  };
  class File;

  std::shared_ptr<State> state_;  // shared with the open files
};

}  // namespace tonewerk
