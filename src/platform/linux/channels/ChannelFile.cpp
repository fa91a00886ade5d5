// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/ChannelFile.h"

#include <algorithm>
#include <cmath>
#include <concepts>
#include <cstdint>
#include <memory>
#include <type_traits>
#include <utility>

#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/json/JsonTree.h"

namespace tonewerk {
namespace {

using Field = ChannelNumbers::Field;
using Node = JsonTree::Node;
using Kind = JsonTree::Kind;

// Arrays may be long and wrong, so no more is reserved for them in advance.
constexpr std::size_t kMaxReserved = 4096;

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

// What all readers of a file share.
struct Reading {
  const JsonTree& json;
  ChannelFileProblem& problem;
  std::vector<ChannelNumbers::Use> numbers = {};  // that were read into records
};

// Reads the fields of one JSON object. Each function returns false, and sets the problem, if its field does
// not have the right form.
class ObjectReader {
 public:
  // `record` and `element` say whose numbers the object has.
  ObjectReader(Reading& reading, const Node& node, const Place& place, std::size_t record = 0,
               std::size_t element = 0)
      : reading_(reading), node_(node), place_(place), record_(record), element_(element) {}

  bool isObject() { return node_.kind == Kind::kObject || fail(kChannelsWrongType, place_, "is no object"); }

  // The second overload is for fields that may be missing. `target` is the field of the record that gets a
  // number.
  template <typename T>
  bool read(const char* key, T& value, Field target = Field::kIgnored) {
    const Node* field = reading_.json.field(node_, key);
    if (field == nullptr) return fail(kChannelsFieldMissing, {&place_, key}, "is missing");
    return take(*field, {&place_, key}, value, target);
  }
  template <typename T>
  bool read(const char* key, std::optional<T>& value, Field target = Field::kIgnored) {
    const Node* field = reading_.json.field(node_, key);
    return field == nullptr || take(*field, {&place_, key}, value.emplace(), target);
  }

  // Calls `readElement(reader, element)` for each object of an array.
  template <typename T, typename ReadElement>
  bool readList(const char* key, std::vector<T>& list, ReadElement readElement) {
    const Node* field = reading_.json.field(node_, key);
    const Place place{&place_, key};
    if (field == nullptr) return fail(kChannelsFieldMissing, place, "is missing");
    if (field->kind != Kind::kArray) return fail(kChannelsWrongType, place, "is no array");
    list.clear();
    list.reserve(std::min<std::size_t>(field->count, kMaxReserved));
    for (const Node* one = JsonTree::first(*field); one != JsonTree::end(*field);
         one = JsonTree::next(*one)) {
      const Place elementPlace{&place, nullptr, list.size()};
      const bool isRecord = place_.parent == nullptr;
      ObjectReader reader(reading_, *one, elementPlace, isRecord ? list.size() : record_,
                          isRecord ? 0 : list.size());
      if (!reader.isObject() || !readElement(reader, list.emplace_back())) return false;
    }
    return true;
  }

 private:
  template <typename T>
  bool take(const Node& field, const Place& place, T& value, Field target) {
    if (!convert(field, place, value)) return false;
    if constexpr (std::is_arithmetic_v<T>) {
      reading_.numbers.push_back({&field,
                                  {.record = static_cast<std::uint32_t>(record_),
                                   .element = static_cast<std::uint32_t>(element_),
                                   .field = target}});
    }
    return true;
  }

