// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "platform/PreferenceStore.h"

namespace tonewerk {

// Reads and writes the reporting defaults: the daemon's own domain of the preferences. The SingletonRegistry
// holds the one object. Any thread.
class TWReportingDefaults {
 public:
  static constexpr std::string_view kDomain = "com.orvane.tonewerk.twreporting";

  // `store` must outlive the object.
  explicit TWReportingDefaults(PreferenceStore& store) : store_(store) {}

  std::optional<Value> read(std::string_view key) const { return store_.read(kDomain, key); }

  // The value is on disk when this returns without an error; see PreferenceStore::write().
  [[nodiscard]] std::error_code write(std::string_view key, const Value& value, std::string* problem) {
    return store_.write(kDomain, key, value, problem);
  }

 private:
  PreferenceStore& store_;
};

}  // namespace tonewerk
