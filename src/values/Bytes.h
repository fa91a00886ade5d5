// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <bit>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tonewerk {

// Short runs of bytes: most keys and values have fewer than 32, for which a call of memcmp() or memcpy()
// costs more than the work itself. A run of at least one word ends with a word that overlaps the one before
// it.

template <std::unsigned_integral T>
T loadAt(const char* at) {
  T word = 0;
  std::memcpy(&word, at, sizeof(word));
  return word;
}

// Reads a number whose most significant byte comes first.
template <std::unsigned_integral T>
T bigEndianAt(const char* at) {
  const T word = loadAt<T>(at);
  if constexpr (std::endian::native == std::endian::big || sizeof(T) == 1) {
    return word;
  } else if constexpr (sizeof(T) == 2) {
    return __builtin_bswap16(word);
  } else if constexpr (sizeof(T) == 4) {
    return __builtin_bswap32(word);
  } else {
    return __builtin_bswap64(word);
  }
}

inline bool sameBytes(const char* a, const char* b, std::size_t size) {
  using Word = std::uint64_t;
  using Half = std::uint32_t;
  if (size >= sizeof(Word)) {
    const std::size_t last = size - sizeof(Word);
    for (std::size_t at = 0; at < last; at += sizeof(Word)) {
      if (loadAt<Word>(a + at) != loadAt<Word>(b + at)) return false;
    }
    return loadAt<Word>(a + last) == loadAt<Word>(b + last);
  }
  if (size >= sizeof(Half)) {
    const std::size_t last = size - sizeof(Half);
    return loadAt<Half>(a) == loadAt<Half>(b) && loadAt<Half>(a + last) == loadAt<Half>(b + last);
  }
  for (std::size_t at = 0; at < size; ++at) {
    if (a[at] != b[at]) return false;
  }
  return true;
}

// Returns how many bytes at the start of both are the same.
inline std::size_t commonBytes(const char* a, const char* b, std::size_t size) {
  using Word = std::uint64_t;
  std::size_t at = 0;
  for (; at + sizeof(Word) <= size; at += sizeof(Word)) {
    const Word different = loadAt<Word>(a + at) ^ loadAt<Word>(b + at);
    if (different == 0) continue;
    const int bits = std::endian::native == std::endian::little ? std::countr_zero(different)
                                                                : std::countl_zero(different);
    return at + static_cast<std::size_t>(bits) / 8;
  }
  while (at < size && a[at] == b[at]) ++at;
  return at;
}

// Copies between places that do not overlap. Returns the end of the copy.
inline char* copyBytes(char* to, const char* from, std::size_t size) {
  struct Pair {
    std::uint64_t words[2];
  };
  const auto move = [&]<typename Word>(Word, std::size_t at) {
    Word word;
    std::memcpy(&word, from + at, sizeof(word));
    std::memcpy(to + at, &word, sizeof(word));
  };
  if (size > 128) {
    std::memcpy(to, from, size);
  } else if (size >= sizeof(Pair)) {
    const std::size_t last = size - sizeof(Pair);
    for (std::size_t at = 0; at < last; at += sizeof(Pair)) move(Pair{}, at);
    move(Pair{}, last);
  } else if (size >= sizeof(std::uint64_t)) {
    move(std::uint64_t{}, 0);
    move(std::uint64_t{}, size - sizeof(std::uint64_t));
  } else if (size >= sizeof(std::uint32_t)) {
    move(std::uint32_t{}, 0);
    move(std::uint32_t{}, size - sizeof(std::uint32_t));
  } else {
    for (std::size_t at = 0; at < size; ++at) to[at] = from[at];
  }
  return to + size;
}

}  // namespace tonewerk
