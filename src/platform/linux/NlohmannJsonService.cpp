// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/NlohmannJsonService.h"

#include <cmath>
#include <limits>
#include <nlohmann/json.hpp>

namespace tonewerk {
namespace {

using Json = nlohmann::ordered_json;

constexpr int kMostDepth = 200;

// Where in a tree of values one stands, for words about it: "a.b[2]".
class Path {
 public:
  std::string text() const { return text_.empty() ? "the value" : text_; }

  // Runs `step` one level down.
  template <typename Step>
  auto within(std::string_view key, Step step) {
    return below((text_.empty() ? "" : ".") + std::string(key), step);
  }
  template <typename Step>
  auto within(std::size_t index, Step step) {
    return below("[" + std::to_string(index) + "]", step);
  }
  int depth() const { return depth_; }

 private:
  template <typename Step>
  auto below(const std::string& part, Step step) {
    const std::size_t size = text_.size();
    text_ += part;
    ++depth_;
    auto result = step();
    --depth_;
    text_.resize(size);
    return result;
  }

  std::string text_;
  int depth_ = 0;
};

std::optional<Json> jsonOf(const Value& value, Path& path, std::string& problem);

std::optional<Json> objectOf(const ValueMap& map, Path& path, std::string& problem) {
  Json object = Json::object();
  for (const ValueMap::Entry& entry : map) {
    std::optional<Json> json =
        path.within(entry.key.view(), [&] { return jsonOf(entry.value, path, problem); });
    if (!json) return std::nullopt;
    object[entry.key.string()] = std::move(*json);
  }
  return object;
}

std::optional<Json> jsonOf(const Value& value, Path& path, std::string& problem) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return Json(*value.asBoolean());
    case Value::Kind::kInteger:
      return Json(*value.asInteger());
    case Value::Kind::kUnsigned:
      return Json(*value.asUnsigned());
    case Value::Kind::kString:
      return Json(value.asString()->string());
    case Value::Kind::kDate:
      return Json(value.text());
    case Value::Kind::kMap:
      return objectOf(*value.asMap(), path, problem);
    case Value::Kind::kDouble:
      if (std::isfinite(*value.asDouble())) return Json(*value.asDouble());
      problem = path.text() + " is " + value.text() + ", which JSON cannot say";
      return std::nullopt;
    case Value::Kind::kArray:
      break;
  }
  Json array = Json::array();
  for (const Value& element : *value.asArray()) {
    std::optional<Json> json = path.within(array.size(), [&] { return jsonOf(element, path, problem); });
    if (!json) return std::nullopt;
    array.push_back(std::move(*json));
  }
  return array;
}

std::optional<Value> valueOf(const Json& json, Path& path, std::string& problem);

std::optional<Value> arrayOf(const Json& json, Path& path, std::string& problem) {
  ValueArray array;
  for (const Json& element : json) {
    std::optional<Value> value = path.within(array.size(), [&] { return valueOf(element, path, problem); });
    if (!value) return std::nullopt;
    array.append(std::move(*value));
  }
  return Value(std::move(array));
}

std::optional<Value> mapOf(const Json& json, Path& path, std::string& problem) {
  ValueMap map;
  for (const auto& entry : json.items()) {
    std::optional<Value> value =
        path.within(entry.key(), [&] { return valueOf(entry.value(), path, problem); });
    if (!value) return std::nullopt;
    map.set(entry.key(), std::move(*value));
  }
  return Value(std::move(map));
}

Value integerOf(std::uint64_t number) {
  constexpr auto kMostSigned = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  return number > kMostSigned ? Value(number) : Value(static_cast<std::int64_t>(number));
}

std::optional<Value> valueOf(const Json& json, Path& path, std::string& problem) {
  if (path.depth() > kMostDepth) {
    problem = "values are nested deeper than " + std::to_string(kMostDepth);
    return std::nullopt;
  }
  switch (json.type()) {
    case Json::value_t::boolean:
      return Value(json.get<bool>());
    case Json::value_t::number_integer:
      return Value(json.get<std::int64_t>());
    case Json::value_t::number_unsigned:
      return integerOf(json.get<std::uint64_t>());
    case Json::value_t::number_float:
      return Value(json.get<double>());
    case Json::value_t::string:
      return Value(json.get_ref<const std::string&>());
    case Json::value_t::array:
      return arrayOf(json, path, problem);
    case Json::value_t::object:
      return mapOf(json, path, problem);
    default:
      problem = path.text() + " is null";
      return std::nullopt;
  }
}

// The library's words without the name of its exception in brackets.
std::string wordsOf(const Json::exception& error) {
  const std::string text = error.what();
  const std::size_t bracket = text.find("] ");
  return bracket == std::string::npos ? text : text.substr(bracket + 2);
}

}  // namespace

std::string NlohmannJsonService::compact(const ValueMap& map) const { return map.text(); }

std::optional<std::string> NlohmannJsonService::pretty(const ValueMap& map, std::string& problem) const {
  Path path;
  const std::optional<Json> json = objectOf(map, path, problem);
  if (!json) return std::nullopt;
  // Bytes that are no UTF-8, which no client can send, would throw.
  return json->dump(2, ' ', false, Json::error_handler_t::replace);
}

std::optional<Value> NlohmannJsonService::parse(std::string_view text, std::string& problem) const {
  try {
    const Json json = Json::parse(text);
    Path path;
    return valueOf(json, path, problem);
  } catch (const Json::exception& error) {
    problem = wordsOf(error);
    return std::nullopt;
  }
}

}  // namespace tonewerk
