// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <stdlib.h>
#include <string>

namespace tonewerk {

// Sets a variable of the environment while it exists, or removes it.
class ScopedVariable {
 public:
  // `value`: null for none.
  ScopedVariable(std::string name, const char* value) : name_(std::move(name)) {
    if (const char* before = getenv(name_.c_str())) before_ = before;
    set(value);
  }
  ScopedVariable(const ScopedVariable&) = delete;
  ScopedVariable& operator=(const ScopedVariable&) = delete;
  ~ScopedVariable() { set(before_ ? before_->c_str() : nullptr); }

 private:
  void set(const char* value) {
    value != nullptr ? setenv(name_.c_str(), value, 1) : unsetenv(name_.c_str());
  }

  const std::string name_;
  std::optional<std::string> before_;
};

}  // namespace tonewerk
