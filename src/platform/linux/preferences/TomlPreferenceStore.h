// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <map>
#include <string>

#include "platform/PreferenceStore.h"
#include "platform/linux/preferences/TomlFile.h"
#include "values/Mutex.h"

namespace tonewerk {

// Preferences as TOML files, one a domain: <configuration directory>/<domain>.toml, overlaid key by key by
// <state directory>/<domain>.toml. Only the latter is written, and holds only what differs from the former.
//
// A read looks at both files (two stat() calls) and reads what changed. A write holds a lock file, so that no
// writer in this or another process loses another's keys, and ends after the new file is on the disk. What
// root makes belongs to whom the directory around it belongs to, so that the daemon can go on writing there.
//
// A file that does not parse is read as empty. If it is the written one, writes to its domain fail
// (std::errc::invalid_argument) until somebody has mended or removed it.
//
// A domain that is no plain file name (empty, with a slash, beginning with a dot) holds nothing and is
// refused for writing with std::errc::invalid_argument; a value that TOML cannot say with
// std::errc::result_out_of_range.
class TomlPreferenceStore final : public PreferenceStore {
 public:
  // The directories need not exist; the second is made when something is written. `log` outlives the store.
  TomlPreferenceStore(std::string configurationDirectory, std::string stateDirectory, const LogCategory& log);

  // What the configuration says of a domain, and what was written over it.
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

  // Read their files where they changed, so that what is wrong with them is logged now and not when somebody
  // needs them. A name that is no preference file's is nobody's.
  void checkFile(std::string_view fileName) const;
  void checkAllFiles() const;

  const std::string& configurationDirectory() const { return configurationDirectory_; }
  const std::string& stateDirectory() const { return stateDirectory_; }

 private:
  struct Domain {
    TomlFile configured;
    TomlFile written;
  };
  // What both files hold at this moment.
  struct Contents {
    ValueMap configured;
    ValueMap written;
    std::string problem;  // why `written` must not be overwritten
  };
  Contents contentsOf(std::string_view domain) const;
  // Runs `change` on the domain's contents under the writers' lock, and stores what it leaves in `written`.
  template <typename Change>
  [[nodiscard]] std::error_code update(std::string_view domain, std::string* problem, Change change);
  [[nodiscard]] std::error_code store(std::string_view domain, const Contents& contents,
                                      std::string& problem) const;

  const std::string configurationDirectory_;
  const std::string stateDirectory_;
  const LogCategory& log_;
  mutable Mutex mutex_;  // not held while a writer waits for the disk
  mutable std::map<std::string, Domain, std::less<>> domains_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
