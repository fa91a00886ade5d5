// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tonewerk {

// Writes values as D-Bus messages contain them, in either byte order, because the library writes only this
// machine's order.
class DbusBytes {
 public:
  explicit DbusBytes(std::endian order = std::endian::little) : order_(order) {}

  const std::string& text() const { return text_; }
  std::size_t size() const { return text_.size(); }

  DbusBytes& align(std::size_t to) {
    while (text_.size() % to != 0) text_ += '\0';
    return *this;
  }
  DbusBytes& byte(std::uint8_t value) {
    text_ += static_cast<char>(value);
    return *this;
  }
  DbusBytes& number16(std::uint16_t value) { return number(value); }
  DbusBytes& number32(std::uint32_t value) { return number(value); }
  DbusBytes& number64(std::int64_t value) { return number(value); }
  DbusBytes& real(double value) { return number(value); }
  DbusBytes& string(std::string_view text) {
    number32(static_cast<std::uint32_t>(text.size()));
    text_ += text;
    return byte(0);
  }
  DbusBytes& signature(std::string_view text) {
    byte(static_cast<std::uint8_t>(text.size()));
    text_ += text;
    return byte(0);
  }
  // Appends an array: its length, and the elements that `fill` appends. `alignment` is that of an element.
  template <typename Fill>
  DbusBytes& array(std::size_t alignment, Fill fill) {
    const std::size_t length = align(4).size();
    const std::size_t begin = number32(0).align(alignment).size();
    fill(*this);
    const DbusBytes bytes = DbusBytes(order_).number32(static_cast<std::uint32_t>(size() - begin));
    text_.replace(length, bytes.size(), bytes.text());
    return *this;
  }
  // Appends the start of a dictionary's entry whose value is a variant.
  DbusBytes& entry(std::string_view key, std::string_view type) {
    return align(8).string(key).signature(type);
  }

 private:
  template <typename T>
  DbusBytes& number(T value) {
    std::string bytes(reinterpret_cast<const char*>(&value), sizeof(value));
    if (order_ != std::endian::native) std::reverse(bytes.begin(), bytes.end());
    align(sizeof(value)).text_ += bytes;
    return *this;
  }

  std::endian order_;
  std::string text_;
};

// The target of a call. Empty fields are left out of the message.
struct DbusCallTarget {
  std::string path;
  std::string member;
  std::string interface;
  std::string destination;
};

inline std::string dbusCallOf(const DbusCallTarget& target, std::string_view signature,
                              const std::string& body, std::endian order, std::uint32_t serial,
                              bool expectsReply) {
  DbusBytes message(order);
  message.byte(order == std::endian::little ? 'l' : 'B').byte(1).byte(expectsReply ? 0 : 1).byte(1);
  message.number32(static_cast<std::uint32_t>(body.size())).number32(serial);
  message.array(8, [&](DbusBytes& fields) {
    const auto field = [&](std::uint8_t code, std::string_view type, const std::string& text) {
      if (!text.empty()) fields.align(8).byte(code).signature(type).string(text);
    };
    field(1, "o", target.path);
    field(2, "s", target.interface);
    field(3, "s", target.member);
    field(6, "s", target.destination);
    if (!signature.empty()) fields.align(8).byte(8).signature("g").signature(signature);
  });
  return message.align(8).text() + body;
}

}  // namespace tonewerk
