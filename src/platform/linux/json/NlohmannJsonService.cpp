// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/NlohmannJsonService.h"

#include <limits>
#include <nlohmann/json.hpp>

#include "values/PrettyJson.h"

namespace tonewerk {
namespace {

using Json = nlohmann::ordered_json;

constexpr int kMaxDepth = 200;

// The path of the current value in a tree, for messages: "a.b[2]".
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
  constexpr auto kMaxSigned = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  return number > kMaxSigned ? Value(number) : Value(static_cast<std::int64_t>(number));
}

std::optional<Value> valueOf(const Json& json, Path& path, std::string& problem) {
  if (path.depth() > kMaxDepth) {
    problem = "values are nested deeper than " + std::to_string(kMaxDepth);
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

// The library's message without the exception's name in brackets.
std::string messageOf(const Json::exception& error) {
  const std::string text = error.what();
  const std::size_t bracket = text.find("] ");
  return bracket == std::string::npos ? text : text.substr(bracket + 2);
}

}  // namespace

std::string NlohmannJsonService::compact(const ValueMap& map) const { return map.text(); }

std::optional<std::string> NlohmannJsonService::pretty(const ValueMap& map, std::string& problem) const {
  std::string text;
  text.reserve(map.bytes() + map.bytes() / 4);  // mostly enough
  if (!appendPrettyJson(text, map, problem)) return std::nullopt;
  return text;
}

std::optional<Value> NlohmannJsonService::parse(std::string_view text, std::string& problem) const {
  try {
    const Json json = Json::parse(text);
    Path path;
    return valueOf(json, path, problem);
  } catch (const Json::exception& error) {
    problem = messageOf(error);
    return std::nullopt;
  }
}

}  // namespace tonewerk
