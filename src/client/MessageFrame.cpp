// SPDX-License-Identifier: Apache-2.0
#include "client/MessageFrame.h"

#include <string_view>

#include "platform/linux/messagepack/RpcPacker.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"

namespace tonewerk {
namespace {

constexpr std::string_view kTimestamp = "twreporting_timestamp";
constexpr std::string_view kDropped = "twreporting_dropped";

// Reads one object and notes whether it is the name of the time stamp.
class NameVisitor : public msgpack::null_visitor {
 public:
  bool isTimestamp() const { return isTimestamp_; }

  // The library calls these, so it has chosen their names.
  bool visit_str(const char* text, std::uint32_t size) {
    isTimestamp_ = depth_ == 0 && std::string_view(text, size) == kTimestamp;
    return true;
  }
  bool start_array(std::uint32_t) { return enter(); }
  bool end_array() { return leave(); }
  bool start_map(std::uint32_t) { return enter(); }
  bool end_map() { return leave(); }

 private:
  bool enter() {
    ++depth_;
    return true;
  }
  bool leave() {
    --depth_;
    return true;
  }

  bool isTimestamp_ = false;
  int depth_ = 0;
};

// A program may have overwritten its payload. Bytes that are not MessagePack are sent, and the daemon refuses
// them.
bool hasTimestampEntry(std::string_view bytes) {
  try {
    bool isName = true;
    for (std::size_t at = 0; at < bytes.size(); isName = !isName) {
      NameVisitor visitor;
      if (!msgpack::parse(bytes.data(), bytes.size(), at, visitor)) return false;
      if (isName && visitor.isTimestamp()) return true;
    }
  } catch (const msgpack::unpack_error&) {
    return false;
  }
  return false;
}

bool isStamped(std::string_view bytes) {
  // Few payloads contain the text at all, and the search is cheap.
  return bytes.find(kTimestamp) != std::string_view::npos && hasTimestampEntry(bytes);
}

}  // namespace

std::size_t appendMessageFrame(std::string& out, std::optional<std::uint32_t> requestIdentifier,
                               const RingMessage& message, std::uint64_t dropped,
                               std::span<const std::int64_t> reporterIDs) {
  const std::string_view bytes(reinterpret_cast<const char*>(message.bytes.data()), message.bytes.size());
  const bool stamps = !isStamped(bytes);
  const bool reportsLoss = dropped > 0;

  RpcWriter(out).head(requestIdentifier);
  StringOutput output{out};
  RpcPacker packer(output);
  packer.text(requests::kSendMessage.name);
  packer.pack_array(4);
  packer.pack_map(message.entries + (stamps ? 1U : 0U) + (reportsLoss ? 1U : 0U));
  const std::size_t payloadAt = out.size();
  out.append(bytes);
  if (stamps) {
    packer.text(kTimestamp);
    packer.number(message.time);
  }
  if (reportsLoss) {
    packer.text(kDropped);
    packer.pack_uint64(dropped);
  }
  packer.pack_uint32(message.category);
  packer.pack_uint16(message.type);
  if (reporterIDs.empty()) {
    packer.pack_nil();
    return payloadAt;
  }
  packer.pack_array(static_cast<std::uint32_t>(reporterIDs.size()));
  for (const std::int64_t identifier : reporterIDs) packer.pack_int64(identifier);
  return payloadAt;
}

}  // namespace tonewerk