  bool convert(const Node& field, const Place& place, std::string& text) {
    if (field.kind != Kind::kText) return fail(kChannelsWrongType, place, "is no text");
    text = reading_.json.textOf(field);
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
        return narrow(field.integer, place, number);
      case Kind::kUnsigned:
        return narrow(field.unsignedInteger, place, number);
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
  bool narrow(std::integral auto value, const Place& place, T& number) {
    if (!std::in_range<T>(value)) return fail(kChannelsOutOfRange, place, "is out of range");
    number = static_cast<T>(value);
    return true;
  }

  bool fail(ChannelFailure code, const Place& place, const char* what) {
    reading_.problem.code = code;
    const std::string where = place.text();
    reading_.problem.text = (where.empty() ? "the file" : where) + " " + what;
    return false;
  }

  Reading& reading_;
  const Node& node_;
  const Place& place_;
  const std::size_t record_;
  const std::size_t element_;
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
  return reader.read("name", state.name) &&
         reader.read("transitions", state.transitions, Field::kTransitions) &&
         reader.read("residency", state.residency, Field::kResidency) &&
         reader.read("duty_cycle", state.dutyCycle, Field::kDutyCycle);
}

// A bound may be missing. The record's user then gets an error when it asks for it.
bool readBucket(ObjectReader& reader, ChanmeterBucket& bucket) {
  return reader.read("lower", bucket.lower, Field::kLower) &&
         reader.read("upper", bucket.upper, Field::kUpper) && reader.read("hits", bucket.hits, Field::kHits);
}

bool readValue(ObjectReader& reader, ChanmeterRecord& record) {
  switch (record.format) {
    case kChanmeterFormatSimple:
      return reader.read("value", record.value, Field::kValue);
    case kChanmeterFormatState:
      return reader.readList("states", record.states, readState);
    case kChanmeterFormatHistogram:
      return reader.read("min", record.minimum, Field::kMinimum) &&
             reader.read("max", record.maximum, Field::kMaximum) &&
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

// What an allocation takes beside its bytes: the allocator's own data, and what it rounds up.
constexpr std::uint64_t kAllocationBytes = 16;

std::uint64_t heapBytesOf(const std::string& text) {
  static const std::size_t kInside = std::string().capacity();
  return text.capacity() > kInside ? text.capacity() + kAllocationBytes : 0;
}

std::uint64_t heapBytesOf(const std::optional<std::string>& text) { return text ? heapBytesOf(*text) : 0; }

template <typename T>
std::uint64_t heapBytesOf(const std::vector<T>& list) {
  return list.capacity() == 0 ? 0 : list.capacity() * sizeof(T) + kAllocationBytes;
}

std::uint64_t heapBytesOf(const ChanmeterRecord& record) {
  std::uint64_t bytes = heapBytesOf(record.key.driver) + heapBytesOf(record.key.group) +
                        heapBytesOf(record.key.subGroup) + heapBytesOf(record.key.name) +
                        heapBytesOf(record.unit) + heapBytesOf(record.states) + heapBytesOf(record.buckets);
  for (const ChanmeterState& state : record.states) bytes += heapBytesOf(state.name);
  return bytes;
}

}  // namespace

// One allocation for all records, which each of them keeps alive.
struct ChannelFile::Held {
  Charge charge;  // for the records, and so destroyed after them
  std::vector<ChanmeterRecord> records;

  static ChanmeterRecords oneByOne(const std::shared_ptr<Held>& held) {
    ChanmeterRecords records;
    records.reserve(held->records.size());
    for (const ChanmeterRecord& record : held->records) records.emplace_back(held, &record);
    return records;
  }
};

std::optional<ChannelFile> ChannelFile::parse(std::string_view text, ChannelFileProblem& problem) {
  JsonTree json;
  if (!parseJson(text, json, problem)) return std::nullopt;
  ChannelFile file;
  const auto held = std::make_shared<Held>();
  const Place root;
  Reading reading{json, problem};
  ObjectReader reader(reading, json.root(), root);
  const auto readOne = [&](ObjectReader& channel, ChanmeterRecord& record) {
    record.key.driver = file.driver;
    return readChannel(channel, record);
  };
  if (!reader.isObject() || !reader.read("driver", file.driver) ||
      !reader.readList("channels", held->records, readOne)) {
    return std::nullopt;
  }
  file.held_ = held;
  file.records = Held::oneByOne(held);
  file.numbers_ = ChannelNumbers(text, json, std::move(reading.numbers));
  return file;
}

bool ChannelFile::update(std::string_view previous, std::string_view text) {
  const auto held = std::make_shared<Held>();
  held->records = held_->records;
  if (!numbers_.read(previous, text, held->records)) return false;
  held_ = held;
  records = Held::oneByOne(held);
  return true;
}

std::uint64_t ChannelFile::recordBytes() const {
  std::uint64_t bytes = sizeof(Held) + heapBytesOf(held_->records);
  for (const ChanmeterRecord& record : held_->records) bytes += heapBytesOf(record);
  return bytes;
}

void ChannelFile::keep(Charge charge) { held_->charge = std::move(charge); }

}  // namespace tonewerk
