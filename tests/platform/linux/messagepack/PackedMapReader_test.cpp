// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/PackedMapReader.h"

#include <array>
#include <cstdint>
#include <gtest/gtest.h>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "RandomMaps.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/otlp/OtlpLogRecord.h"
#include "platform/linux/protobuf/Hex.h"
#include "values/Nesting.h"
#include "values/PrettyJson.h"
#include "values/ValueDigest.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

using Result = PackedMapReader::Result;

// Random maps of each test. A million takes minutes.
constexpr std::size_t kMaps = 20'000;
constexpr std::uint64_t kSeed = 20261122;
// Maps that one table reads: small ones meet the same shapes again, large ones fill it.
constexpr std::size_t kMapsOfTable = 500;

// A map as RpcFrameReader reads it, or the words for what it refuses.
struct Plain {
  ValueMap map;
  std::string refused;
};

Plain readPlain(std::string_view bytes) {
  RpcStrings texts;
  RpcFrameReader reader(texts);
  const std::string frame = fromHex("94 00 01 A1 6D 91") + std::string(bytes);
  std::string_view rest = frame;
  EXPECT_EQ(reader.next(rest), RpcFrameReader::Result::kFrame) << reader.problem();
  if (reader.frame().refused) return {{}, reader.frame().refused->what};
  return {*reader.frame().arguments.front()->asMap(), ""};
}

std::string bytesOf(const ValueMap& map) {
  std::string bytes;
  RpcWriter(bytes).value(map);
  return bytes;
}

// Reads maps with a table that is new after every kMapsOfTable maps.
class Tables {
 public:
  PackedMapReader::Read read(std::string_view bytes) {
    if (count_++ % kMapsOfTable == 0) {
      shapes = std::make_unique<ShapeTable>(std::vector<SharedString>{"twreporting_timestamp", "level"});
    }
    return reader_.read(bytes, *shapes);
  }

  std::unique_ptr<ShapeTable> shapes;

 private:
  PackedMapReader reader_;
  std::size_t count_ = 0;
};

void expectSameValue(ValueView packed, const Value& plain) {
  ASSERT_TRUE(packed);
  EXPECT_EQ(packed.kind(), plain.kind());
  EXPECT_TRUE(packed == ValueView(plain));
  EXPECT_TRUE(ValueView(plain) == packed);
  EXPECT_EQ(packed.value(), plain);
  EXPECT_EQ(packed.boolean(), plain.boolean());
  EXPECT_EQ(packed.integer(), plain.integer());
  EXPECT_EQ(packed.integer32(), plain.integer32());
  EXPECT_EQ(Value(packed.number()), Value(plain.number()));  // NaN equals NaN
  EXPECT_EQ(packed.text(), plain.text());
  const SharedString* text = plain.asString();
  EXPECT_EQ(packed.asText(), text == nullptr ? std::nullopt : std::optional(text->view()));
}

void expectSameEntries(const ValueMap& packed, const ValueMap& plain) {
  ASSERT_EQ(packed.size(), plain.size());
  EXPECT_EQ(packed.empty(), plain.empty());
  const ValueMapEntry* next = plain.begin();
  packed.forEach([&](const SharedString& key, ValueView value) {
    EXPECT_EQ(key, next->key);
    expectSameValue(value, next->value);
    ++next;
  });
  for (const ValueMapEntry& entry : plain) {
    EXPECT_TRUE(packed.contains(entry.key));
    expectSameValue(packed.view(entry.key), entry.value);
    EXPECT_EQ(packed.text(entry.key), plain.text(entry.key));
    EXPECT_EQ(packed.integer(entry.key), plain.integer(entry.key));
    EXPECT_EQ(packed.boolean(entry.key), plain.boolean(entry.key));
    EXPECT_EQ(Value(packed.number(entry.key)), Value(plain.number(entry.key)));
  }
  EXPECT_FALSE(packed.contains("absent"));
  EXPECT_FALSE(packed.view("absent"));
  EXPECT_EQ(packed.integer("absent"), 0);
  EXPECT_EQ(packed.text("absent"), "");
}

void expectSamePrettyText(const ValueMap& packed, const ValueMap& plain) {
  std::string text;
  std::string problem;
  std::string plainText;
  std::string plainProblem;
  EXPECT_EQ(appendPrettyJson(text, packed, problem), appendPrettyJson(plainText, plain, plainProblem));
  EXPECT_EQ(text, plainText);
  EXPECT_EQ(problem, plainProblem);
}

