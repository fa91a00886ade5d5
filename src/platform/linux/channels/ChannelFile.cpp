// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/ChannelFile.h"

#include <algorithm>
#include <cmath>
#include <concepts>
#include <memory>
#include <utility>

#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/json/JsonTree.h"

namespace tonewerk {
namespace {

using Node = JsonTree::Node;
using Kind = JsonTree::Kind;

// The position of a value in the file. It lives on the stack, and is converted into a text only for an error.
struct Place {
  const Place* parent = nullptr;
  const char* key = nullptr;  // null for an element of an array
  std::size_t index = 0;

  // For example "/channels/3/value"; empty for the whole file.
  std::string text() const {
    if (parent == nullptr) return {};
    return parent->text() + "/" + (key != nullptr ? key : std::to_string(index));
  }
};

// Reads the fields of one JSON object. Each function returns false, and sets the problem, if its field does
// not have the right form.
class ObjectReader {
 public:
  ObjectReader(const JsonTree& json, const Node& node, const Place& place, ChannelFileProblem& problem)
      : json_(json), node_(node), place_(place), problem_(problem) {}

  bool isObject() { return node_.kind == Kind::kObject || fail(kChannelsWrongType, place_, "is no object"); }

  // The second overload is for fields that may be missing.
  template <typename T>
  bool read(const char* key, T& value) {
    const Node* field = json_.field(node_, key);
    if (field == nullptr) return fail(kChannelsFieldMissing, {&place_, key}, "is missing");
    return convert(*field, {&place_, key}, value);
  }
  template <typename T>
  bool read(const char* key, std::optional<T>& value) {
    const Node* field = json_.field(node_, key);
    return field == nullptr || convert(*field, {&place_, key}, value.emplace());
  }

  // Calls `readElement(reader, element)` for each object of an array.
  template <typename T, typename ReadElement>
  bool readList(const char* key, std::vector<T>& list, ReadElement readElement) {
    const Node* field = json_.field(node_, key);
    const Place place{&place_, key};
    if (field == nullptr) return fail(kChannelsFieldMissing, place, "is missing");
    if (field->kind != Kind::kArray) return fail(kChannelsWrongType, place, "is no array");
    list.clear();
    list.reserve(field->count);
    for (const Node* one = JsonTree::first(*field); one != JsonTree::end(*field);
         one = JsonTree::next(*one)) {
      const Place elementPlace{&place, nullptr, list.size()};
      ObjectReader reader(json_, *one, elementPlace, problem_);
      if (!reader.isObject() || !readElement(reader, list.emplace_back())) return false;
    }
    return true;
  }

 private:
  bool convert(const Node& field, const Place& place, std::string& text) {
    if (field.kind != Kind::kText) return fail(kChannelsWrongType, place, "is no text");
    text = json_.textOf(field);
    return true;
  }

  bool convert(const Node& field, const Place& place, double& number) {
    switch (field.kind) {
      case Kind::kInteger:
        number = static_cast<double>(field.integer);
        return true;
      case Kind::kUnsigned:
        number = static_cast<double>(field.unsignedInteger);
        return true;
      case Kind::kDouble:
        number = field.number;
        return true;
      default:
        return fail(kChannelsWrongType, place, "is no number");
    }
  }

  template <std::integral T>
  bool convert(const Node& field, const Place& place, T& number) {
    switch (field.kind) {
      case Kind::kInteger:
        return take(field.integer, place, number);
      case Kind::kUnsigned:
        return take(field.unsignedInteger, place, number);
      case Kind::kDouble: {
        // The JSON reader turns an integer beyond 64 bits into a double.
        constexpr double kBeyond64Bits = 9223372036854775808.0;
        if (std::abs(field.number) >= kBeyond64Bits)
          return fail(kChannelsOutOfRange, place, "is out of range");
        return fail(kChannelsWrongType, place, "is no integer");
      }
      default:
        return fail(kChannelsWrongType, place, "is no integer");
    }
  }

