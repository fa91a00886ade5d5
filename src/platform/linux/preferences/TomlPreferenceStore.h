// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <map>
#include <string>

#include "platform/PreferenceStore.h"
#include "platform/linux/preferences/TomlFile.h"
#include "values/Mutex.h"

namespace tonewerk {

// Stores preferences in TOML files. Each domain has two: <configuration directory>/<domain>.toml and <state
// directory>/<domain>.toml. A key in the second file overrides the same key in the first. The store writes
// only the second file, and only the values that differ from the first. Any thread.
//
// A read checks both files with stat() and reads those that have changed. A write holds a lock on a lock
// file, so that concurrent writers in this and other processes do not lose each other's keys. It returns
// after the new file is on the disk. When the process is root, new files get the owner of their directory, so
// that the daemon can still write there.
//
// A file that cannot be parsed is read as empty. If it is the file in the state directory, writes to its
// domain fail with std::errc::invalid_argument until somebody has corrected or removed the file.
//
// A domain must be a plain file name: not empty, without a slash, and not beginning with a dot. Otherwise it
// has no values, and writing fails with std::errc::invalid_argument. Writing a value that TOML cannot express
// fails with std::errc::result_out_of_range.
class TomlPreferenceStore final : public PreferenceStore {
 public:
  // The directories need not exist; the first write creates the second. `log` must outlive the store.
  TomlPreferenceStore(std::string configurationDirectory, std::string stateDirectory, const LogCategory& log);

  // A domain's values in the configuration directory and in the state directory.
  struct Layers {
    ValueMap configured;
    ValueMap written;
  };
  Layers readLayers(std::string_view domain) const;

  [[nodiscard]] std::optional<Value> read(std::string_view domain, std::string_view key) const override;
  ValueMap readAll(std::string_view domain) const override;
  [[nodiscard]] std::error_code write(std::string_view domain, std::string_view key, const Value& value,
                                      std::string* problem = nullptr) override;
  [[nodiscard]] std::error_code remove(std::string_view domain, std::string_view key,
                                       std::string* problem = nullptr) override;

  // Read one file, or all files, again if they have changed, so that their problems are logged now and not at
  // the next use. Keys that the daemon does not know in a domain of its own are logged, too, until they
  // change. A name that is not that of a preference file is ignored.
  void checkFile(std::string_view fileName) const;
  void checkAllFiles() const;

  const std::string& configurationDirectory() const { return configurationDirectory_; }
  const std::string& stateDirectory() const { return stateDirectory_; }

 private:
  struct Domain {
    TomlFile configured;
    TomlFile written;
  };
  // The current contents of both files.
  struct Contents {
    ValueMap configured;
    ValueMap written;
    std::string problem;  // why `written` must not be overwritten
  };
  Contents contentsOf(std::string_view domain) const;
  // The domain, which must be one, after its files were read again where they have changed.
  Domain& refreshed(std::string_view domain) const REQUIRES(mutex_);
  void logUnknownKeys(std::string_view domain, const std::vector<std::string>& lines) const;
  // Holds the writers' lock, calls `change` with the domain's contents and then stores `written`.
  template <typename Change>
  [[nodiscard]] std::error_code update(std::string_view domain, std::string* problem, Change change);
  [[nodiscard]] std::error_code store(std::string_view domain, const Contents& contents,
                                      std::string& problem) const;

  const std::string configurationDirectory_;
  const std::string stateDirectory_;
  const LogCategory& log_;
  mutable Mutex mutex_;  // not held while a writer writes to the disk
  mutable std::map<std::string, Domain, std::less<>> domains_ GUARDED_BY(mutex_);
  mutable std::map<std::string, std::vector<std::string>> loggedUnknown_ GUARDED_BY(mutex_);  // by domain
};

}  // namespace tonewerk