void expectSameMap(const ValueMap& packed, const ValueMap& plain) {
  EXPECT_EQ(packed, plain);
  EXPECT_EQ(plain, packed);
  EXPECT_EQ(packed.text(), plain.text());
  expectSamePrettyText(packed, plain);
}

// The tree of `packed`: every function that needs one.
void expectSameTree(const ValueMap& packed, const ValueMap& plain) {
  ASSERT_EQ(static_cast<std::size_t>(packed.end() - packed.begin()), plain.size());
  for (std::size_t at = 0; at < plain.size(); ++at) {
    EXPECT_EQ(packed.begin()[at].key, plain.begin()[at].key);
    EXPECT_EQ(packed.begin()[at].value, plain.begin()[at].value);
    EXPECT_EQ(*packed.find(plain.begin()[at].key), plain.begin()[at].value);
  }
  EXPECT_EQ(packed.find("absent"), nullptr);
}

// Changes copies of both in the same ways.
void expectSameChanges(const ValueMap& packed, const ValueMap& plain, RandomMaps& random) {
  const auto change = [&](auto&& how) {
    ValueMap a = packed;
    ValueMap b = plain;
    how(a);
    how(b);
    expectSameMap(a, b);
    EXPECT_EQ(a.bytes() == 0, b.bytes() == 0);
    expectSameMap(packed, plain);
  };
  const std::string key = random.key();
  const ValueMap more = random.map();
  change([&](ValueMap& map) { map.set(key, "new"); });
  change([&](ValueMap& map) { map.erase(key); });
  change([&](ValueMap& map) { map.merge(more); });
  ValueMap a = more;
  ValueMap b = more;
  a.merge(packed);
  b.merge(plain);
  expectSameMap(a, b);
  EXPECT_TRUE(more.empty() || a.bytes() == b.bytes());
}

class PackedMapReaderTest : public ::testing::Test {
 protected:
  RandomMaps random{kSeed};
  Tables tables;

  bool stopsAt(std::size_t map) {
    if (HasFailure()) ADD_FAILURE() << "map " << map << " of seed " << kSeed;
    return HasFailure();
  }
};

TEST_F(PackedMapReaderTest, ReadsWhatTheWriterWritesLikeATree) {
  for (std::size_t at = 0; at < kMaps && !stopsAt(at); ++at) {
    const std::string bytes = bytesOf(random.map());
    const Plain plain = readPlain(bytes);
    const PackedMapReader::Read read = tables.read(bytes);
    if (read.result == Result::kTree) continue;
    ASSERT_EQ(read.result, Result::kPacked);
    EXPECT_EQ(read.map.packed() == nullptr, plain.map.empty());
    expectSameMap(read.map, plain.map);
    expectSameEntries(read.map, plain.map);
    expectSameChanges(read.map, plain.map, random);
    expectSameTree(read.map, plain.map);
    expectSameMap(read.map, plain.map);
  }
}

TEST_F(PackedMapReaderTest, ReadsEveryFormOfAValueLikeATree) {
  std::size_t packed = 0;
  for (std::size_t at = 0; at < kMaps && !stopsAt(at); ++at) {
    const std::string bytes = random.bytesOf(random.map(), {.doubledKeys = true, .otherOrder = true});
    const Plain plain = readPlain(bytes);
    const PackedMapReader::Read read = tables.read(bytes);
    if (read.result == Result::kTree) continue;
    ASSERT_EQ(read.result, Result::kPacked);
    ++packed;
    expectSameMap(read.map, plain.map);
    expectSameEntries(read.map, plain.map);
    expectSameTree(read.map, plain.map);
  }
  EXPECT_GT(packed, kMaps / 3);
}

TEST_F(PackedMapReaderTest, RefusesTheFirstForbiddenValueInTheSameWords) {
  std::size_t refused = 0;
  for (std::size_t at = 0; at < kMaps && !stopsAt(at); ++at) {
    const std::string bytes = random.bytesOf(random.map(), {.doubledKeys = true, .forbiddenValues = true});
    const Plain plain = readPlain(bytes);
    const PackedMapReader::Read read = tables.read(bytes);
    if (read.result == Result::kTree) continue;
    EXPECT_EQ(read.result == Result::kRefused, !plain.refused.empty());
    EXPECT_EQ(read.refused, plain.refused);
    if (read.result == Result::kRefused) ++refused;
  }
  EXPECT_GT(refused, kMaps / 10);
}

