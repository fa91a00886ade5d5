// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "values/Value.h"

namespace tonewerk {

// Stores settings that outlive the process: values under keys under domains such as "com.orvane.metricon".
// Written values take precedence over the device's configuration.
//
// Any thread. A read sees every write that ended before the read began, also a write by another process.
class PreferenceStore {
 public:
  virtual ~PreferenceStore() = default;

  virtual std::optional<Value> read(std::string_view domain, std::string_view key) const = 0;

  // Returns everything in the domain; written values replace configured ones.
  virtual ValueMap readAll(std::string_view domain) const = 0;

  // The value is on disk when this returns without an error. A failure (a value that the store cannot
  // express, a file that does not parse, a full disk) changes nothing; `problem`, when it is not null, then
  // describes it.
  [[nodiscard]] virtual std::error_code write(std::string_view domain, std::string_view key,
                                              const Value& value, std::string* problem = nullptr) = 0;

  // Fails with std::errc::no_such_file_or_directory for a key that does not exist, and with
  // std::errc::operation_not_permitted for a key that only the configuration holds.
  [[nodiscard]] virtual std::error_code remove(std::string_view domain, std::string_view key,
                                               std::string* problem = nullptr) = 0;
};

}  // namespace tonewerk
