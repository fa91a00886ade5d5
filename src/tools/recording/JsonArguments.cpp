// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/JsonArguments.h"

#include <nlohmann/json.hpp>
#include <optional>

#include "platform/JsonService.h"

namespace tonewerk {
namespace {

using Json = nlohmann::ordered_json;

// No request holds values that nest deeper. The library writes values recursively, so a line that is deep
// enough would exhaust the stack.
constexpr int kMaxDepth = 200;

// Values cannot be null, so the array of arguments is read here. The service reads the values themselves, by
// the same rules as the daemon.
std::optional<Value> valueOf(const Json& json, const JsonService& service, std::string& problem) {
  return service.parse(json.dump(), problem);
}

std::string takeArguments(const Json& array, const JsonService& service, Arguments& arguments) {
  for (const Json& element : array) {
    if (element.is_null()) {
      arguments.emplace_back();
      continue;
    }
    std::string problem;
    std::optional<Value> value = valueOf(element, service, problem);
    if (!value) return "parameter " + std::to_string(arguments.size() + 1) + ": " + problem;
    arguments.emplace_back(std::move(*value));
  }
  return {};
}

std::string take(const Json& object, std::string_view parameters, const JsonService& service,
                 ValueMap& members, Arguments& arguments, bool& hasParameters) {
  const auto array = object.find(std::string(parameters));
  hasParameters = array != object.end();
  if (hasParameters && !array->is_array()) return "\"" + std::string(parameters) + "\" must be an array";
  for (const auto& [key, member] : object.items()) {
    if (key == parameters) continue;
    std::string problem;
    std::optional<Value> value = valueOf(member, service, problem);
    if (!value) return Value(key).text() + ": " + problem;
    members.set(key, std::move(*value));
  }
  return hasParameters ? takeArguments(*array, service, arguments) : std::string();
}

}  // namespace

std::string parseJsonCall(std::string_view line, std::string_view parameters, const JsonService& json,
                          ValueMap& members, Arguments& arguments, bool& hasParameters) {
  try {
    bool isTooDeep = false;
    const Json object = Json::parse(line, [&](int depth, Json::parse_event_t /*event*/, Json& /*value*/) {
      isTooDeep = isTooDeep || depth > kMaxDepth;
      return !isTooDeep;
    });
    if (isTooDeep) return "values are nested deeper than " + std::to_string(kMaxDepth);
    if (!object.is_object()) return "not a JSON object";
    return take(object, parameters, json, members, arguments, hasParameters);
  } catch (const Json::exception& exception) {
    return exception.what();
  }
}

}  // namespace tonewerk
