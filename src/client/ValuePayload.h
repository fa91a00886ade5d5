// SPDX-License-Identifier: Apache-2.0
#pragma once

// Header only, on top of the C interface. For our own programs that use values and link the library as other
// programs do.
#include <cstddef>
#include <string>
#include <vector>

#include "protocol/RequestSet.h"
#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

[[nodiscard]] inline twr_status putValue(twr_payload* payload, const char* name, const Value& value);

// TWR_INVALID for a name that contains a zero byte, because the C interface would cut it off there.
[[nodiscard]] inline twr_status putEntries(twr_payload* payload, const ValueMap& map) {
  for (const ValueMapEntry& entry : map) {
    const std::string name(entry.key);
    if (name.find('\0') != std::string::npos) return TWR_INVALID;
    if (const twr_status status = putValue(payload, name.c_str(), entry.value); status != TWR_OK)
      return status;
  }
  return TWR_OK;
}

[[nodiscard]] inline twr_status putElements(twr_payload* payload, const ValueArray& array) {
  for (const Value& element : array) {
    if (const twr_status status = putValue(payload, nullptr, element); status != TWR_OK) return status;
  }
  return TWR_OK;
}

// Puts `value` and all that it contains. After a failure, containers may be open.
[[nodiscard]] inline twr_status putValue(twr_payload* payload, const char* name, const Value& value) {
  twr_status status = TWR_OK;
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return twr_put_bool(payload, name, *value.asBoolean() ? 1 : 0);
    case Value::Kind::kInteger:
      return twr_put_int(payload, name, *value.asInteger());
    case Value::Kind::kUnsigned:
      return twr_put_uint(payload, name, *value.asUnsigned());
    case Value::Kind::kDouble:
      return twr_put_double(payload, name, *value.asDouble());
    case Value::Kind::kString: {
      const std::string text(*value.asString());
      return twr_put_text_n(payload, name, text.data(), text.size());
    }
    case Value::Kind::kDate:
      return twr_put_date(payload, name, value.asDate()->seconds);
    case Value::Kind::kArray:
      status = twr_open_list(payload, name);
      if (status == TWR_OK) status = putElements(payload, *value.asArray());
      break;
    case Value::Kind::kMap:
      status = twr_open_map(payload, name);
      if (status == TWR_OK) status = putEntries(payload, *value.asMap());
      break;
  }
  return status == TWR_OK ? twr_close(payload) : status;
}

// Builds a payload of values, in memory that grows as needed.
class ValuePayload {
 public:
  ValuePayload() : memory_(kFirstBytes) {}

  // Builds a message or a configuration. Fails as the C interface does; the payload must then not be sent.
  [[nodiscard]] twr_status set(const ValueMap& map) {
    return fill([&] {
      twr_payload_init(&payload_, memory_.data(), memory_.size());
      return putEntries(&payload_, map);
    });
  }

  // Builds a request's parameters.
  [[nodiscard]] twr_status set(const Arguments& arguments) {
    return fill([&] {
      twr_payload_init_list(&payload_, memory_.data(), memory_.size());
      for (const Argument& argument : arguments) {
        const twr_status status = argument ? putValue(&payload_, nullptr, *argument) : twr_put_nil(&payload_);
        if (status != TWR_OK) return status;
      }
      return TWR_OK;
    });
  }

  const twr_payload* get() const { return &payload_; }

 private:
  static constexpr std::size_t kFirstBytes = 4096;
  static constexpr std::size_t kMaxBytes = std::size_t{2}
                                           << 20;  // more than a frame of the protocol can contain

  template <class Fill>
  [[nodiscard]] twr_status fill(Fill once) {
    twr_status status = once();
    while (status == TWR_TOO_LARGE && memory_.size() < kMaxBytes) {
      memory_.resize(memory_.size() * 2);
      status = once();
    }
    return status;
  }

  std::vector<unsigned char> memory_;
  twr_payload payload_{};
};

}  // namespace tonewerk
