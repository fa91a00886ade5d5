// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/Crc32c.h"

#include <array>
#include <cstddef>
#include <cstring>

#if defined(__x86_64__)
#include <nmmintrin.h>
#elif defined(__ARM_FEATURE_CRC32)
#include <arm_acle.h>
#endif

namespace tonewerk {
namespace {

constexpr std::array<std::uint32_t, 256> makeTable() {
  constexpr std::uint32_t kPolynomial = 0x82F6'3B78;  // its bits in reverse order
  std::array<std::uint32_t, 256> table{};
  for (std::uint32_t byte = 0; byte < table.size(); ++byte) {
    std::uint32_t rest = byte;
    for (int bit = 0; bit < 8; ++bit) rest = (rest >> 1) ^ ((rest & 1U) != 0 ? kPolynomial : 0);
    table.at(byte) = rest;
  }
  return table;
}

constexpr std::array<std::uint32_t, 256> kTable = makeTable();

using Function = std::uint32_t (*)(std::string_view bytes, std::uint32_t before);

#if defined(__x86_64__)

// The compiler may use this instruction in no other function, because not every processor has it.
__attribute__((target("sse4.2"))) std::uint32_t crc32cByInstruction(std::string_view bytes,
                                                                    std::uint32_t before) {
  std::uint64_t crc = ~before;
  const char* at = bytes.data();
  std::size_t left = bytes.size();
  for (; left >= sizeof(std::uint64_t); left -= sizeof(std::uint64_t), at += sizeof(std::uint64_t)) {
    std::uint64_t word = 0;
    std::memcpy(&word, at, sizeof(word));
    crc = _mm_crc32_u64(crc, word);
  }
  auto rest = static_cast<std::uint32_t>(crc);
  for (; left > 0; --left, ++at) rest = _mm_crc32_u8(rest, static_cast<unsigned char>(*at));
  return ~rest;
}

Function fastest() {
  __builtin_cpu_init();
  return __builtin_cpu_supports("sse4.2") != 0 ? crc32cByInstruction : crc32cByTable;
}

#elif defined(__ARM_FEATURE_CRC32)

std::uint32_t crc32cByInstruction(std::string_view bytes, std::uint32_t before) {
  std::uint32_t crc = ~before;
  const char* at = bytes.data();
  std::size_t left = bytes.size();
  for (; left >= sizeof(std::uint64_t); left -= sizeof(std::uint64_t), at += sizeof(std::uint64_t)) {
    std::uint64_t word = 0;
    std::memcpy(&word, at, sizeof(word));
    crc = __crc32cd(crc, word);
  }
  for (; left > 0; --left, ++at) crc = __crc32cb(crc, static_cast<unsigned char>(*at));
  return ~crc;
}

Function fastest() { return crc32cByInstruction; }

#else

Function fastest() { return crc32cByTable; }

#endif

}  // namespace

std::uint32_t crc32cByTable(std::string_view bytes, std::uint32_t before) {
  std::uint32_t crc = ~before;
  for (const char byte : bytes) {
    crc = kTable[(crc ^ static_cast<unsigned char>(byte)) & 0xFFU] ^ (crc >> 8);
  }
  return ~crc;
}

std::uint32_t crc32c(std::string_view bytes, std::uint32_t before) {
  static const Function function = fastest();
  return function(bytes, before);
}

}  // namespace tonewerk
