// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// One message of a session as a record of OTLP's logs signal.
struct OtlpLogRecord {
  double time = 0.0;       // seconds since 1970
  std::string identifier;  // a ULID; a receiver takes records of one identifier as one
  std::string eventName;
  std::int64_t sessionIdentifier = 0;
  std::uint16_t category = 0;
  std::uint16_t type = 0;
  ValueMap payload;
  // For receivers that are older than the field for the event's name: says it in an attribute as well.
  bool repeatsEventName = false;
};

// As JSON. Attributes are "session.id", "tonewerk.category", "tonewerk.type", "log.record.uid" and the
// payload's entries under their own keys. Entries without a key, or with the key of one of ours, are left out
// and counted in "droppedAttributesCount". A date is an RFC 3339 text, an integer beyond the signed 64-bit
// ones its digits as text.
std::string otlpJsonOf(const OtlpLogRecord& record);

// Who reports.
struct OtlpResource {
  std::string serviceName;
  std::string serviceVersion;
  std::string hostIdentifier;    // empty when unknown
  std::string deviceIdentifier;  // empty unless somebody opted in
};

// The JSON of a request that carries `records`, each as otlpJsonOf() gives it.
std::string otlpRequestOf(const OtlpResource& resource, std::span<const std::string> records);

}  // namespace tonewerk
