// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// One message of a session as an OTLP log record.
struct OtlpLogRecord {
  double time = 0.0;       // seconds since 1970
  std::string identifier;  // a ULID, by which a receiver recognises duplicates
  std::string eventName;
  std::int64_t sessionIdentifier = 0;
  std::uint16_t category = 0;
  std::uint16_t type = 0;
  ValueMap payload;
  // Also writes the event's name as an attribute, for old receivers that do not know the field for it.
  bool repeatsEventName = false;
};

// The record as JSON. Its attributes are "session.id", "tonewerk.category", "tonewerk.type", "log.record.uid"
// and the payload's entries under their own keys. An entry is left out, and counted in
// "droppedAttributesCount", if its key is empty or is one of those four or "event.name". A date is written as
// an RFC 3339 text. An integer that does not fit into a signed 64-bit one is written as a text of its digits.
std::string otlpJsonOf(const OtlpLogRecord& record);

// Identifies the sender of records.
struct OtlpResource {
  std::string serviceName;
  std::string serviceVersion;
  std::string hostIdentifier;    // empty if unknown
  std::string deviceIdentifier;  // empty unless a user opted in
};

// The JSON of a request with `records`, which are results of otlpJsonOf().
std::string otlpRequestOf(const OtlpResource& resource, std::span<const std::string> records);

}  // namespace tonewerk
