// SPDX-License-Identifier: Apache-2.0
#include "support/OtlpSchema.h"

#include <charconv>
#include <cstdint>
#include <functional>
#include <map>
#include <nlohmann/json.hpp>
#include <set>

namespace tonewerk {
namespace {

using Json = nlohmann::json;

class Checker {
 public:
  using Check = std::function<void(const Json& json, const std::string& at)>;
  using Fields = std::map<std::string, Check>;

  std::vector<std::string> problems;

  void request(const Json& json, const std::string& at) {
    object(json, at, {{"resourceLogs", listOf(&Checker::resourceLogs)}});
  }

 private:
  void addProblem(const std::string& at, const std::string& what) { problems.push_back(at + ": " + what); }

  void object(const Json& json, const std::string& at, const Fields& fields) {
    if (!json.is_object()) return addProblem(at, "is no object");
    for (const auto& [key, value] : json.items()) {
      const auto field = fields.find(key);
      if (field == fields.end()) {
        addProblem(at, "has the unknown key \"" + key + "\"");
      } else {
        std::string place = at;
        place.append(".").append(key);
        field->second(value, place);
      }
    }
  }
  void require(const Json& json, const std::string& at, const std::string& key) {
    if (json.is_object() && !json.contains(key)) addProblem(at, "lacks \"" + key + "\"");
  }
  Check listOf(void (Checker::*element)(const Json& json, const std::string& at)) {
    return [this, element](const Json& json, const std::string& at) {
      if (!json.is_array()) return addProblem(at, "is no array");
      for (std::size_t n = 0; n < json.size(); ++n)
        (this->*element)(json[n], at + "[" + std::to_string(n) + "]");
    };
  }
  Check one(void (Checker::*element)(const Json& json, const std::string& at)) {
    return [this, element](const Json& json, const std::string& at) { (this->*element)(json, at); };
  }

  void resourceLogs(const Json& json, const std::string& at) {
    object(json, at,
           {{"resource", one(&Checker::resource)},
            {"scopeLogs", listOf(&Checker::scopeLogs)},
            {"schemaUrl", one(&Checker::text)}});
  }
  void resource(const Json& json, const std::string& at) {
    object(
        json, at,
        {{"attributes", one(&Checker::attributes)}, {"droppedAttributesCount", one(&Checker::unsigned32)}});
  }
  void scopeLogs(const Json& json, const std::string& at) {
    object(json, at,
           {{"scope", one(&Checker::scope)},
            {"logRecords", listOf(&Checker::logRecord)},
            {"schemaUrl", one(&Checker::text)}});
  }
  void scope(const Json& json, const std::string& at) {
    object(json, at,
           {{"name", one(&Checker::text)},
            {"version", one(&Checker::text)},
            {"attributes", one(&Checker::attributes)},
            {"droppedAttributesCount", one(&Checker::unsigned32)}});
  }
  void logRecord(const Json& json, const std::string& at) {
    object(json, at,
           {{"timeUnixNano", one(&Checker::time)},
            {"observedTimeUnixNano", one(&Checker::time)},
            {"severityNumber", one(&Checker::severity)},
            {"severityText", one(&Checker::text)},
            {"body", one(&Checker::anyValue)},
            {"attributes", one(&Checker::attributes)},
            {"droppedAttributesCount", one(&Checker::unsigned32)},
            {"flags", one(&Checker::unsigned32)},
            {"traceId", hexOf(32)},
            {"spanId", hexOf(16)},
            {"eventName", one(&Checker::text)}});
    require(json, at, "timeUnixNano");
    require(json, at, "observedTimeUnixNano");
  }

