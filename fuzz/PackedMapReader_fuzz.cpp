// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a client's map, twice: as the argument of a request, and into a packed map. Both must
// accept or refuse it in the same words, and must be the same map.
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/messagepack/PackedMapReader.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "values/EncodedValue.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

void expect(bool condition) {
  if (!condition) std::abort();
}

constexpr std::size_t kFrameAndArguments = 2;
constexpr std::size_t kMaxLevels = kMaxFrameDepth - kFrameAndArguments;

// Returns where the value at the start of the bytes ends, whatever it may mean. None when it has no end, a
// byte that begins no value, or more levels than a frame has.
std::optional<std::size_t> lengthOfValue(std::string_view bytes) {
  std::array<std::size_t, kMaxLevels> missing{};  // values of each array and map
  std::size_t depth = 0;
  std::size_t at = 0;
  do {
    if (at == bytes.size()) return std::nullopt;
    const std::uint8_t first = encoding::byteAt(bytes.data() + at);
    if (first == encoding::kReserved) return std::nullopt;
    std::size_t length = encoding::kFixedLengths[first];
    std::size_t values = 0;
    if (length == 0) {
      if (encoding::headerLength(first) > bytes.size() - at) return std::nullopt;
      const encoding::Extent extent = encoding::extentAt(bytes.data() + at);
      const bool isMap = encoding::isMap(first);
      const bool isContainer = isMap || encoding::isArray(first);
      if (isContainer && depth == kMaxLevels) return std::nullopt;
      if (isContainer) values = isMap ? 2 * extent.count : extent.count;
      length = isContainer ? extent.header : extent.header + extent.count;
    }
    if (length > bytes.size() - at) return std::nullopt;
    at += length;
    if (values > 0) {
      missing[depth++] = values;
      continue;
    }
    while (depth > 0 && --missing[depth - 1] == 0) --depth;
  } while (depth > 0);
  return at;
}

void expectSame(const ValueMap& packed, const ValueMap& plain) {
  expect(packed == plain);
  expect(plain == packed);
  expect(packed.text() == plain.text());
  const ValueMapEntry* next = plain.begin();
  packed.forEach([&](const SharedString& key, ValueView value) {
    expect(key == next->key);
    expect(value.kind() == next->value.kind());
    expect(value == ValueView(next->value));
    expect(value.text() == next->value.text());
    ++next;
  });
  ValueMap changed = packed;
  changed.set("key", 1);
  ValueMap changedPlain = plain;
  changedPlain.set("key", 1);
  expect(changed.text() == changedPlain.text());
}

void read(std::string_view bytes) {
  const std::optional<std::size_t> length = lengthOfValue(bytes);
  ShapeTable shapes;
  PackedMapReader packedReader;
  const PackedMapReader::Read read = packedReader.read(bytes, shapes);
  // From the third time on, the map is compared with a recent one.
  for (int again = 0; again < 2; ++again) {
    const PackedMapReader::Read same = packedReader.read(bytes, shapes);
    expect(same.result == read.result && std::string_view(same.refused) == read.refused);
    expect(same.map == read.map);
  }
  constexpr std::size_t kMaxDamaged = 128;  // as each byte costs two more readings
  std::string damaged(bytes.substr(0, bytes.size() <= kMaxDamaged ? bytes.size() : 0));
  for (char& byte : damaged) {
    byte ^= '\x01';
    const PackedMapReader::Read likely = packedReader.read(damaged, shapes);
    const PackedMapReader::Read sure = PackedMapReader().read(damaged, shapes);
    expect(likely.result == sure.result && std::string_view(likely.refused) == sure.refused);
    expect(likely.map == sure.map);
    byte ^= '\x01';
  }

  const std::string frame = std::string("\x94\x00\x01\xA1m\x91", 6).append(bytes);
  RpcStrings texts;
  RpcFrameReader reader(texts);
  std::string_view rest = frame;
  const RpcFrameReader::Result result = reader.next(rest);
  if (length && frame.size() <= kMaxFrameBytes) expect(result == RpcFrameReader::Result::kFrame);
  if (!length) expect(result != RpcFrameReader::Result::kFrame);
  if (length != bytes.size()) {
    expect(read.result != PackedMapReader::Result::kPacked);
    return;
  }
  if (read.result == PackedMapReader::Result::kTree || result != RpcFrameReader::Result::kFrame) return;
  const RpcFrame& plain = reader.frame();
  expect(plain.refused.has_value() == (read.result == PackedMapReader::Result::kRefused));
  if (plain.refused) return expect(std::string_view(plain.refused->what) == read.refused);
  expectSame(read.map, *plain.arguments.front()->asMap());
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}
