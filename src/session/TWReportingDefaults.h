// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "platform/PreferenceStore.h"

namespace tonewerk {

// The reporting defaults: the daemon's own domain of the preferences. Kept as one of the process's single
// objects. Any thread.
class TWReportingDefaults {
 public:
  static constexpr std::string_view kDomain = "com.orvane.tonewerk.twreporting";

  // `store` outlives the object.
  explicit TWReportingDefaults(PreferenceStore& store) : store_(store) {}

  std::optional<Value> read(std::string_view key) const { return store_.read(kDomain, key); }

  // On disk when it returns without an error; see PreferenceStore::write().
  [[nodiscard]] std::error_code write(std::string_view key, const Value& value, std::string* problem) {
    return store_.write(kDomain, key, value, problem);
  }

 private:
  PreferenceStore& store_;
};

}  // namespace tonewerk
