// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryJsonService.h"

#include <cmath>
#include <nlohmann/json.hpp>

#include "values/CompactJson.h"

namespace tonewerk {
namespace {

// Returns the first number in `value` that is not finite; null when all are finite.
const double* notFinite(const Value& value) {
  if (const double* number = value.asDouble()) return std::isfinite(*number) ? nullptr : number;
  if (const ValueArray* array = value.asArray()) {
    for (const Value& element : *array) {
      if (const double* found = notFinite(element)) return found;
    }
  }
  if (const ValueMap* map = value.asMap()) {
    for (const ValueMap::Entry& entry : *map) {
      if (const double* found = notFinite(entry.value)) return found;
    }
  }
  return nullptr;
}

void appendPretty(std::string& out, const Value& value, std::size_t depth) {
  const ValueArray* array = value.asArray();
  const ValueMap* map = value.asMap();
  if ((array == nullptr || array->empty()) && (map == nullptr || map->empty())) {
    return appendCompactJson(out, value);
  }
  const auto newLine = [&](std::size_t indentation, std::string_view before) {
    out += before;
    out += '\n';
    out.append(2 * indentation, ' ');
  };
  if (array != nullptr) {
    out += '[';
    for (const Value& element : *array) {
      newLine(depth + 1, &element == array->begin() ? "" : ",");
      appendPretty(out, element, depth + 1);
    }
    newLine(depth, "");
    out += ']';
    return;
  }
  out += '{';
  for (const ValueMap::Entry& entry : *map) {
    newLine(depth + 1, &entry == map->begin() ? "" : ",");
    appendCompactJson(out, Value(entry.key));
    out += ": ";
    appendPretty(out, entry.value, depth + 1);
  }
  newLine(depth, "");
  out += '}';
}

std::optional<Value> valueOf(const nlohmann::ordered_json& json, std::string& problem) {
  using Type = nlohmann::ordered_json::value_t;
  switch (json.type()) {
    case Type::boolean:
      return Value(json.get<bool>());
    case Type::number_integer:
      return Value(json.get<std::int64_t>());
    case Type::number_unsigned: {
      const auto number = json.get<std::uint64_t>();
      if (number > static_cast<std::uint64_t>(INT64_MAX)) return Value(number);
      return Value(static_cast<std::int64_t>(number));
    }
    case Type::number_float:
      return Value(json.get<double>());
    case Type::string:
      return Value(json.get_ref<const std::string&>());
    case Type::array: {
      ValueArray array;
      for (const auto& element : json) {
        std::optional<Value> value = valueOf(element, problem);
        if (!value) return std::nullopt;
        array.append(std::move(*value));
      }
      return Value(std::move(array));
    }
    case Type::object: {
      ValueMap map;
      for (const auto& entry : json.items()) {
        std::optional<Value> value = valueOf(entry.value(), problem);
        if (!value) return std::nullopt;
        map.set(entry.key(), std::move(*value));
      }
      return Value(std::move(map));
    }
    default:
      problem = "null";
      return std::nullopt;
  }
}

}  // namespace

std::string MemoryJsonService::compact(const ValueMap& map) const { return map.text(); }

std::optional<std::string> MemoryJsonService::pretty(const ValueMap& map, std::string& problem) const {
  if (const double* number = notFinite(Value(map))) {
    problem = "JSON cannot say " + textOf(*number);
    return std::nullopt;
  }
  std::string out;
  appendPretty(out, Value(map), 0);
  return out;
}

std::optional<Value> MemoryJsonService::parse(std::string_view text, std::string& problem) const {
  const auto json = nlohmann::ordered_json::parse(text, nullptr, false);
  if (json.is_discarded()) {
    problem = "no JSON";
    return std::nullopt;
  }
  return valueOf(json, problem);
}

}  // namespace tonewerk
