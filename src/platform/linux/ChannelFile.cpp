// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/ChannelFile.h"

#include <algorithm>
#include <cmath>
#include <concepts>
#include <memory>
#include <nlohmann/json.hpp>
#include <utility>

#include "platform/linux/ChannelFailures.h"

namespace tonewerk {
namespace {

using Json = nlohmann::json;

// Where in the file one stands. Lives on the stack; becomes text only when something is wrong there.
struct Place {
  const Place* parent = nullptr;
  const char* key = nullptr;  // none: an element of an array
  std::size_t index = 0;

  // As "/channels/3/value", empty for the whole file.
  std::string text() const {
    if (parent == nullptr) return {};
    return parent->text() + "/" + (key != nullptr ? key : std::to_string(index));
  }
};

// Turns the fields of one JSON object into values. Each reader is false when its field is not as it must be;
// the problem is then told.
class ObjectReader {
 public:
  ObjectReader(Json& json, const Place& place, ChannelFileProblem& problem)
      : json_(json), place_(place), problem_(problem) {}

  bool isObject() { return json_.is_object() || fail(kChannelsWrongType, place_, "is no object"); }

  // A value that may be missing is an optional one.
  template <typename T>
  bool read(const char* key, T& value) {
    Json* field = find(key);
    if (field == nullptr) return fail(kChannelsFieldMissing, {&place_, key}, "is missing");
    return convert(*field, {&place_, key}, value);
  }
  template <typename T>
  bool read(const char* key, std::optional<T>& value) {
    Json* field = find(key);
    return field == nullptr || convert(*field, {&place_, key}, value.emplace());
  }

  // Calls `readElement(reader, element)` for each object of an array.
  template <typename T, typename ReadElement>
  bool readList(const char* key, std::vector<T>& list, ReadElement readElement) {
    Json* field = find(key);
    const Place place{&place_, key};
    if (field == nullptr) return fail(kChannelsFieldMissing, place, "is missing");
    if (!field->is_array()) return fail(kChannelsWrongType, place, "is no array");
    list.reserve(field->size());
    for (Json& element : *field) {
      const Place elementPlace{&place, nullptr, list.size()};
      ObjectReader reader(element, elementPlace, problem_);
      if (!reader.isObject() || !readElement(reader, list.emplace_back())) return false;
    }
    return true;
  }

 private:
  Json* find(const char* key) {
    const auto field = json_.find(key);
    return field == json_.end() ? nullptr : &*field;
  }

  bool convert(Json& field, const Place& place, std::string& text) {
    if (!field.is_string()) return fail(kChannelsWrongType, place, "is no text");
    text = std::move(field.get_ref<std::string&>());
    return true;
  }

  bool convert(const Json& field, const Place& place, double& number) {
    if (!field.is_number()) return fail(kChannelsWrongType, place, "is no number");
    number = field.get<double>();
    return true;
  }

  // Integers beyond 64 bits are doubles to the library.
  template <std::integral T>
  bool convert(const Json& field, const Place& place, T& number) {
    constexpr double kBeyond64Bits = 9223372036854775808.0;
    const double* real = field.get_ptr<const Json::number_float_t*>();
    const bool isInteger = field.is_number_integer() || (real != nullptr && std::abs(*real) >= kBeyond64Bits);
    if (!isInteger) return fail(kChannelsWrongType, place, "is no integer");
    const bool fits =
        real == nullptr && (field.is_number_unsigned() ? std::in_range<T>(field.get<std::uint64_t>())
                                                       : std::in_range<T>(field.get<std::int64_t>()));
    if (!fits) return fail(kChannelsOutOfRange, place, "is out of range");
    number = field.get<T>();
    return true;
  }

  bool fail(ChannelFailure code, const Place& place, const char* what) {
    problem_.code = code;
    const std::string where = place.text();
    problem_.text = (where.empty() ? "the file" : where) + " " + what;
    return false;
  }

  Json& json_;
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

// A bound that is missing is the reader's matter: asking for it fails.
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

// The library's words from "line 3, column 7" on, without what was read last, which may be long.
std::string wordsOf(const Json::parse_error& error) {
  const std::string text = error.what();
  const std::size_t begin = std::min(text.find("line "), text.size());
  return text.substr(begin, text.find(';', begin) - begin);
}

std::optional<Json> parseJson(std::string_view text, ChannelFileProblem& problem) {
  try {
    return Json::parse(text);
  } catch (const Json::parse_error& error) {
    problem = {kChannelsNotJson, wordsOf(error)};
  } catch (const Json::exception&) {
    problem = {kChannelsOutOfRange, "a number is beyond what a double can hold"};
  }
  return std::nullopt;
}

}  // namespace

std::optional<ChannelFile> ChannelFile::parse(std::string_view text, ChannelFileProblem& problem) {
  std::optional<Json> json = parseJson(text, problem);
  if (!json) return std::nullopt;
  ChannelFile file;
  const Place root;
  ObjectReader reader(*json, root, problem);
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
