// SPDX-License-Identifier: Apache-2.0
// The payload functions of the C interface run on real-time threads: they write directly into the caller's
// memory, and an entry counts only once it is complete. The functions that read payloads do not run there,
// and allocate.
#include "client/Payload.h"

#include <cstring>
#include <limits>
#include <optional>
#include <string_view>

#include "platform/linux/messagepack/RpcPacker.h"
#include "platform/linux/messagepack/RpcValueReader.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// MessagePack's 32-bit headers: a marker and the number of entries, which is increased with each entry.
constexpr unsigned char kMap32 = 0xDF;
constexpr unsigned char kArray32 = 0xDD;
constexpr std::uint32_t kContainerHeaderBytes = 5;

// Writes into the rest of a payload's memory.
class Room {
 public:
  explicit Room(const twr_payload& payload)
      : at_(payload.bytes + payload.size), left_(payload.capacity - payload.size) {}

  void write(const char* data, std::size_t size) {
    if (size == 0) return;
    isFull_ = isFull_ || size > left_;
    if (isFull_) return;
    std::memcpy(at_, data, size);
    at_ += size;
    left_ -= size;
  }

  bool isFull() const { return isFull_; }
  std::size_t left() const { return left_; }

 private:
  unsigned char* at_;
  std::size_t left_;
  bool isFull_ = false;
};

using Packer = RpcPacker<Room>;

twr_status mark(twr_payload& payload, twr_status problem) {
  payload.problem = problem;
  return problem;
}

bool isInList(const twr_payload& payload) {
  if (payload.depth == 0) return (payload.flags & kPayloadIsList) != 0;
  return payload.bytes[payload.open[payload.depth - 1]] == kArray32;
}

void countEntry(twr_payload& payload) {
  if (payload.depth == 0) {
    ++payload.entries;
    return;
  }
  unsigned char* count = payload.bytes + payload.open[payload.depth - 1] + kContainerHeaderBytes;
  while (++*--count == 0) {  // big-endian, with the carry
  }
}

bool isEntryText(std::string_view text) {
  return text.size() <= std::numeric_limits<std::uint32_t>::max() && isText(text);
}

// Puts the value that `write` packs, in a map under `name`.
template <class Write>
twr_status put(twr_payload* payload, const char* name, Write write) {
  if (payload == nullptr) return TWR_INVALID;
  if (payload->problem != TWR_OK) return static_cast<twr_status>(payload->problem);
  if (isInList(*payload) != (name == nullptr)) return mark(*payload, TWR_INVALID);
  Room room(*payload);
  Packer packer(room);
  if (name != nullptr) {
    const std::string_view text(name);
    if (!isEntryText(text)) return mark(*payload, TWR_INVALID);
    packer.text(text);
  }
  write(packer);
  if (room.isFull()) return mark(*payload, TWR_TOO_LARGE);
  payload->size = payload->capacity - static_cast<std::uint32_t>(room.left());
  countEntry(*payload);
  return TWR_OK;
}

twr_status putText(twr_payload* payload, const char* name, std::optional<std::string_view> value) {
  if (payload == nullptr) return TWR_INVALID;
  if (payload->problem != TWR_OK) return static_cast<twr_status>(payload->problem);
  if (!value || !isEntryText(*value)) return mark(*payload, TWR_INVALID);
  return put(payload, name, [&](Packer& packer) { packer.text(*value); });
}

twr_status open(twr_payload* payload, const char* name, unsigned char marker) {
  if (payload == nullptr) return TWR_INVALID;
  if (payload->problem != TWR_OK) return static_cast<twr_status>(payload->problem);
  if (payload->depth == TWR_MOST_PAYLOAD_DEPTH) return mark(*payload, TWR_INVALID);
  // Writes the empty map or list with a 32-bit header. The packer would choose a shorter one.
  const auto header = [&](Packer& packer) {
    const char bytes[kContainerHeaderBytes] = {static_cast<char>(marker)};
    packer.raw(bytes, sizeof(bytes));
  };
  if (const twr_status status = put(payload, name, header); status != TWR_OK) return status;
  payload->open[payload->depth++] = payload->size - kContainerHeaderBytes;
  return TWR_OK;
}

void init(twr_payload* payload, void* memory, std::size_t size, std::uint32_t flags) {
  if (payload == nullptr) return;
  *payload = twr_payload{};
  payload->bytes = static_cast<unsigned char*>(memory);
  payload->flags = flags;
  constexpr std::size_t kMax = std::numeric_limits<std::uint32_t>::max();
  if (memory != nullptr) payload->capacity = static_cast<std::uint32_t>(size < kMax ? size : kMax);
}

