// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcWriter.h"

#include <algorithm>
#include <array>
#include <limits>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcPacker.h"
#include "values/ForEach.h"
#include "values/Nesting.h"

namespace tonewerk {
namespace {

// Longer identifiers take five bytes.
constexpr std::uint32_t kMaxShortIdentifier = std::numeric_limits<std::uint16_t>::max();

class ValuePacker : public RpcPacker<StringOutput> {
 public:
  using RpcPacker::RpcPacker;

  // Writes encoded values in this protocol's form, too: clients may have used longer ones.
  void value(ValueView value) {
    switch (value.kind()) {
      case Value::Kind::kString:
        text(*value.asText());
        return;
      case Value::Kind::kArray:
        array(value);
        return;
      case Value::Kind::kMap:
        map(value);
        return;
      default:
        scalar(value.value());
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
  void scalar(const Value& value) {
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
      case Value::Kind::kDate:
        date(*value.asDate());
        return;
      case Value::Kind::kString:
      case Value::Kind::kArray:
      case Value::Kind::kMap:
        return;  // no scalar
    }
  }

  void array(ValueView array) {
    pack_array(static_cast<std::uint32_t>(sizeOf(array)));
    forEachElement(array, [this](ValueView element) { value(element); });
  }

  void map(ValueView map) {
    pack_map(static_cast<std::uint32_t>(sizeOf(map)));
    forEachEntry(map, [this](std::string_view key, ValueView held) {
      text(key);
      value(held);
    });
  }
};

}  // namespace

void RpcWriter::head(std::optional<std::uint32_t> identifier) {
  StringOutput output{out_};
  RpcPacker packer(output);
  packer.pack_array(identifier ? 4 : 3);
  packer.pack_uint8(identifier ? 0 : 2);
  if (identifier) packer.pack_uint32(*identifier);
}

void RpcWriter::body(std::string_view method, const Arguments& arguments) {
  StringOutput output{out_};
  ValuePacker packer(output);
  packer.text(method);
  packer.arguments(arguments);
}

void RpcWriter::request(std::uint32_t identifier, std::string_view method, const Arguments& arguments) {
  head(identifier);
  body(method, arguments);
}

void RpcWriter::notification(std::string_view method, const Arguments& arguments) {
  head(std::nullopt);
  body(method, arguments);
}

void RpcWriter::value(const Value& value) {
  StringOutput output{out_};
  ValuePacker(output).value(value);
}

void RpcWriter::response(std::uint32_t identifier, const std::optional<ReplyError>& error,
                         const std::optional<Value>& result) {
  if (!error && !result && identifier > kMaxShortIdentifier) return success(identifier);
  StringOutput output{out_};
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

// The answer to nearly all requests. The packer would append it piece by piece.
void RpcWriter::success(std::uint32_t identifier) {
  const auto byte = [identifier](unsigned shift) { return static_cast<char>(identifier >> shift & 0xFFU); };
  const std::array<char, 9> bytes{'\x94',  '\x01',  '\xCE', byte(24), byte(16),
                                  byte(8), byte(0), '\xC0', '\xC0'};
  out_.append(bytes.data(), bytes.size());
}

bool fitsFrameDepth(const Arguments& arguments) {
  constexpr std::size_t kFrameAndArguments = 2;
  return std::all_of(arguments.begin(), arguments.end(), [](const Argument& argument) {
    return !argument || nestsWithin(*argument, kMaxFrameDepth - kFrameAndArguments);
  });
}

}  // namespace tonewerk
