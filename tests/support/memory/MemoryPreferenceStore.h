// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <string>

#include "platform/PreferenceStore.h"
#include "values/Mutex.h"

namespace tonewerk {

// Holds preferences that live as long as the test. Any thread.
//
//   preferences.configure("com.orvane.x", "limit", 5);       // what the device's configuration says
//   preferences.write("com.orvane.x", "limit", 6);           // what somebody set
//   preferences.failWrites(std::errc::no_space_on_device);   // from now on
class MemoryPreferenceStore final : public PreferenceStore {
 public:
  std::optional<Value> read(std::string_view domain, std::string_view key) const override;
  ValueMap readAll(std::string_view domain) const override;
  [[nodiscard]] std::error_code write(std::string_view domain, std::string_view key, const Value& value,
                                      std::string* problem = nullptr) override;
  [[nodiscard]] std::error_code remove(std::string_view domain, std::string_view key,
                                       std::string* problem = nullptr) override;

  void configure(std::string_view domain, std::string_view key, const Value& value);
  // From now on writes and removals fail with `error`; std::errc() makes them succeed again.
  void failWrites(std::errc error);
  // Returns the written values that differ from the configuration.
  ValueMap written(std::string_view domain) const;

 private:
  struct Domain {
    ValueMap configured;
    ValueMap written;
  };

  const Domain* find(std::string_view domain) const REQUIRES(mutex_);
  [[nodiscard]] std::error_code checkWrite(std::string_view domain, std::string* problem) const
      REQUIRES(mutex_);

  mutable Mutex mutex_;
  std::map<std::string, Domain, std::less<>> domains_ GUARDED_BY(mutex_);
  std::errc failure_ GUARDED_BY(mutex_){};
};

}  // namespace tonewerk