std::string_view entriesOf(const twr_payload& payload) {
  return {reinterpret_cast<const char*>(payload.bytes), payload.size};
}

}  // namespace

void appendRequestBody(std::string& out, std::string_view method, const twr_payload* parameters) {
  StringOutput output{out};
  RpcPacker packer(output);
  packer.text(method);
  packer.pack_array(parameters == nullptr ? 0 : parameters->entries);
  if (parameters != nullptr) out.append(entriesOf(*parameters));
}

std::optional<ValueMap> mapOf(const twr_payload& payload) {
  std::string map;
  StringOutput output{map};
  RpcPacker(output).pack_map(payload.entries);
  map.append(entriesOf(payload));
  const std::optional<Value> read = readValue(map, ValuePlace::kArgument);
  if (!read || read->asMap() == nullptr) return std::nullopt;
  return *read->asMap();
}

}  // namespace tonewerk

using tonewerk::Packer;
using tonewerk::put;
using tonewerk::putText;

void twr_payload_init(twr_payload* payload, void* memory, size_t size) {
  tonewerk::init(payload, memory, size, 0);
}

void twr_payload_init_list(twr_payload* payload, void* memory, size_t size) {
  tonewerk::init(payload, memory, size, tonewerk::kPayloadIsList);
}

twr_status twr_payload_problem(const twr_payload* payload) {
  if (payload == nullptr) return TWR_INVALID;
  if (payload->problem != TWR_OK) return static_cast<twr_status>(payload->problem);
  return payload->depth == 0 ? TWR_OK : TWR_INVALID;
}

twr_status twr_put_bool(twr_payload* payload, const char* name, int value) {
  return put(payload, name, [=](Packer& packer) { packer.pack(value != 0); });
}

twr_status twr_put_int(twr_payload* payload, const char* name, int64_t value) {
  return put(payload, name, [=](Packer& packer) { packer.pack_int64(value); });
}

twr_status twr_put_uint(twr_payload* payload, const char* name, uint64_t value) {
  return put(payload, name, [=](Packer& packer) { packer.pack_uint64(value); });
}

twr_status twr_put_double(twr_payload* payload, const char* name, double value) {
  return put(payload, name, [=](Packer& packer) { packer.number(value); });
}

twr_status twr_put_text(twr_payload* payload, const char* name, const char* value) {
  return putText(payload, name, value == nullptr ? std::nullopt : std::optional<std::string_view>(value));
}

twr_status twr_put_text_n(twr_payload* payload, const char* name, const char* value, size_t size) {
  if (value == nullptr && size > 0) return putText(payload, name, std::nullopt);
  return putText(payload, name, std::string_view(value, size));
}

twr_status twr_put_date(twr_payload* payload, const char* name, double seconds) {
  constexpr double kTwoTo63 = 9223372036854775808.0;  // a date's whole seconds are less than this
  const bool isDate = seconds >= -kTwoTo63 && seconds < kTwoTo63;
  if (payload != nullptr && payload->problem == TWR_OK && !isDate) {
    return tonewerk::mark(*payload, TWR_INVALID);
  }
  return put(payload, name, [=](Packer& packer) { packer.date(tonewerk::Date{seconds}); });
}

twr_status twr_put_nil(twr_payload* payload) {
  if (payload != nullptr && payload->problem == TWR_OK &&
      (payload->depth > 0 || (payload->flags & tonewerk::kPayloadIsList) == 0)) {
    return tonewerk::mark(*payload, TWR_INVALID);
  }
  return put(payload, nullptr, [](Packer& packer) { packer.pack_nil(); });
}

twr_status twr_open_map(twr_payload* payload, const char* name) {
  return tonewerk::open(payload, name, tonewerk::kMap32);
}

twr_status twr_open_list(twr_payload* payload, const char* name) {
  return tonewerk::open(payload, name, tonewerk::kArray32);
}

twr_status twr_close(twr_payload* payload) {
  if (payload == nullptr) return TWR_INVALID;
  if (payload->problem != TWR_OK) return static_cast<twr_status>(payload->problem);
  if (payload->depth == 0) return tonewerk::mark(*payload, TWR_INVALID);
  --payload->depth;
  return TWR_OK;
}
