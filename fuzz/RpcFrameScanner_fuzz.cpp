// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as the bytes of a client, as the socket's listener does: they are scanned for frames, which
// are decoded later. Scanning piece by piece finds the same frames as scanning all at once, and each of them
// can be decoded.
//
// The input's first byte is the length of the pieces.
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "FuzzInput.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "values/ShapeTable.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

struct Scanned {
  std::vector<std::string_view> frames;
  std::string problem;
};

void decode(RpcFrameDecoder& decoder, ShapeTable& shapes, std::string_view bytes,
            const RpcFrameScanner::Frame& found) {
  expect(found.bytes <= kMaxFrameBytes && found.bytes <= bytes.size() && isUtf8(found.method));
  const RpcFrame frame = decoder.decode(bytes.substr(0, found.bytes));
  expect(frame.method == found.method);
  // Of too many arguments the last ones are left out, because they are refused.
  expect(frame.arguments.size() == found.argumentCount ||
         (frame.refused && frame.arguments.size() < found.argumentCount));
  expect(found.isNotification || frame.identifier == found.identifier);
  expect((frame.kind == RpcFrame::Kind::kNotification) == found.isNotification);
  const RpcFrameDecoder::Frame known{bytes.substr(0, found.bytes), found.argumentCount, found.arguments};
  const auto session = RpcFrameDecoder::sessionOf(known);
  if (const IncomingMessage* message = decoder.decodeMessage(known, shapes)) {
    expect(!frame.refused && message->payload == *frame.arguments.front()->asMap());
    if (session) expect(message->reporterIDs == std::vector<ReporterID>{*session});
    decoder.releaseMessage();
  }
}

// `grow` is how many more bytes each scan sees.
Scanned scan(std::string_view bytes, std::size_t grow, bool mustDecode) {
  Scanned scanned;
  RpcFrameScanner scanner;
  RpcFrameDecoder decoder;
  ShapeTable shapes;
  std::size_t arrived = 0;
  while (arrived < bytes.size()) {
    arrived = grow < bytes.size() - arrived ? arrived + grow : bytes.size();
    for (;;) {
      const std::string_view seen = bytes.substr(0, arrived);
      const RpcFrameScanner::Result result = scanner.scan(seen);
      if (result == RpcFrameScanner::Result::kBroken) {
        scanned.problem = scanner.problem();
        expect(!scanned.problem.empty());
        return scanned;
      }
      if (result == RpcFrameScanner::Result::kNeedsMore) break;
      if (mustDecode) decode(decoder, shapes, seen, scanner.frame());
      scanned.frames.push_back(seen.substr(0, scanner.frame().bytes));
      bytes.remove_prefix(scanner.frame().bytes);
      arrived -= scanner.frame().bytes;
    }
  }
  return scanned;
}

void read(std::string_view bytes, std::size_t pieceLength) {
  const Scanned atOnce = scan(bytes, bytes.size(), true);
  const Scanned inPieces = scan(bytes, pieceLength, false);
  expect(atOnce.frames == inPieces.frames && atOnce.problem == inPieces.problem);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  tonewerk::read({reinterpret_cast<const char*>(data) + 1, size - 1}, data[0] + std::size_t{1});
  return 0;
}
