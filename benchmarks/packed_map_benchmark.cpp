// SPDX-License-Identifier: Apache-2.0
//
// Measures a client's message as a tree and as a packed map: reading it, copying, comparing, and writing it
// as JSON. Also measures messages with many keys, and those whose keys are always new.

#include <algorithm>
#include <benchmark/benchmark.h>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/messagepack/PackedMapReader.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "values/CompactJson.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

// A playing stream, with values of the types that clients send.
ValueMap message(double time = 1790000000.02) {
  return {{"twreporting_timestamp", time},
          {"session_output_running", true},
          {"session_selected_format", "48000 Hz, 2 ch, Float32, interleaved"},
          {"active_devices", "Speaker"},
          {"mFormatID", "lpcm"},
          {"mChannelsPerFrame", 2},
          {"mSampleRate", 48000},
          {"mBitsPerChannel", 32},
          {"mFramesPerPacket", 1},
          {"QMSessionVolume", 0.4375},
          {"position", 123456}};
}

ValueMap largeMessage() {
  ValueMap map;
  for (int at = 0; at < 512; ++at) map.set("a_key_of_some_length_" + std::to_string(at), at);
  return map;
}

std::string bytesOf(const ValueMap& map) {
  std::string bytes;
  RpcWriter(bytes).value(map);
  return bytes;
}

// A request whose only argument is the map.
std::string frameOf(std::string_view map) { return std::string("\x94\x00\x01\xA1m\x91", 6).append(map); }

ValueMap packed(const ValueMap& map, ShapeTable& shapes) {
  return PackedMapReader().read(bytesOf(map), shapes).map;
}

void readTree(benchmark::State& state, const ValueMap& map) {
  const std::string frame = frameOf(bytesOf(map));
  RpcStrings texts;
  RpcFrameReader reader(texts);
  for (auto _ : state) {
    std::string_view rest = frame;
    benchmark::DoNotOptimize(reader.next(rest));
    benchmark::DoNotOptimize(reader.frame().arguments);
  }
  state.counters["wire"] = static_cast<double>(frame.size());
  state.counters["bytes"] = static_cast<double>(reader.frame().arguments.front()->bytes());
}

void readPacked(benchmark::State& state, const ValueMap& map) {
  const std::string bytes = bytesOf(map);
  ShapeTable shapes;
  PackedMapReader reader;
  for (auto _ : state) benchmark::DoNotOptimize(reader.read(bytes, shapes));
  state.counters["wire"] = static_cast<double>(bytes.size());
  state.counters["bytes"] = static_cast<double>(reader.read(bytes, shapes).map.bytes());
}

void ReadTree(benchmark::State& state) { readTree(state, message()); }
BENCHMARK(ReadTree);
void ReadPacked(benchmark::State& state) { readPacked(state, message()); }
BENCHMARK(ReadPacked);
void ReadLargeTree(benchmark::State& state) { readTree(state, largeMessage()); }
BENCHMARK(ReadLargeTree);
void ReadLargePacked(benchmark::State& state) { readPacked(state, largeMessage()); }
BENCHMARK(ReadLargePacked);

// Makes frames whose keys are in no other one.
std::vector<std::string> mapsOfNewKeys() {
  std::vector<std::string> maps;
  for (int at = 0; at < 20'000; ++at) {
    ValueMap map;
    for (int key = 0; key < 11; ++key) map.set("new_key_" + std::to_string(at * 11 + key), key);
    maps.push_back(bytesOf(map));
  }
  return maps;
}

