// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/RpcWriter.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <msgpack.hpp>

#include "platform/linux/RpcLimits.h"
#include "platform/linux/RpcTimestamp.h"

namespace tonewerk {
namespace {

// What the library writes to.
struct Output {
  std::string& text;
  void write(const char* data, std::size_t size) { text.append(data, size); }
};

class ValuePacker : public msgpack::packer<Output> {
 public:
  explicit ValuePacker(Output& output) : packer(output), output_(output) {}

  void text(std::string_view text) {
    const auto size = static_cast<std::uint32_t>(text.size());
    pack_str(size);
    pack_str_body(text.data(), size);
  }

  void value(const Value& value) {
    switch (value.kind()) {
      case Value::Kind::kBoolean:
        pack(*value.asBoolean());
        return;
      case Value::Kind::kInteger:
        pack_int64(*value.asInteger());
        return;
      case Value::Kind::kUnsigned:
        pack_uint64(*value.asUnsigned());
        return;
      case Value::Kind::kDouble:
        number(*value.asDouble());
        return;
      case Value::Kind::kString:
        text(*value.asString());
        return;
      case Value::Kind::kDate:
        date(*value.asDate());
        return;
      case Value::Kind::kArray:
        array(*value.asArray());
        return;
      case Value::Kind::kMap:
        map(*value.asMap());
        return;
    }
  }

  void valueOrNil(const std::optional<Value>& held) {
    if (held) {
      value(*held);
    } else {
      pack_nil();
    }
  }

  void arguments(const Arguments& arguments) {
    pack_array(static_cast<std::uint32_t>(arguments.size()));
    for (const Argument& argument : arguments) valueOrNil(argument);
  }

  void error(const ReplyError& error) {
    pack_map(error.message.empty() ? 2 : 3);
    text("domain");
    text(error.domain);
    text("code");
    pack_int64(error.code);
    if (error.message.empty()) return;
    text("message");
    text(error.message);
  }

 private:
  // By hand: the library's own would make an integer of a double without a fraction, and the reader of 2.0
  // would get something else than was sent.
  void number(double number) {
    const auto bits = std::bit_cast<std::uint64_t>(number);
    std::array<char, 1 + sizeof(bits)> bytes{'\xCB'};
    for (std::size_t at = 0; at < sizeof(bits); ++at) {
      bytes[at + 1] = static_cast<char>(bits >> (8 * (sizeof(bits) - 1 - at)) & 0xFFU);
    }
    output_.write(bytes.data(), bytes.size());
  }

  void date(Date date) {
    const std::string body = timestampOf(date);
    pack_ext(body.size(), static_cast<std::int8_t>(kTimestampExtension));
    pack_ext_body(body.data(), static_cast<std::uint32_t>(body.size()));
  }

  void array(const ValueArray& array) {
    pack_array(static_cast<std::uint32_t>(array.size()));
    for (const Value& element : array) value(element);
  }

  void map(const ValueMap& map) {
    pack_map(static_cast<std::uint32_t>(map.size()));
    for (const ValueMapEntry& entry : map) {
      text(entry.key);
      value(entry.value);
    }
  }

  Output& output_;
};

bool fits(const Value& value, std::size_t depthLeft) {
  if (const ValueArray* array = value.asArray()) {
    return depthLeft > 0 && std::all_of(array->begin(), array->end(),
                                        [&](const Value& element) { return fits(element, depthLeft - 1); });
  }
  if (const ValueMap* map = value.asMap()) {
    return depthLeft > 0 && std::all_of(map->begin(), map->end(), [&](const ValueMapEntry& entry) {
             return fits(entry.value, depthLeft - 1);
           });
  }
  return true;
}

}  // namespace

void RpcWriter::request(std::uint32_t identifier, std::string_view method, const Arguments& arguments) {
  Output output{out_};
  ValuePacker packer(output);
  packer.pack_array(4);
  packer.pack_uint8(0);
  packer.pack_uint32(identifier);
  packer.text(method);
  packer.arguments(arguments);
}

void RpcWriter::notification(std::string_view method, const Arguments& arguments) {
  Output output{out_};
  ValuePacker packer(output);
  packer.pack_array(3);
  packer.pack_uint8(2);
  packer.text(method);
  packer.arguments(arguments);
}

void RpcWriter::response(std::uint32_t identifier, const std::optional<ReplyError>& error,
                         const std::optional<Value>& result) {
  Output output{out_};
  ValuePacker packer(output);
  packer.pack_array(4);
  packer.pack_uint8(1);
  packer.pack_uint32(identifier);
  if (error) {
    packer.error(*error);
    packer.pack_nil();
  } else {
    packer.pack_nil();
    packer.valueOrNil(result);
  }
}

bool fitsFrameDepth(const Arguments& arguments) {
  constexpr std::size_t kFrameAndArguments = 2;
  return std::all_of(arguments.begin(), arguments.end(), [](const Argument& argument) {
    return !argument || fits(*argument, kMostFrameDepth - kFrameAndArguments);
  });
}

}  // namespace tonewerk