  void attributes(const Json& json, const std::string& at) {
    listOf (&Checker::keyValue)(json, at);
    if (!json.is_array()) return;
    std::set<std::string> keys;
    for (const Json& entry : json) {
      if (!entry.is_object() || !entry.contains("key") || !entry["key"].is_string()) continue;
      if (!keys.insert(entry["key"]).second)
        addProblem(at, "has \"" + entry["key"].get<std::string>() + "\" twice");
    }
  }
  void keyValue(const Json& json, const std::string& at) {
    object(json, at, {{"key", one(&Checker::key)}, {"value", one(&Checker::anyValue)}});
    require(json, at, "key");
    require(json, at, "value");
  }
  void anyValue(const Json& json, const std::string& at) {
    object(json, at,
           {{"stringValue", one(&Checker::text)},
            {"boolValue", one(&Checker::boolean)},
            {"intValue", one(&Checker::signed64)},
            {"doubleValue", one(&Checker::number)},
            {"arrayValue", one(&Checker::arrayValue)},
            {"kvlistValue", one(&Checker::kvlistValue)},
            {"bytesValue", one(&Checker::bytes)}});
    if (json.is_object() && json.size() != 1)
      addProblem(at, "is of " + std::to_string(json.size()) + " kinds");
  }
  void arrayValue(const Json& json, const std::string& at) {
    object(json, at, {{"values", listOf(&Checker::anyValue)}});
  }
  void kvlistValue(const Json& json, const std::string& at) {
    object(json, at, {{"values", listOf(&Checker::innerKeyValue)}});
  }
  // A client's nested map may have an empty key; the schema allows it there.
  void innerKeyValue(const Json& json, const std::string& at) {
    object(json, at, {{"key", one(&Checker::text)}, {"value", one(&Checker::anyValue)}});
    require(json, at, "value");
  }

  void text(const Json& json, const std::string& at) {
    if (!json.is_string()) addProblem(at, "is no text");
  }
  void key(const Json& json, const std::string& at) {
    if (!json.is_string() || json.get<std::string>().empty()) addProblem(at, "is no key");
  }
  void boolean(const Json& json, const std::string& at) {
    if (!json.is_boolean()) addProblem(at, "is no boolean");
  }
  void number(const Json& json, const std::string& at) {
    const bool isWord = json.is_string() && (json == "NaN" || json == "Infinity" || json == "-Infinity");
    if (!json.is_number() && !isWord) addProblem(at, "is no number");
  }
  void unsigned32(const Json& json, const std::string& at) {
    if (!json.is_number_unsigned() || json.get<std::uint64_t>() > 0xFFFFFFFF)
      addProblem(at, "is no 32-bit integer");
  }
  void severity(const Json& json, const std::string& at) {
    if (!json.is_number_unsigned() || json.get<std::uint64_t>() > 24) addProblem(at, "is no severity");
  }
  void signed64(const Json& json, const std::string& at) {
    std::int64_t value = 0;
    decimal(json, at, value);
  }
  void time(const Json& json, const std::string& at) {
    std::uint64_t value = 0;
    if (decimal(json, at, value) && value == 0) addProblem(at, "is not set");
  }
  template <typename T>
  bool decimal(const Json& json, const std::string& at, T& value) {
    if (json.is_string()) {
      const auto& digits = json.get_ref<const std::string&>();
      const char* end = digits.data() + digits.size();
      const auto result = std::from_chars(digits.data(), end, value);
      if (!digits.empty() && result.ec == std::errc() && result.ptr == end) return true;
    }
    addProblem(at, "is no 64-bit integer as text");
    return false;
  }
  Check hexOf(std::size_t digits) {
    return [this, digits](const Json& json, const std::string& at) {
      const std::string hex = json.is_string() ? json.get<std::string>() : "?";
      if (!hex.empty() &&
          (hex.size() != digits || hex.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)) {
        addProblem(at, "is no identifier in hex");
      }
    };
  }
  void bytes(const Json& json, const std::string& at) {
    constexpr const char* kDigits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/=";
    if (!json.is_string() || json.get<std::string>().find_first_not_of(kDigits) != std::string::npos) {
      addProblem(at, "is no base64");
    }
  }
};

// Parses the document, and adds a problem for each key that an object has twice.
Json parse(std::string_view text, std::vector<std::string>& problems) {
  std::vector<std::set<std::string>> keys;
  return Json::parse(
      text,
      [&](int /*depth*/, Json::parse_event_t event, Json& parsed) {
        if (event == Json::parse_event_t::object_start) keys.emplace_back();
        if (event == Json::parse_event_t::object_end) keys.pop_back();
        if (event == Json::parse_event_t::key && !keys.back().insert(parsed.get<std::string>()).second) {
          problems.push_back("the key \"" + parsed.get<std::string>() + "\" is there twice");
        }
        return true;
      },
      false);
}

}  // namespace

std::vector<std::string> problemsOfOtlpLogs(std::string_view json) {
  std::vector<std::string> problems;
  const Json document = parse(json, problems);
  if (document.is_discarded()) return {"no JSON"};
  Checker checker;
  checker.request(document, "request");
  problems.insert(problems.end(), checker.problems.begin(), checker.problems.end());
  return problems;
}

}  // namespace tonewerk
