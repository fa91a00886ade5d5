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

// Output that appends to a string.
struct StringOutput {
  std::string& text;
  void write(const char* data, std::size_t size) { text.append(data, size); }
};

// Writes MessagePack in this protocol's form. `Output` has write(const char* data, std::size_t size).
// Allocates nothing itself.
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

  // Writes the bytes itself, because the library writes a double without a fraction as an integer, so that
  // 2.0 would arrive as 2.
  void number(double number) {
    const auto bits = std::bit_cast<std::uint64_t>(number);
    std::array<char, 1 + sizeof(bits)> bytes{'\xCB'};
    for (std::size_t at = 0; at < sizeof(bits); ++at) {
      bytes[at + 1] = static_cast<char>(bits >> (8 * (sizeof(bits) - 1 - at)) & 0xFFU);
    }
    output_.write(bytes.data(), bytes.size());
  }

  // Copies bytes that are already MessagePack.
  void raw(const char* data, std::size_t size) { output_.write(data, size); }

  void date(Date date) {
    const std::string body = timestampOf(date);  // at most 12 bytes, for which std::string does not allocate
    this->pack_ext(body.size(), static_cast<std::int8_t>(kTimestampExtension));
    this->pack_ext_body(body.data(), static_cast<std::uint32_t>(body.size()));
  }

 private:
  Output& output_;
};

}  // namespace tonewerk
