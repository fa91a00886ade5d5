// SPDX-License-Identifier: Apache-2.0
#include "client/RequestBody.h"

#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcPacker.h"
#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

std::string_view entriesOf(const twr_payload& payload) {
  return {reinterpret_cast<const char*>(payload.bytes), payload.size};
}

}  // namespace

void appendFrameHead(std::string& out, std::optional<std::uint32_t> requestIdentifier) {
  StringOutput output{out};
  RpcPacker packer(output);
  packer.pack_array(requestIdentifier ? 4 : 3);
  packer.pack_uint8(requestIdentifier ? 0 : 2);
  if (requestIdentifier) packer.pack_uint32(*requestIdentifier);
}

void appendRequestBody(std::string& out, std::string_view method, const Arguments& arguments) {
  std::string frame;
  RpcWriter(frame).notification(method, arguments);
  out.append(frame, kNotificationHeadBytes);
}

void appendRequestBody(std::string& out, std::string_view method, const twr_payload* parameters) {
  StringOutput output{out};
  RpcPacker packer(output);
  packer.text(method);
  packer.pack_array(parameters == nullptr ? 0 : parameters->entries);
  if (parameters != nullptr) out.append(entriesOf(*parameters));
}

std::optional<ValueMap> mapOf(const twr_payload& payload) {
  std::string frame;
  StringOutput output{frame};
  RpcPacker packer(output);
  packer.pack_array(3);
  packer.pack_uint8(2);
  packer.text("m");
  packer.pack_array(1);
  packer.pack_map(payload.entries);
  frame.append(entriesOf(payload));

  RpcStrings texts{StringInterner(1, 0), StringInterner(1, 0)};
  RpcFrameReader reader(texts);
  std::string_view left = frame;
  const bool isFrame = reader.next(left) == RpcFrameReader::Result::kFrame;
  if (!isFrame || reader.frame().refused || reader.frame().arguments.size() != 1) return std::nullopt;
  const Argument& map = reader.frame().arguments.front();
  if (!map || map->asMap() == nullptr) return std::nullopt;
  return *map->asMap();
}

}  // namespace tonewerk
