// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "values/Value.h"

namespace tonewerk {

// Settings that outlive the process, values under keys under domains such as "com.orvane.metricon". What the
// device's configuration says is overlaid by what was written here.
//
// Any thread. A read sees every write that ended before it began, also one by another process.
class PreferenceStore {
 public:
  virtual ~PreferenceStore() = default;

  virtual std::optional<Value> read(std::string_view domain, std::string_view key) const = 0;

  // Everything the domain holds, overlaid.
  virtual ValueMap readAll(std::string_view domain) const = 0;

  // On disk when it returns without an error. A failure (a value that the store cannot express, a file that
  // does not parse, a full disk) changes nothing; `problem` then says it in words when it is not null.
  [[nodiscard]] virtual std::error_code write(std::string_view domain, std::string_view key,
                                              const Value& value, std::string* problem = nullptr) = 0;

  // Fails with std::errc::no_such_file_or_directory for a key that is nowhere, and with
  // std::errc::operation_not_permitted for one that only the configuration holds.
  [[nodiscard]] virtual std::error_code remove(std::string_view domain, std::string_view key,
                                               std::string* problem = nullptr) = 0;
};

}  // namespace tonewerk
