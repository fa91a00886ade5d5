// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as the bytes of a client: they are cut into pieces and read as frames, and the arguments of
// each frame are checked against a method.
//
// The input's first byte is the length of the pieces (0: all at once), the second byte chooses the method.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/RequestSet.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

const RequestSet& fuzzInterface() {
  static const RequestSet interface {
    {
      {"number", {{"number", ParameterType::kInt64}}}, {"short", {{"number", ParameterType::kUInt16}}},
          {"message",
           {{"message", ParameterType::kMap},
            {"category", ParameterType::kUInt32},
            {"type", ParameterType::kUInt16},
            {"reporterIDs", ParameterType::kInt64ListOrNone}}},
          {"nothing", {}},
    }
  };
  return interface;
}

void expect(bool condition) {
  if (!condition) std::abort();
}

// Checks that every text from the reader is UTF-8.
void expectSound(const Value& value) {
  if (const SharedString* text = value.asString()) expect(isUtf8(*text));
  if (const ValueArray* array = value.asArray()) {
    for (const Value& element : *array) expectSound(element);
  }
  if (const ValueMap* map = value.asMap()) {
    for (const ValueMapEntry& entry : *map) {
      expect(isUtf8(entry.key));
      expectSound(entry.value);
    }
  }
}

// Checks that a frame can be written, and that reading it again gives the same frame.
void expectRoundTrip(const RpcFrame& frame) {
  std::string written;
  RpcWriter(written).request(frame.identifier, frame.method, frame.arguments);
  if (written.size() > kMaxFrameBytes)
    return;  // may grow: a float of four bytes is written as a double of eight
  RpcStrings texts;
  RpcFrameReader reader(texts);
  std::string_view bytes = written;
  expect(reader.next(bytes) == RpcFrameReader::Result::kFrame);
  expect(reader.frame().method == frame.method);
  expect(!reader.frame().refused);
  std::string again;
  RpcWriter(again).request(frame.identifier, frame.method, reader.frame().arguments);
  expect(again.size() == written.size());
}

void expectSound(const RpcFrame& frame, std::size_t method) {
  expect(frame.wireBytes <= kMaxFrameBytes);
  expect(isUtf8(frame.method));
  for (const Argument& argument : frame.arguments) {
    if (argument) expectSound(*argument);
  }
  if (frame.error) expectSound(*frame.error);
  if (frame.result) expectSound(*frame.result);
  const auto problem = problemWith(fuzzInterface().methods[method], frame.arguments);
  expect(!problem || isUtf8(*problem));
  if (frame.kind != RpcFrame::Kind::kResponse && !frame.refused) expectRoundTrip(frame);
}

void read(std::string_view bytes, std::size_t pieceLength, std::size_t method) {
  RpcStrings texts;
  RpcFrameReader reader(texts);
  while (!bytes.empty()) {
    std::string_view piece = bytes.substr(0, pieceLength);
    bytes.remove_prefix(piece.size());
    for (;;) {
      const RpcFrameReader::Result result = reader.next(piece);
      if (result == RpcFrameReader::Result::kBroken) {
        expect(!reader.problem().empty());
        return;
      }
      if (result == RpcFrameReader::Result::kNeedsMore) break;
      expectSound(reader.frame(), method);
    }
    expect(piece.empty());
  }
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < 2) return 0;
  const std::size_t pieceLength = data[0] == 0 ? std::string_view::npos : data[0];
  const std::size_t method = data[1] % tonewerk::fuzzInterface().methods.size();
  tonewerk::read({reinterpret_cast<const char*>(data) + 2, size - 2}, pieceLength, method);
  return 0;
}
