// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpLogRecord.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <utility>

#include "values/CompactJson.h"
#include "values/ForEach.h"

namespace tonewerk {
namespace {

constexpr int kSeverityInfo = 9;
constexpr std::string_view kScopeName = "com.orvane.tonewerk.linkreport";
constexpr std::string_view kSessionKey = "session.id";
constexpr std::string_view kCategoryKey = "tonewerk.category";
constexpr std::string_view kTypeKey = "tonewerk.type";
constexpr std::string_view kIdentifierKey = "log.record.uid";
constexpr std::string_view kEventNameKey = "event.name";
constexpr std::array kReservedKeys{kSessionKey, kCategoryKey, kTypeKey, kIdentifierKey, kEventNameKey};

void appendText(std::string& out, std::string_view text) { appendCompactJson(out, Value(text)); }

void appendDouble(std::string& out, double number) {
  if (std::isnan(number)) {
    out += "\"NaN\"";
  } else if (std::isinf(number)) {
    out += number > 0 ? "\"Infinity\"" : "\"-Infinity\"";
  } else {
    appendCompactJson(out, Value(number));
  }
}

void appendAnyValue(std::string& out, ValueView value);

void appendKeyValue(std::string& out, std::string_view key, ValueView value) {
  out += R"({"key":)";
  appendText(out, key);
  out += R"(,"value":)";
  appendAnyValue(out, value);
  out += '}';
}

void appendArray(std::string& out, ValueView array) {
  out += R"("arrayValue":{"values":[)";
  const char* separator = "";
  forEachElement(array, [&](ValueView element) {
    out += std::exchange(separator, ",");
    appendAnyValue(out, element);
  });
  out += "]}";
}

void appendMap(std::string& out, ValueView map) {
  out += R"("kvlistValue":{"values":[)";
  const char* separator = "";
  forEachEntry(map, [&](std::string_view key, ValueView value) {
    out += std::exchange(separator, ",");
    appendKeyValue(out, key, value);
  });
  out += "]}";
}

void appendUnsigned(std::string& out, std::uint64_t number) {
  constexpr auto kMax = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  out += number <= kMax ? R"("intValue":")" : R"("stringValue":")";
  out += std::to_string(number) + '"';
}

void appendAnyValue(std::string& out, ValueView value) {
  out += '{';
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      out += value.boolean() ? R"("boolValue":true)" : R"("boolValue":false)";
      break;
    case Value::Kind::kInteger:
      out += R"("intValue":")" + std::to_string(value.integer()) + '"';
      break;
    case Value::Kind::kUnsigned:
      appendUnsigned(out, *value.value().asUnsigned());
      break;
    case Value::Kind::kDouble:
      out += R"("doubleValue":)";
      appendDouble(out, value.number());
      break;
    case Value::Kind::kString:
    case Value::Kind::kDate:
      out += R"("stringValue":)";
      appendCompactJson(out, value);
      break;
    case Value::Kind::kArray:
      appendArray(out, value);
      break;
    case Value::Kind::kMap:
      appendMap(out, value);
      break;
  }
  out += '}';
}

// Appends an "attributes" list to a text.
class Attributes {
 public:
  explicit Attributes(std::string& out) : out_(out) { out_ += R"("attributes":[)"; }
  void add(std::string_view key, ValueView value) {
    if (!isFirst_) out_ += ',';
    isFirst_ = false;
    appendKeyValue(out_, key, value);
  }
  void addUnlessEmpty(std::string_view key, const std::string& text) {
    if (!text.empty()) add(key, Value(text));
  }
  void end() { out_ += ']'; }

 private:
  std::string& out_;
  bool isFirst_ = true;
};

bool isReserved(std::string_view key) {
  return std::find(kReservedKeys.begin(), kReservedKeys.end(), key) != kReservedKeys.end();
}

// Returns how many entries were left out.
std::size_t addPayload(Attributes& attributes, const ValueMap& payload) {
  std::size_t leftOut = 0;
  payload.forEach([&](const SharedString& key, ValueView value) {
    if (key.empty() || isReserved(key)) {
      ++leftOut;
    } else {
      attributes.add(key, value);
    }
  });
  return leftOut;
}

std::string nanosecondsOf(double seconds) {
  constexpr double kMaxSeconds = 1e10;
  const double within = seconds > 0.0 ? std::min(seconds, kMaxSeconds) : 0.0;
  const double whole = std::floor(within);
  const auto fraction = static_cast<std::uint64_t>(std::llround((within - whole) * 1e9));
  return std::to_string(static_cast<std::uint64_t>(whole) * 1'000'000'000 + fraction);
}

}  // namespace

std::string otlpJsonOf(const OtlpLogRecord& record) {
  const std::string time = nanosecondsOf(record.time);
  std::string out = R"({"timeUnixNano":")" + time + R"(","observedTimeUnixNano":")" + time +
                    R"(","severityNumber":)" + std::to_string(kSeverityInfo) + R"(,"eventName":)";
  appendText(out, record.eventName);
  out += ',';
  Attributes attributes(out);
  attributes.add(kSessionKey, Value(std::to_string(record.sessionIdentifier)));
  attributes.add(kCategoryKey, Value(static_cast<std::int64_t>(record.category)));
  attributes.add(kTypeKey, Value(static_cast<std::int64_t>(record.type)));
  attributes.add(kIdentifierKey, Value(record.identifier));
  if (record.repeatsEventName) attributes.add(kEventNameKey, Value(record.eventName));
  const std::size_t leftOut = addPayload(attributes, record.payload);
  attributes.end();
  if (leftOut > 0) out += R"(,"droppedAttributesCount":)" + std::to_string(leftOut);
  out += '}';
  return out;
}

std::string otlpRequestOf(const OtlpResource& resource, std::span<const std::string> records) {
  std::string out = R"({"resourceLogs":[{"resource":{)";
  Attributes attributes(out);
  attributes.add("service.name", Value(resource.serviceName));
  attributes.add("service.version", Value(resource.serviceVersion));
  attributes.addUnlessEmpty("host.id", resource.hostIdentifier);
  attributes.addUnlessEmpty("device.id", resource.deviceIdentifier);
  attributes.end();
  out += R"(},"scopeLogs":[{"scope":{"name":)";
  appendText(out, kScopeName);
  out += R"(,"version":)";
  appendText(out, resource.serviceVersion);
  out += R"(},"logRecords":[)";
  for (const std::string& record : records) {
    if (&record != records.data()) out += ',';
    out += record;
  }
  out += "]}]}]}";
  return out;
}

}  // namespace tonewerk
