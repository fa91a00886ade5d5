// SPDX-License-Identifier: Apache-2.0
#include "values/SharedString.h"

#include <cassert>
#include <cstring>
#include <limits>
#include <new>

#include "values/Mix.h"

namespace tonewerk {
namespace {

std::uint64_t wordAt(const char* at) {
  std::uint64_t word = 0;
  std::memcpy(&word, at, sizeof(word));
  return word;
}

// Returns the text's last `count` bytes, 0 to 8, as one number. Constant sizes make each copy one
// instruction.
std::uint64_t lastWord(std::string_view text, std::size_t count) {
  const char* end = text.data() + text.size();
  if (text.size() >= sizeof(std::uint64_t))
    return wordAt(end - sizeof(std::uint64_t));  // reads some bytes twice
  if (count >= sizeof(std::uint32_t)) {
    std::uint32_t first = 0;
    std::uint32_t last = 0;
    std::memcpy(&first, end - count, sizeof(first));
    std::memcpy(&last, end - sizeof(last), sizeof(last));
    return (std::uint64_t{first} << 32) | last;
  }
  std::uint64_t word = 0;
  for (; count > 0; --count) word = (word << 8) | static_cast<unsigned char>(*(end - count));
  return word;
}

}  // namespace

std::size_t SharedString::hashOf(std::string_view text) {
  static const std::uint64_t seed = randomKey();
  constexpr std::uint64_t kOdd = 0x9E3779B97F4A7C15U;
  std::uint64_t hash = mix(seed ^ text.size(), kOdd);
  const char* at = text.data();
  std::size_t left = text.size();
  for (; left > sizeof(std::uint64_t); at += sizeof(std::uint64_t), left -= sizeof(std::uint64_t)) {
    hash = mix(hash ^ wordAt(at), seed | kOdd);
  }
  return static_cast<std::size_t>(mix(hash ^ lastWord(text, left), seed | kOdd));
}

SharedString::SharedString(std::string_view text) {
  if (text.empty()) return;
  assert(text.size() <= std::numeric_limits<std::uint32_t>::max());
  void* memory = ::operator new(sizeof(Rep) + text.size());
  rep_ = new (memory) Rep{1, static_cast<std::uint32_t>(text.size()), hashOf(text)};
  std::memcpy(rep_->text(), text.data(), text.size());
}

void SharedString::release() {
  if (rep_ == nullptr) return;
  if (rep_->references.fetch_sub(1, std::memory_order_acq_rel) == 1) {
    rep_->~Rep();
    ::operator delete(rep_);
  }
}

}  // namespace tonewerk
