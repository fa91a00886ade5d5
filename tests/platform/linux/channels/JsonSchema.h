// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <nlohmann/json.hpp>
#include <string>

namespace tonewerk {

// Validates JSON values against a JSON Schema. It supports the keywords that our schemas use. A schema with
// another keyword matches no value, so that no keyword is ignored.
class JsonSchema {
 public:
  explicit JsonSchema(nlohmann::json schema) : schema_(std::move(schema)) {}

  bool fits(const nlohmann::json& value) const { return fits(value, schema_); }

 private:
  using Json = nlohmann::json;

  bool fits(const Json& value, const Json& schema) const {
    return std::all_of(schema.items().begin(), schema.items().end(),
                       [&](const auto& rule) { return keeps(value, rule.key(), rule.value(), schema); });
  }

  bool keeps(const Json& value, const std::string& keyword, const Json& rule, const Json& schema) const {
    if (keyword == "$schema" || keyword == "title" || keyword == "$defs" || keyword == "then") return true;
    if (keyword == "$ref")
      return fits(value, schema_.at(Json::json_pointer(rule.get<std::string>().substr(1))));
    if (keyword == "type") return isOfType(value, rule.get<std::string>());
    if (keyword == "const") return value == rule;
    if (keyword == "minimum") return !value.is_number() || numberOf(value) >= numberOf(rule);
    if (keyword == "maximum") return !value.is_number() || numberOf(value) <= numberOf(rule);
    if (keyword == "maxItems") return !value.is_array() || value.size() <= rule.get<std::size_t>();
    if (keyword == "required") return !value.is_object() || holds(value, rule);
    if (keyword == "properties") return !value.is_object() || keepsEach(value, rule);
    if (keyword == "if") return !fits(value, rule) || fits(value, schema.at("then"));
    if (keyword == "items") {
      return !value.is_array() ||
             std::all_of(value.begin(), value.end(), [&](const Json& item) { return fits(item, rule); });
    }
    if (keyword == "allOf") {
      return std::all_of(rule.begin(), rule.end(), [&](const Json& part) { return fits(value, part); });
    }
    return false;
  }

  bool keepsEach(const Json& value, const Json& properties) const {
    return std::all_of(properties.items().begin(), properties.items().end(), [&](const auto& property) {
      return !value.contains(property.key()) || fits(value.at(property.key()), property.value());
    });
  }

  static bool holds(const Json& value, const Json& keys) {
    return std::all_of(keys.begin(), keys.end(),
                       [&](const Json& key) { return value.contains(key.get<std::string>()); });
  }

  static bool isOfType(const Json& value, const std::string& type) {
    if (type == "object") return value.is_object();
    if (type == "array") return value.is_array();
    if (type == "string") return value.is_string();
    if (type == "number") return value.is_number();
    // The library reads an integer beyond 64 bits as a double.
    if (type == "integer") return value.is_number_integer() || (value.is_number() && numberOf(value) > 1e18L);
    return false;
  }

  // A type that holds all signed and unsigned 64-bit integers.
  static long double numberOf(const Json& value) {
    if (value.is_number_unsigned()) return static_cast<long double>(value.get<std::uint64_t>());
    if (value.is_number_integer()) return static_cast<long double>(value.get<std::int64_t>());
    return static_cast<long double>(value.get<double>());
  }

  const Json schema_;
};

}  // namespace tonewerk
