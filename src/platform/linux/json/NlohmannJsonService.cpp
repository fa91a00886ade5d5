// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/NlohmannJsonService.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <nlohmann/json.hpp>

#include "values/CompactJson.h"
#include "values/ValueView.h"

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

// Writes directly into the text, because a session's file holds all its messages: building the library's tree
// first would cost several times as much.
class PrettyWriter {
 public:
  explicit PrettyWriter(std::string& out) : out_(out) {}

  // False if JSON cannot express a value; problem() then names it.
  bool write(const ValueMap& map) {
    return writeList('{', '}', map.empty(), [&](auto&& writeElement) {
      map.forEach([&](const SharedString& key, ValueView value) {
        writeElement([&] {
          writeKey(key);
          return write(value) || isWithin(key.string());
        });
      });
    });
  }
  std::string problem() const { return place_ + " is " + inexpressible_ + ", which JSON cannot say"; }

 private:
  bool write(ValueView view) {
    const Value* value = view.held();
    if (value == nullptr) return writeEncoded(view.encoded());
    if (const ValueMap* map = value->asMap()) return write(*map);
    if (const ValueArray* array = value->asArray()) {
      return writeList('[', ']', array->empty(), [&](auto&& writeElement) {
        std::size_t index = 0;
        for (const Value& element : *array) {
          writeElement([&] { return write(element) || isWithin("[" + std::to_string(index) + "]"); });
          ++index;
        }
      });
    }
    const double* number = value->asDouble();
    if (number != nullptr && !std::isfinite(*number)) return isInexpressible(view);
    appendCompactJson(out_, *value);
    return true;
  }

  // Only arrays and maps inside a packed map get values of their own.
  bool writeEncoded(EncodedValue value) {
    const Value::Kind kind = value.kind();
    if (kind == Value::Kind::kArray || kind == Value::Kind::kMap) return write(ValueView(value.value()));
    if (kind == Value::Kind::kDouble && !std::isfinite(ValueView(value).number())) {
      return isInexpressible(ValueView(value));
    }
    appendCompactJson(out_, value);
    return true;
  }

  bool isInexpressible(ValueView value) {
    inexpressible_ = value.text();
    return false;
  }

  // Nearly all keys need no escapes, and for those no value has to be made.
  void writeKey(const SharedString& key) {
    const std::string_view text = key;
    const auto needsEscape = [](char c) {
      return static_cast<unsigned char>(c) < 0x20 || c == '"' || c == '\\';
    };
    if (std::none_of(text.begin(), text.end(), needsEscape)) {
      out_ += '"';
      out_ += text;
      out_ += '"';
    } else {
      appendCompactJson(out_, Value(key));
    }
    out_ += ": ";
  }

  // `writeElements` calls its argument with a function for each element, which writes it and returns whether
  // it could. After a failure the rest is not written.
  template <typename WriteElements>
  bool writeList(char open, char close, bool isEmpty, WriteElements writeElements) {
    out_ += open;
    indentation_ += 2;
    bool isFirst = true;
    bool isWritten = true;
    writeElements([&](auto&& writeElement) {
      if (!isWritten) return;
      if (!std::exchange(isFirst, false)) out_ += ',';
      startLine();
      isWritten = writeElement();
    });
    if (!isWritten) return false;
    indentation_ -= 2;
    if (!isEmpty) startLine();
    out_ += close;
    return true;
  }

  void startLine() {
    out_ += '\n';
    out_.append(indentation_, ' ');
  }

  // Prepends `part` to the path of the value that JSON cannot express. Always returns false.
  bool isWithin(const std::string& part) {
    const bool needsDot = !place_.empty() && place_.front() != '[';
    place_ = part + (needsDot ? "." : "") + place_;
    return false;
  }

  std::string& out_;
  std::size_t indentation_ = 0;
  std::string place_;          // path such as "a.b[2]"
  std::string inexpressible_;  // the value: "nan" or an infinity
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
  PrettyWriter writer(text);
  if (writer.write(map)) return text;
  problem = writer.problem();
  return std::nullopt;
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
