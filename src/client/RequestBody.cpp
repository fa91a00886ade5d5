// SPDX-License-Identifier: Apache-2.0
#include "client/RequestBody.h"

#include "platform/linux/messagepack/RpcPacker.h"
#include "platform/linux/messagepack/RpcValueReader.h"

namespace tonewerk {
namespace {

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
