// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "values/Bytes.h"
#include "values/Decimal.h"
#include "values/Value.h"

namespace tonewerk {

namespace json {

inline bool isPlain(char c) { return static_cast<unsigned char>(c) >= 0x20 && c != '"' && c != '\\'; }

// Checks eight characters at once. Also false when one of them is not ASCII.
inline bool arePlain(std::uint64_t eight) {
  constexpr std::uint64_t kOnes = 0x0101010101010101U;
  constexpr std::uint64_t kHighs = kOnes * 0x80;
  // Sets the high bit of each byte that is zero; it may also set it in bytes above such a byte.
  const auto zeroes = [](std::uint64_t bytes) { return (bytes - kOnes) & ~bytes; };
  const std::uint64_t controls = eight - kOnes * 0x20;
  return ((eight | controls | zeroes(eight ^ kOnes * '"') | zeroes(eight ^ kOnes * '\\')) & kHighs) == 0;
}

// Returns whether nothing in `text` must be escaped. May be false for text that is not ASCII.
inline bool isPlain(std::string_view text) {
  const char* at = text.data();
  if (text.size() >= sizeof(std::uint64_t)) {
    const char* const last = at + text.size() - sizeof(std::uint64_t);
    for (; at < last; at += sizeof(std::uint64_t)) {
      if (!arePlain(loadAt<std::uint64_t>(at))) return false;
    }
    return arePlain(loadAt<std::uint64_t>(last));
  }
  if (text.size() >= sizeof(std::uint32_t)) {
    const std::uint64_t first = loadAt<std::uint32_t>(at);
    return arePlain(first << 32U | loadAt<std::uint32_t>(at + text.size() - sizeof(std::uint32_t)));
  }
  return std::all_of(text.begin(), text.end(), [](char c) { return isPlain(c); });
}

}  // namespace json

// Collects JSON in small pieces, which a string would take more slowly, and appends it to a string. The text
// is complete when the object ends.
class JsonPieces {
 public:
  explicit JsonPieces(std::string& out) : out_(out) {}
  JsonPieces(const JsonPieces&) = delete;
  JsonPieces& operator=(const JsonPieces&) = delete;
  ~JsonPieces() { flush(); }

  void add(char c) {
    *room() = c;
    ++end_;
  }
  void add(std::string_view text) {
    if (text.size() <= kMostAtOnce) {
      end_ = copyBytes(room(), text.data(), text.size());
    } else {
      flush();
      out_ += text;
    }
  }

  // Adds all of them as add() does, in one step when they are short together.
  void add(std::string_view first, std::string_view second, char last) {
    if (first.size() + second.size() >= kMostAtOnce) {
      add(first);
      add(second);
      return add(last);
    }
    char* const at = copyBytes(copyBytes(room(), first.data(), first.size()), second.data(), second.size());
    *at = last;
    end_ = at + 1;
  }

  // A text in quotes, escaped.
  void text(std::string_view text) {
    if (json::isPlain(text)) {
      quoted(text);
    } else {
      escaped(text);
    }
  }

  void number(bool value) { add(value ? "true" : "false"); }
  template <std::integral Integer>
  void number(Integer number) {
    char* const at = room();
    advance(std::to_chars(at, at + kMostAtOnce, number).ptr);
  }
  // NaN and the infinities become null.
  void number(double number) {
    if (!std::isfinite(number)) return add("null");
    char* const at = room();
    char* end = digitsOf(number, at);
    const bool hasPointOrExponent = std::trunc(number) != number || std::fabs(number) >= 1e16;
    if (!hasPointOrExponent) end = copyBytes(end, ".0", 2);
    advance(end);
  }

  // A value that is neither a text nor an array nor a map.
  void scalar(const Value& value);

 private:
  // Returns a place for at most kMostAtOnce characters; advance() tells how many have been written there.
  static constexpr std::size_t kMostAtOnce = 64;
  char* room() {
    if (kMostAtOnce > static_cast<std::size_t>(buffer_.data() + buffer_.size() - end_)) flush();
    return end_;
  }
  void advance(const char* end) { end_ = buffer_.data() + (end - buffer_.data()); }

  void quoted(std::string_view text) {
    if (text.size() > kMostAtOnce - 2) {
      add('"');
      add(text);
      return add('"');
    }
    char* const at = room();
    *at = '"';
    end_ = copyBytes(at + 1, text.data(), text.size());
    *end_++ = '"';
  }
  void escaped(std::string_view text);
  void escaped(unsigned char c);

  void flush() {
    out_.append(buffer_.data(), end_);
    end_ = buffer_.data();
  }

  std::string& out_;
  std::array<char, 1024> buffer_;  // not set to zero, which would take as long as the text
  char* end_ = buffer_.data();
};

}  // namespace tonewerk
