// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

inline twr_status put(twr_payload* payload, const char* name, const Value& value);

inline twr_status putEntries(twr_payload* payload, const ValueMap& map) {
  twr_status status = TWR_OK;
  for (const ValueMapEntry& entry : map) {
    if (status == TWR_OK) status = put(payload, std::string(entry.key).c_str(), entry.value);
  }
  return status;
}

// Puts `value`, and all that it holds, by the functions of the C interface. Names end at their first zero.
inline twr_status put(twr_payload* payload, const char* name, const Value& value) {
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
      for (const Value& element : *value.asArray()) {
        if (status == TWR_OK) status = put(payload, nullptr, element);
      }
      break;
    case Value::Kind::kMap:
      status = twr_open_map(payload, name);
      if (status == TWR_OK) status = putEntries(payload, *value.asMap());
      break;
  }
  return status == TWR_OK ? twr_close(payload) : status;
}

}  // namespace tonewerk
