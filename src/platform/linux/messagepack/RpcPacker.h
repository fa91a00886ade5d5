// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <msgpack.hpp>
#include <string>
#include <string_view>

#include "platform/linux/messagepack/RpcTimestamp.h"

namespace tonewerk {

// Output that grows a string.
struct StringOutput {
  std::string& text;
  void write(const char* data, std::size_t size) { text.append(data, size); }
};

// MessagePack as this protocol has it. `Output` has write(const char* data, std::size_t size). Allocates
// nothing itself.
template <class Output>
class RpcPacker : public msgpack::packer<Output> {
 public:
  // `output` outlives the packer.
  explicit RpcPacker(Output& output) : msgpack::packer<Output>(output), output_(output) {}

  void text(std::string_view text) {
    const auto size = static_cast<std::uint32_t>(text.size());
    this->pack_str(size);
    this->pack_str_body(text.data(), size);
  }

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

  // MessagePack that is already there.
  void raw(const char* data, std::size_t size) { output_.write(data, size); }

  void date(Date date) {
    const std::string body = timestampOf(date);  // of 12 bytes at most, for which no string allocates
    this->pack_ext(body.size(), static_cast<std::int8_t>(kTimestampExtension));
    this->pack_ext_body(body.data(), static_cast<std::uint32_t>(body.size()));
  }

 private:
  Output& output_;
};

}  // namespace tonewerk
