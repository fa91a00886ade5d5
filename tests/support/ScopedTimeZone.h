// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <stdlib.h>
#include <string>
#include <time.h>

namespace tonewerk {

// Sets the time zone of the process while it exists.
class ScopedTimeZone {
 public:
  // `zone` as in the variable TZ.
  explicit ScopedTimeZone(const char* zone) {
    if (const char* before = getenv("TZ")) before_ = before;
    setenv("TZ", zone, 1);
    tzset();
  }
  ScopedTimeZone(const ScopedTimeZone&) = delete;
  ScopedTimeZone& operator=(const ScopedTimeZone&) = delete;
  ~ScopedTimeZone() {
    before_ ? setenv("TZ", before_->c_str(), 1) : unsetenv("TZ");
    tzset();
  }

 private:
  std::optional<std::string> before_;
};

}  // namespace tonewerk