// Messages of one kind: mostly alike, some damaged. A new reader has no recent map to compare them with.
TEST_F(PackedMapReaderTest, ReadsMapsOfOneKindLikeANewReader) {
  PackedMapReader reader;
  std::size_t packed = 0;
  std::size_t others = 0;
  for (std::size_t at = 0; at < kMaps / 10 && !stopsAt(at); ++at) {
    ShapeTable shapes;
    ValueMap map = random.map();
    for (int round = 0; round < 10; ++round) {
      if (random.isOneIn(2)) map = random.changed(map);
      std::string bytes = random.bytesOf(map, {.forbiddenValues = random.isOneIn(5)});
      if (random.isOneIn(5)) {
        char& byte = bytes[random.below(bytes.size())];
        byte = static_cast<char>(static_cast<unsigned char>(byte) ^ (1U << random.below(8)));
      }
      if (random.isOneIn(10)) bytes.pop_back();
      if (random.isOneIn(10)) bytes += '\x01';
      const std::string behind = bytes + std::string(random.below(40), '\x02');
      const std::string_view own = std::string_view(behind).substr(0, bytes.size());
      const PackedMapReader::Read expected = PackedMapReader().read(std::string(bytes), shapes);
      const PackedMapReader::Read read = reader.read(own, shapes, {at % 5, behind.size() - bytes.size()});
      ASSERT_EQ(read.result, expected.result);
      EXPECT_STREQ(read.refused, expected.refused);
      if (read.result != Result::kPacked) {
        ++others;
        continue;
      }
      ++packed;
      EXPECT_EQ(read.map, expected.map);
      if (read.map.packed() == nullptr) continue;
      EXPECT_EQ(&read.map.packed()->shape(), &expected.map.packed()->shape());
      EXPECT_EQ(read.map.packed()->values(), expected.map.packed()->values());
    }
  }
  EXPECT_GT(packed, kMaps / 3);
  EXPECT_GT(others, kMaps / 20);
}

TEST_F(PackedMapReaderTest, ComparesLikeTrees) {
  const std::array<std::string_view, 4> keys = {"twreporting_timestamp", "level", "absent", "a"};
  std::size_t equal = 0;
  std::size_t different = 0;
  for (std::size_t at = 0; at < kMaps && !stopsAt(at); ++at) {
    const ValueMap first = random.map();
    const ValueMap second = random.isOneIn(2) ? first : random.changed(first);
    const std::string a = random.bytesOf(first, {.otherNumbers = true});
    const std::string b = random.bytesOf(second, {.otherOrder = random.isOneIn(4), .otherNumbers = true});
    const Plain plainA = readPlain(a);
    const Plain plainB = readPlain(b);
    const PackedMapReader::Read packedA = tables.read(a);
    const PackedMapReader::Read packedB = tables.read(b);
    if (packedA.result == Result::kTree || packedB.result == Result::kTree) continue;
    const std::initializer_list<std::string_view> all = {keys[0], keys[1], keys[2], keys[3]};
    const std::initializer_list<std::string_view> one = {keys[random.below(keys.size())]};
    for (const auto& ignored : {std::initializer_list<std::string_view>{}, one, all}) {
      const bool isEqual = plainA.map.equalsIgnoring(plainB.map, ignored);
      EXPECT_EQ(packedA.map.equalsIgnoring(packedB.map, ignored), isEqual);
      EXPECT_EQ(packedB.map.equalsIgnoring(packedA.map, ignored), isEqual);
      EXPECT_EQ(packedA.map.equalsIgnoring(plainB.map, ignored), isEqual);
      EXPECT_EQ(plainA.map.equalsIgnoring(packedB.map, ignored), isEqual);
      ++(isEqual ? equal : different);
    }
  }
  EXPECT_GT(equal, kMaps / 4);
  EXPECT_GT(different, kMaps / 4);
}