void ReadNewKeysAsTrees(benchmark::State& state) {
  const std::vector<std::string> maps = mapsOfNewKeys();
  RpcStrings texts;
  RpcFrameReader reader(texts);
  std::vector<std::string> frames(maps.size());
  std::transform(maps.begin(), maps.end(), frames.begin(), frameOf);
  std::size_t at = 0;
  for (auto _ : state) {
    std::string_view rest = frames[at++ % frames.size()];
    benchmark::DoNotOptimize(reader.next(rest));
  }
}
BENCHMARK(ReadNewKeysAsTrees)->Iterations(20'000);

// Tries the packed map first, as a listener does. One table for all, which is soon full.
void ReadNewKeysPackedFirst(benchmark::State& state) {
  const std::vector<std::string> maps = mapsOfNewKeys();
  std::vector<std::string> frames(maps.size());
  std::transform(maps.begin(), maps.end(), frames.begin(), frameOf);
  RpcStrings texts;
  RpcFrameReader reader(texts);
  ShapeTable shapes;
  PackedMapReader packedReader;
  std::size_t at = 0;
  for (auto _ : state) {
    const std::size_t place = at++ % frames.size();
    PackedMapReader::Read read = packedReader.read(maps[place], shapes);
    benchmark::DoNotOptimize(read);
    if (read.result == PackedMapReader::Result::kPacked) continue;
    std::string_view rest = frames[place];
    benchmark::DoNotOptimize(reader.next(rest));
  }
}
BENCHMARK(ReadNewKeysPackedFirst)->Iterations(20'000);

// Runs `measured` with a tree, or with a packed map.
template <typename Measured>
void withMap(benchmark::State& state, const ValueMap& map, bool isPacked, Measured&& measured) {
  ShapeTable shapes;
  const ValueMap used = isPacked ? packed(map, shapes) : map;
  for (auto _ : state) measured(used);
}

void copy(const ValueMap& map) { benchmark::DoNotOptimize(ValueMap(map)); }
void CopyTree(benchmark::State& state) { withMap(state, message(), false, copy); }
BENCHMARK(CopyTree);
void CopyPacked(benchmark::State& state) { withMap(state, message(), true, copy); }
BENCHMARK(CopyPacked);

std::string out;
void json(const ValueMap& map) {
  out.clear();
  appendCompactJson(out, map);
  benchmark::DoNotOptimize(out.data());
}
void JsonOfTree(benchmark::State& state) { withMap(state, message(), false, json); }
BENCHMARK(JsonOfTree);
void JsonOfPacked(benchmark::State& state) { withMap(state, message(), true, json); }
BENCHMARK(JsonOfPacked);
void JsonOfLargeTree(benchmark::State& state) { withMap(state, largeMessage(), false, json); }
BENCHMARK(JsonOfLargeTree);
void JsonOfLargePacked(benchmark::State& state) { withMap(state, largeMessage(), true, json); }
BENCHMARK(JsonOfLargePacked);

// Compares two messages that differ in their times only.
void equals(benchmark::State& state, bool isPacked) {
  ShapeTable shapes;
  const ValueMap a = isPacked ? packed(message(), shapes) : message();
  const ValueMap b = isPacked ? packed(message(1790000001.5), shapes) : message(1790000001.5);
  for (auto _ : state) {
    benchmark::DoNotOptimize(
        a.equalsIgnoring(b, {"process_uptime_ms", "system_uptime_sec", "twreporting_timestamp"}));
  }
}
void EqualsTree(benchmark::State& state) { equals(state, false); }
BENCHMARK(EqualsTree);
void EqualsPacked(benchmark::State& state) { equals(state, true); }
BENCHMARK(EqualsPacked);

void view(const ValueMap& map) { benchmark::DoNotOptimize(map.integer("position")); }
void IntegerOfTree(benchmark::State& state) { withMap(state, message(), false, view); }
BENCHMARK(IntegerOfTree);
void IntegerOfPacked(benchmark::State& state) { withMap(state, message(), true, view); }
BENCHMARK(IntegerOfPacked);

void MergePackedIntoTree(benchmark::State& state) {
  ShapeTable shapes;
  const ValueMap map = packed(message(), shapes);
  ValueMap all = {{"first", 1}};
  for (auto _ : state) all.merge(map);
}
BENCHMARK(MergePackedIntoTree);

// Reads, then adds what a session adds to every message.
void ReadAndExtend(benchmark::State& state) {
  const std::string bytes = bytesOf(message());
  ShapeTable shapes;
  PackedMapReader reader;
  const std::vector<ValueMapEntry> constants = {{"audio_tag", "playback_generic"}, {"application", "player"}};
  for (auto _ : state) {
    ValueMap map = reader.read(bytes, shapes).map;
    benchmark::DoNotOptimize(map.extend(*shapes.extended(*map.shape(), constants)));
  }
}
BENCHMARK(ReadAndExtend);

void ReadAndSetTime(benchmark::State& state) {
  ValueMap timeless = message();
  timeless.erase("twreporting_timestamp");
  const std::string bytes = bytesOf(timeless);
  ShapeTable shapes;
  PackedMapReader reader;
  const Value nil("(null)");
  const Value now(1790000001.5);
  for (auto _ : state) {
    ValueMap map = reader.read(bytes, shapes).map;
    benchmark::DoNotOptimize(
        map.setPacked({{"invalid_timestamp", nil}, {"twreporting_timestamp", now}}, shapes));
  }
}
BENCHMARK(ReadAndSetTime);

}  // namespace
}  // namespace tonewerk

BENCHMARK_MAIN();