  template <std::integral T>
  bool take(std::integral auto value, const Place& place, T& number) {
    if (!std::in_range<T>(value)) return fail(kChannelsOutOfRange, place, "is out of range");
    number = static_cast<T>(value);
    return true;
  }

  bool fail(ChannelFailure code, const Place& place, const char* what) {
    problem_.code = code;
    const std::string where = place.text();
    problem_.text = (where.empty() ? "the file" : where) + " " + what;
    return false;
  }

  const JsonTree& json_;
  const Node& node_;
  const Place& place_;
  ChannelFileProblem& problem_;
};

ChanmeterFormat formatOf(std::string_view text) {
  if (text == "invalid") return kChanmeterFormatInvalid;
  if (text == "simple") return kChanmeterFormatSimple;
  if (text == "state") return kChanmeterFormatState;
  if (text == "histogram") return kChanmeterFormatHistogram;
  if (text == "simple_array") return kChanmeterFormatSimpleArray;
  return ChannelFile::kUnsupportedFormat;
}

bool readState(ObjectReader& reader, ChanmeterState& state) {
  return reader.read("name", state.name) && reader.read("transitions", state.transitions) &&
         reader.read("residency", state.residency) && reader.read("duty_cycle", state.dutyCycle);
}

// A bound may be missing. The record's user then gets an error when it asks for it.
bool readBucket(ObjectReader& reader, ChanmeterBucket& bucket) {
  return reader.read("lower", bucket.lower) && reader.read("upper", bucket.upper) &&
         reader.read("hits", bucket.hits);
}

bool readValue(ObjectReader& reader, ChanmeterRecord& record) {
  switch (record.format) {
    case kChanmeterFormatSimple:
      return reader.read("value", record.value);
    case kChanmeterFormatState:
      return reader.readList("states", record.states, readState);
    case kChanmeterFormatHistogram:
      return reader.read("min", record.minimum) && reader.read("max", record.maximum) &&
             reader.readList("buckets", record.buckets, readBucket);
    default:
      return true;
  }
}

bool readChannel(ObjectReader& reader, ChanmeterRecord& record) {
  std::string format;
  if (!reader.read("group", record.key.group.emplace()) || !reader.read("subgroup", record.key.subGroup) ||
      !reader.read("name", record.key.name.emplace()) || !reader.read("unit", record.unit) ||
      !reader.read("format", format)) {
    return false;
  }
  record.format = formatOf(format);
  return readValue(reader, record);
}

// The parser's message from "line 3, column 7" on, without the text that was read last, which may be long.
std::string positionOf(const std::string& text) {
  const std::size_t begin = std::min(text.find("line "), text.size());
  return text.substr(begin, text.find(';', begin) - begin);
}

bool parseJson(std::string_view text, JsonTree& json, ChannelFileProblem& problem) {
  std::string message;
  switch (json.parse(text, message)) {
    case JsonTree::Failure::kNone:
      return true;
    case JsonTree::Failure::kNotJson:
      problem = {kChannelsNotJson, positionOf(message)};
      return false;
    case JsonTree::Failure::kNumberOutOfRange:
      problem = {kChannelsOutOfRange, "a number is beyond what a double can hold"};
      return false;
  }
  return false;
}

}  // namespace

std::optional<ChannelFile> ChannelFile::parse(std::string_view text, ChannelFileProblem& problem) {
  JsonTree json;
  if (!parseJson(text, json, problem)) return std::nullopt;
  ChannelFile file;
  const Place root;
  ObjectReader reader(json, json.root(), root, problem);
  const auto readOne = [&](ObjectReader& channel, std::shared_ptr<const ChanmeterRecord>& kept) {
    auto record = std::make_shared<ChanmeterRecord>();
    record->key.driver = file.driver;
    if (!readChannel(channel, *record)) return false;
    kept = std::move(record);
    return true;
  };
  if (!reader.isObject() || !reader.read("driver", file.driver) ||
      !reader.readList("channels", file.records, readOne)) {
    return std::nullopt;
  }
  return file;
}

}  // namespace tonewerk