// Does what a session does: adds the two keys of a missing or old time, then a tag and an application's name.
TEST_F(PackedMapReaderTest, AddsTimeAndConstantsLikeATree) {
  const SharedString time("twreporting_timestamp");
  const SharedString invalid("invalid_timestamp");
  std::size_t stayedPacked = 0;
  for (std::size_t at = 0; at < kMaps && !stopsAt(at); ++at) {
    const Plain plain = readPlain(random.bytesOf(random.map(), {}));
    PackedMapReader::Read read = tables.read(bytesOf(plain.map));
    if (read.map.packed() == nullptr) continue;
    ValueMap packed = read.map;
    ValueMap tree = plain.map;
    const ValueView earlier = packed.view(time);
    const Value nil("(null)");
    const Value now(1.79e9);
    if (packed.setPacked({{invalid, earlier ? earlier : ValueView(nil)}, {time, now}}, *tables.shapes)) {
      const Value* old = tree.find(time);
      const Value before = old == nullptr ? nil : *old;
      tree.set(invalid, before);
      tree.set(time, now);
    }
    expectSameMap(packed, tree);
    const std::array<ValueMapEntry, 2> constants = {
        ValueMapEntry{"audio_tag", "tag " + std::to_string(random.below(5))},
        ValueMapEntry{random.isOneIn(2) ? "app" : random.key(), Value(static_cast<int>(random.below(4)))}};
    const Shape* extended = tables.shapes->extended(*packed.shape(), constants);
    if (extended == nullptr) continue;
    ValueMap shared = packed;
    if (random.isOneIn(2)) read.map = ValueMap();
    if (random.isOneIn(2)) shared = ValueMap();
    ASSERT_TRUE(packed.extend(*extended));
    EXPECT_EQ(packed.shape(), extended);
    for (const ValueMapEntry& entry : constants) tree.set(entry.key, entry.value);
    expectSameMap(packed, tree);
    expectSameEntries(packed, tree);
    expectSameTree(packed, tree);
    EXPECT_FALSE(packed.extend(*extended));
    ++stayedPacked;
  }
  EXPECT_GT(stayedPacked, kMaps / 2);
}

TEST_F(PackedMapReaderTest, TwoThreadsMakeTheTreeOfOneMap) {
  const ValueMap plain{{"a", 1}, {"b", "text"}, {"c", ValueArray{1, 2}}};
  for (int round = 0; round < 200; ++round) {
    const ValueMap map = tables.read(bytesOf(plain)).map;
    std::array<const Value*, 2> found{};
    {
      const auto find = [&found](const ValueMap& shared, std::size_t thread) {
        found[thread] = shared.find("b");
        EXPECT_EQ(shared.text(), R"({"a":1,"b":"text","c":[1,2]})");
        ValueMap own = shared;
        own.set("a", 2);
        EXPECT_EQ(own.integer("a"), 2);
      };
      std::thread other(find, map, 0);
      find(map, 1);
      other.join();
    }
    EXPECT_EQ(found[0], found[1]);
    EXPECT_EQ(map, plain);
  }
}

TEST_F(PackedMapReaderTest, LeavesDoubledKeysToTheTree) {
  EXPECT_EQ(tables.read(fromHex("82 A161 01 A161 02")).result, Result::kTree);
  EXPECT_EQ(tables.read(fromHex("82 A161 01 A162 02")).result, Result::kPacked);
  EXPECT_EQ(tables.read(fromHex("81 A161 82 A162 01 A162 02")).result, Result::kTree);
}

TEST_F(PackedMapReaderTest, TakesAMapInsideUpToItsLimit) {
  ValueMap inside;
  while (inside.size() < PackedMapReader::kMaxNestedKeys) inside.set(std::to_string(inside.size()), 1);
  EXPECT_EQ(tables.read(bytesOf({{"m", inside}})).result, Result::kPacked);
  inside.set("one more", 1);
  EXPECT_EQ(tables.read(bytesOf({{"m", inside}})).result, Result::kTree);
}

TEST_F(PackedMapReaderTest, TakesAnArrayInsideUpToItsLimit) {
  std::vector<Value> inside(PackedMapReader::kMaxNestedElements, Value(1));
  EXPECT_EQ(tables.read(bytesOf({{"a", ValueArray(inside)}})).result, Result::kPacked);
  inside.emplace_back(1);
  EXPECT_EQ(tables.read(bytesOf({{"a", ValueArray(inside)}})).result, Result::kTree);
}

