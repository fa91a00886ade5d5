// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

// Writes MessagePack by hand, so that a test can send bytes that no library would write.
namespace tonewerk::packed {

// The bytes of `value`, most significant first.
template <typename Unsigned>
std::string bigEndian(Unsigned value) {
  std::string bytes(sizeof(value), '\0');
  for (std::size_t at = sizeof(value); at > 0; --at) {
    bytes[at - 1] = static_cast<char>(value & 0xFFU);
    value = static_cast<Unsigned>(value >> 8U);
  }
  return bytes;
}

inline std::string byte(unsigned value) { return std::string(1, static_cast<char>(value)); }

inline std::string nil() { return byte(0xC0); }
inline std::string boolean(bool value) { return byte(value ? 0xC3 : 0xC2); }
inline std::string real(double value) {
  return byte(0xCB) + bigEndian(__builtin_bit_cast(std::uint64_t, value));
}
inline std::string integer(std::int64_t value) {
  return byte(0xD3) + bigEndian(static_cast<std::uint64_t>(value));
}
inline std::string unsignedInteger(std::uint64_t value) { return byte(0xCF) + bigEndian(value); }

// Headers that announce `count` elements or bytes.
inline std::string arrayHeader(std::uint32_t count) { return byte(0xDD) + bigEndian(count); }
inline std::string mapHeader(std::uint32_t count) { return byte(0xDF) + bigEndian(count); }
inline std::string textHeader(std::uint32_t count) { return byte(0xDB) + bigEndian(count); }
inline std::string binaryHeader(std::uint32_t count) { return byte(0xC6) + bigEndian(count); }
inline std::string extensionHeader(std::uint32_t count, int type) {
  return byte(0xC9) + bigEndian(count) + byte(static_cast<unsigned>(type) & 0xFFU);
}

inline std::string text(std::string_view value) {
  return textHeader(static_cast<std::uint32_t>(value.size())) + std::string(value);
}
inline std::string binary(std::string_view value) {
  return binaryHeader(static_cast<std::uint32_t>(value.size())) + std::string(value);
}
inline std::string extension(int type, std::string_view value) {
  return extensionHeader(static_cast<std::uint32_t>(value.size()), type) + std::string(value);
}

inline std::string joined(const std::vector<std::string>& parts) {
  std::string all;
  for (const std::string& part : parts) all += part;
  return all;
}
inline std::string array(const std::vector<std::string>& elements) {
  return arrayHeader(static_cast<std::uint32_t>(elements.size())) + joined(elements);
}
// Keys and values alternate.
inline std::string map(const std::vector<std::string>& keysAndValues) {
  return mapHeader(static_cast<std::uint32_t>(keysAndValues.size() / 2)) + joined(keysAndValues);
}

inline std::string request(std::uint32_t identifier, std::string_view method,
                           const std::vector<std::string>& params) {
  return array({integer(0), integer(identifier), text(method), array(params)});
}
inline std::string notification(std::string_view method, const std::vector<std::string>& params) {
  return array({integer(2), text(method), array(params)});
}

}  // namespace tonewerk::packed