TEST_F(PackedMapReaderTest, LeavesArraysAndMapsInsideOthersToTheTree) {
  const Value array = ValueArray{1, "text"};
  const Value map = ValueMap{{"k", 1}};
  EXPECT_EQ(tables.read(bytesOf({{"a", array}, {"m", map}})).result, Result::kPacked);
  for (const Value& inside : {array, map, Value(ValueArray()), Value(ValueMap())}) {
    EXPECT_EQ(tables.read(bytesOf({{"a", ValueArray{inside}}})).result, Result::kTree);
    EXPECT_EQ(tables.read(bytesOf({{"m", ValueMap{{"k", inside}}}})).result, Result::kTree);
  }
}

TEST_F(PackedMapReaderTest, ItsTreeIsNotManyTimesLarger) {
  ValueMap inside;
  while (inside.size() < PackedMapReader::kMaxNestedKeys)
    inside.set(std::string(1, static_cast<char>('a' + inside.size())), true);
  const ValueArray booleans(std::vector<Value>(PackedMapReader::kMaxNestedElements, Value(true)));
  const ValueMap message{{"array", booleans}, {"map", inside}};
  const ValueMap packed = tables.read(bytesOf(message)).map;
  ASSERT_NE(packed.packed(), nullptr);
  EXPECT_LT(message.bytes(), 40 * packed.bytes());
}

TEST_F(PackedMapReaderTest, WritesAPackedMapLikeItsTree) {
  for (std::size_t at = 0; at < kMaps / 4 && !stopsAt(at); ++at) {
    const std::string bytes = random.bytesOf(random.map(), {});
    const PackedMapReader::Read read = tables.read(bytes);
    if (read.result == Result::kTree) continue;
    const ValueMap plain = readPlain(bytes).map;
    EXPECT_EQ(bytesOf(read.map), bytesOf(plain));
    EXPECT_EQ(ValueDigest::of(read.map), ValueDigest::of(plain));
    for (std::size_t levels = 0; levels < 4; ++levels)
      EXPECT_EQ(nestsWithin(read.map, levels), nestsWithin(plain, levels)) << levels;
    const OtlpLogRecord packedRecord{.payload = read.map};
    const OtlpLogRecord record{.payload = plain};
    EXPECT_EQ(otlpJsonOf(packedRecord), otlpJsonOf(record));
  }
}

TEST_F(PackedMapReaderTest, TakesNoOtherBytesThanAMap) {
  const std::string bytes =
      bytesOf({{"text", "long enough"}, {"numbers", ValueArray{1, 2.5}}, {"date", Date{1}}});
  for (std::size_t size = 0; size < bytes.size(); ++size)
    EXPECT_EQ(tables.read(std::string_view(bytes).substr(0, size)).result, Result::kTree) << size;
  EXPECT_EQ(tables.read(bytes).result, Result::kPacked);
  EXPECT_EQ(tables.read(bytes + "x").result, Result::kTree);
  for (const char* hex : {"90", "01", "A161", "C1", "81 A161 C1", "DF FFFFFFFF", "81 A161 DD FFFFFFFF"})
    EXPECT_EQ(tables.read(fromHex(hex)).result, Result::kTree) << hex;
}

TEST_F(PackedMapReaderTest, LeavesANewShapeToTheTreeWhenTheTableIsFull) {
  ShapeTable shapes;
  PackedMapReader reader;
  const std::string known = bytesOf({{"known", 1}});
  ASSERT_EQ(reader.read(known, shapes).result, Result::kPacked);
  std::size_t count = 0;
  while (reader.read(bytesOf({{"key" + std::to_string(count), 1}}), shapes).result == Result::kPacked)
    ++count;
  EXPECT_EQ(count, ShapeTable::kMaxShapes - 1);
  EXPECT_EQ(reader.read(known, shapes).result, Result::kPacked);
}

TEST_F(PackedMapReaderTest, TakesLittleMemoryForAMessage) {
  const ValueMap message{
      {"twreporting_timestamp", 1790000000.25}, {"mFormatID", "lpcm"}, {"mChannelsPerFrame", 2}};
  const PackedMapReader::Read read = tables.read(bytesOf(message));
  EXPECT_EQ(read.map.bytes(), PackedMap::kHeaderBytes + 9 + 5 + 1);
}

}  // namespace
}  // namespace tonewerk
