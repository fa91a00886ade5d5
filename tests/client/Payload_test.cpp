// SPDX-License-Identifier: Apache-2.0
#include "client/Payload.h"

#include <cmath>
#include <cstring>
#include <gmock/gmock.h>
#include <limits>
#include <optional>
#include <rapidcheck/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "client/MessageFrame.h"
#include "client/OneFrame.h"
#include "client/TestPayload.h"
#include "client/ValuePayload.h"
#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

// The map that the daemon reads from a message with this payload; empty on any problem.
ValueMap readBack(const twr_payload& payload) {
  std::string bytes;
  appendMessageFrame(bytes, std::nullopt, {1, 0, 0, 0, payload.entries, {payload.bytes, payload.size}}, 0,
                     {});
  std::optional<RpcFrame> frame = frameOf(bytes);
  if (!frame || frame->refused || frame->arguments.size() != 4 || !frame->arguments[0]->asMap()) return {};
  ValueMap map = *frame->arguments[0]->asMap();
  map.erase("twreporting_timestamp");
  return map;
}

class PayloadTest : public testing::Test {
 protected:
  // The first failure, and the entries that are still there.
  void expectProblem(twr_status problem) {
    EXPECT_EQ(twr_payload_problem(p), problem);
    EXPECT_EQ(twr_put_int(p, "later", 1), problem);
    EXPECT_EQ(twr_open_map(p, "later"), problem);
    EXPECT_EQ(twr_close(p), problem);
    EXPECT_EQ(twr_payload_problem(p), problem);
  }

  TestPayload payload;
  twr_payload* const p = payload.get();
};

TEST_F(PayloadTest, HoldsOneValueOfEachKind) {
  EXPECT_EQ(twr_put_bool(p, "yes", 7), TWR_OK);
  EXPECT_EQ(twr_put_bool(p, "no", 0), TWR_OK);
  EXPECT_EQ(twr_put_int(p, "int", INT64_MIN), TWR_OK);
  EXPECT_EQ(twr_put_uint(p, "uint", UINT64_MAX), TWR_OK);
  EXPECT_EQ(twr_put_double(p, "double", 2.0), TWR_OK);
  EXPECT_EQ(twr_put_text(p, "text", "\xC3\xA9"), TWR_OK);
  EXPECT_EQ(twr_put_text_n(p, "zero", "a\0b", 3), TWR_OK);
  EXPECT_EQ(twr_put_date(p, "date", 1763633999.5), TWR_OK);
  EXPECT_EQ(twr_payload_problem(p), TWR_OK);
  EXPECT_EQ(readBack(payload), (ValueMap{{"yes", true},
                                         {"no", false},
                                         {"int", INT64_MIN},
                                         {"uint", UINT64_MAX},
                                         {"double", 2.0},
                                         {"text", "\xC3\xA9"},
                                         {"zero", std::string("a\0b", 3)},
                                         {"date", Date{1763633999.5}}}));
  EXPECT_EQ(readBack(payload).find("double")->kind(), Value::Kind::kDouble);
}

TEST_F(PayloadTest, HoldsMapsAndListsInsideEachOther) {
  EXPECT_EQ(twr_open_map(p, "m"), TWR_OK);
  EXPECT_EQ(twr_open_list(p, "l"), TWR_OK);
  EXPECT_EQ(twr_put_int(p, nullptr, 1), TWR_OK);
  EXPECT_EQ(twr_open_map(p, nullptr), TWR_OK);
  EXPECT_EQ(twr_close(p), TWR_OK);
  EXPECT_EQ(twr_close(p), TWR_OK);
  EXPECT_EQ(twr_put_int(p, "after", 2), TWR_OK);
  EXPECT_EQ(twr_close(p), TWR_OK);
  EXPECT_EQ(twr_put_int(p, "outside", 3), TWR_OK);
  EXPECT_EQ(readBack(payload),
            (ValueMap{{"m", ValueMap{{"l", ValueArray{1, ValueMap{}}}, {"after", 2}}}, {"outside", 3}}));
}

TEST_F(PayloadTest, CountsEntriesBeyondAByte) {
  TestPayload large(std::size_t{1} << 19);
  twr_open_list(large.get(), "l");
  std::vector<Value> numbers;
  for (int n = 0; n < 70'000; ++n) {
    ASSERT_EQ(twr_put_int(large.get(), nullptr, n % 100), TWR_OK);
    numbers.emplace_back(n % 100);
  }
  twr_close(large.get());
  EXPECT_EQ(readBack(large), (ValueMap{{"l", ValueArray(std::move(numbers))}}));
}

TEST_F(PayloadTest, LeavesTheLastOfANameGivenTwice) {
  twr_put_int(p, "a", 1);
  twr_put_int(p, "a", 2);
  EXPECT_EQ(readBack(payload), (ValueMap{{"a", 2}}));
}

TEST_F(PayloadTest, IsEmptiedByInit) {
  twr_put_text(p, "a", "\xFF");
  twr_payload_init(p, p->bytes, p->capacity);
  EXPECT_EQ(twr_payload_problem(p), TWR_OK);
  EXPECT_EQ(p->entries, 0U);
  EXPECT_EQ(twr_put_int(p, "b", 1), TWR_OK);
  EXPECT_EQ(readBack(payload), (ValueMap{{"b", 1}}));
}

TEST_F(PayloadTest, IsRefusedWhileAContainerIsOpen) {
  twr_open_map(p, "m");
  EXPECT_EQ(twr_payload_problem(p), TWR_INVALID);
  twr_close(p);
  EXPECT_EQ(twr_payload_problem(p), TWR_OK);
}

TEST_F(PayloadTest, ClosesNoMoreThanWasOpened) {
  EXPECT_EQ(twr_close(p), TWR_INVALID);
  expectProblem(TWR_INVALID);
}

TEST_F(PayloadTest, NeedsANameInAMapAndNoneInAList) {
  EXPECT_EQ(twr_put_int(p, nullptr, 1), TWR_INVALID);
  expectProblem(TWR_INVALID);

  twr_payload_init(p, p->bytes, p->capacity);
  twr_open_list(p, "l");
  EXPECT_EQ(twr_put_int(p, "a", 1), TWR_INVALID);
  expectProblem(TWR_INVALID);
}

TEST_F(PayloadTest, RefusesWhatTheDaemonTakesForNoText) {
  for (const char* text : {"\xFF", "\xC0\x80", "a\xED\xA0\x80", "\xEF\xBF\xBF", "a\xEF\xB7\x90"}) {
    twr_payload_init(p, p->bytes, p->capacity);
    EXPECT_EQ(twr_put_text(p, "a", text), TWR_INVALID);
    twr_payload_init(p, p->bytes, p->capacity);
    EXPECT_EQ(twr_put_int(p, text, 1), TWR_INVALID);
    twr_payload_init(p, p->bytes, p->capacity);
    EXPECT_EQ(twr_open_list(p, text), TWR_INVALID);
    expectProblem(TWR_INVALID);
    EXPECT_EQ(p->size, 0U);
    EXPECT_EQ(p->entries, 0U);
  }
}

TEST_F(PayloadTest, RefusesATextThatIsNull) {
  EXPECT_EQ(twr_put_text(p, "a", nullptr), TWR_INVALID);
  twr_payload_init(p, p->bytes, p->capacity);
  EXPECT_EQ(twr_put_text_n(p, "a", nullptr, 1), TWR_INVALID);
  twr_payload_init(p, p->bytes, p->capacity);
  EXPECT_EQ(twr_put_text_n(p, "a", nullptr, 0), TWR_OK);
  EXPECT_EQ(readBack(payload), (ValueMap{{"a", ""}}));
}

TEST_F(PayloadTest, KeepsTheFirstFailureAndWhatWasThere) {
  unsigned char memory[16];
  twr_payload_init(p, memory, sizeof memory);
  EXPECT_EQ(twr_put_int(p, "a", 1), TWR_OK);
  EXPECT_EQ(twr_put_text(p, "b", "0123456789ab"), TWR_TOO_LARGE);
  EXPECT_EQ(twr_put_text(p, "c", "\xFF"), TWR_TOO_LARGE);
  expectProblem(TWR_TOO_LARGE);
  EXPECT_EQ(readBack(payload), (ValueMap{{"a", 1}}));
}

TEST_F(PayloadTest, FillsItsMemoryToTheLastByte) {
  unsigned char memory[16];
  twr_payload_init(p, memory, sizeof memory);
  EXPECT_EQ(twr_put_text(p, "b", "0123456789abc"), TWR_OK);  // 2 and 14
  EXPECT_EQ(p->size, sizeof memory);
  EXPECT_EQ(twr_payload_problem(p), TWR_OK);
}

TEST_F(PayloadTest, NeedsNoMoreThanTheHeaderPromises) {
  constexpr std::size_t kEntry = 20;
  constexpr std::size_t kContainer = 10;
  const std::string name(70'000, 'n');  // the longest header of a text
  const std::vector<std::pair<Value, std::size_t>> values = {{true, 0},
                                                             {INT64_MIN, 0},
                                                             {UINT64_MAX, 0},
                                                             {0.1, 0},
                                                             {Date{-1}, 0},
                                                             {Date{1e18}, 0},
                                                             {std::string(70'000, 't'), 70'000},
                                                             {Date{0.5}, 0}};
  for (const auto& [value, size] : values) {
    TestPayload exact(name.size() + size + kEntry);
    EXPECT_EQ(putValue(exact.get(), name.c_str(), value), TWR_OK) << value.text().substr(0, 20);
  }
  TestPayload exact(name.size() + kContainer);
  EXPECT_EQ(putValue(exact.get(), name.c_str(), ValueMap{}), TWR_OK);
}

TEST_F(PayloadTest, RefusesADateThatIsNone) {
  for (const double none : {std::nan(""), HUGE_VAL, -HUGE_VAL, 1e300, -1e19}) {
    TestPayload own;
    EXPECT_EQ(twr_put_date(own.get(), "date", none), TWR_INVALID) << none;
    EXPECT_EQ(twr_payload_problem(own.get()), TWR_INVALID);
    EXPECT_EQ(own.get()->size, 0U);
  }
}

TEST_F(PayloadTest, HasNoRoomWithoutMemory) {
  twr_payload_init(p, nullptr, 100);
  EXPECT_EQ(twr_payload_problem(p), TWR_OK);
  EXPECT_EQ(twr_put_bool(p, "a", 1), TWR_TOO_LARGE);
  expectProblem(TWR_TOO_LARGE);
}

TEST_F(PayloadTest, NestsAsDeepAsItSaysAndNoDeeper) {
  for (int depth = 0; depth < TWR_MOST_PAYLOAD_DEPTH; ++depth) {
    ASSERT_EQ(twr_open_map(p, "m"), TWR_OK) << depth;
  }
  const twr_payload deepest = *p;
  EXPECT_EQ(twr_open_list(p, "m"), TWR_INVALID);
  expectProblem(TWR_INVALID);
  *p = deepest;
  for (int depth = 0; depth < TWR_MOST_PAYLOAD_DEPTH; ++depth) ASSERT_EQ(twr_close(p), TWR_OK);
  EXPECT_EQ(readBack(payload).size(), 1U);  // the daemon reads it
}

TEST_F(PayloadTest, HoldsNilInTheOutermostListAlone) {
  twr_payload_init_list(p, p->bytes, p->capacity);
  EXPECT_EQ(twr_put_nil(p), TWR_OK);
  EXPECT_EQ(twr_put_int(p, nullptr, 7), TWR_OK);
  EXPECT_EQ(p->entries, 2U);
  EXPECT_EQ(std::string(p->bytes, p->bytes + p->size), "\xC0\x07");
  twr_open_list(p, nullptr);
  EXPECT_EQ(twr_put_nil(p), TWR_INVALID);
  expectProblem(TWR_INVALID);

  twr_payload_init(p, p->bytes, p->capacity);
  EXPECT_EQ(twr_put_nil(p), TWR_INVALID);
  expectProblem(TWR_INVALID);
}

TEST_F(PayloadTest, IsSafeWithoutAPayload) {
  twr_payload_init(nullptr, nullptr, 0);
  twr_payload_init_list(nullptr, nullptr, 0);
  EXPECT_EQ(twr_payload_problem(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_put_bool(nullptr, "a", 1), TWR_INVALID);
  EXPECT_EQ(twr_put_int(nullptr, "a", 1), TWR_INVALID);
  EXPECT_EQ(twr_put_uint(nullptr, "a", 1), TWR_INVALID);
  EXPECT_EQ(twr_put_double(nullptr, "a", 1), TWR_INVALID);
  EXPECT_EQ(twr_put_text(nullptr, "a", "b"), TWR_INVALID);
  EXPECT_EQ(twr_put_text_n(nullptr, "a", "b", 1), TWR_INVALID);
  EXPECT_EQ(twr_put_date(nullptr, "a", 1), TWR_INVALID);
  EXPECT_EQ(twr_put_nil(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_open_map(nullptr, "a"), TWR_INVALID);
  EXPECT_EQ(twr_open_list(nullptr, "a"), TWR_INVALID);
  EXPECT_EQ(twr_close(nullptr), TWR_INVALID);
}

// A name of the C interface ends at its first zero byte.
ValueMap withoutZeros(const ValueMap& map);

Value withoutZeros(const Value& value) {
  if (const ValueMap* map = value.asMap()) return withoutZeros(*map);
  const ValueArray* array = value.asArray();
  if (array == nullptr) return value;
  std::vector<Value> elements;
  for (const Value& element : *array) elements.push_back(withoutZeros(element));
  return ValueArray(std::move(elements));
}

ValueMap withoutZeros(const ValueMap& map) {
  ValueMap made;
  for (const ValueMapEntry& entry : map) {
    const std::string_view key = entry.key;
    made.set(key.substr(0, key.find('\0')), withoutZeros(entry.value));
  }
  return made;
}

bool haveSameKinds(const Value& a, const Value& b) {
  if (a.kind() != b.kind()) {
    // A small integer has no sign on the wire.
    const auto isInteger = [](const Value& v) {
      return v.asInteger() != nullptr || v.asUnsigned() != nullptr;
    };
    return isInteger(a) && isInteger(b);
  }
  const ValueMap* map = a.asMap();
  if (map == nullptr) return true;
  for (const ValueMapEntry& entry : *map) {
    if (!haveSameKinds(entry.value, *b.asMap()->find(entry.key))) return false;
  }
  return true;
}

RC_GTEST_PROP(PayloadPropertyTest, IsReadBackAsWhatWasPut, ()) {
  const ValueMap map = withoutZeros(*generate::map());
  RC_PRE(map.find("twreporting_timestamp") == nullptr);
  TestPayload payload(std::size_t{1} << 20);
  RC_ASSERT(putEntries(payload.get(), map) == TWR_OK);
  RC_ASSERT(twr_payload_problem(payload.get()) == TWR_OK);
  RC_ASSERT(payload->entries == map.size());
  const ValueMap read = readBack(payload);
  RC_ASSERT(Value(read).text() == Value(map).text());
  RC_ASSERT(haveSameKinds(Value(map), Value(read)));
}

RC_GTEST_PROP(PayloadPropertyTest, HoldsWhatFittedBeforeWhereverTheMemoryEnds, ()) {
  const ValueMap map = withoutZeros(*generate::map(1));
  TestPayload payload(*rc::gen::inRange<std::size_t>(0, 200));
  ValueMap fitted;
  for (const ValueMapEntry& entry : map) {
    if (putValue(payload.get(), std::string(entry.key).c_str(), entry.value) != TWR_OK) break;
    fitted.set(std::string(entry.key), entry.value);
  }
  RC_ASSERT((twr_payload_problem(payload.get()) == TWR_OK) == (fitted.size() == map.size()));
  RC_ASSERT(payload->size <= payload->capacity);
  RC_ASSERT(payload->entries == fitted.size());
  RC_ASSERT(Value(readBack(payload)).text() == Value(fitted).text());
}

TEST(PayloadReadingTest, ReadsAPayloadAsAMap) {
  TestPayload payload;
  twr_put_text(payload.get(), "a", "1");
  twr_open_map(payload.get(), "b");
  twr_put_bool(payload.get(), "c", 1);
  twr_close(payload.get());
  EXPECT_EQ(mapOf(payload), (ValueMap{{"a", "1"}, {"b", ValueMap{{"c", true}}}}));
}

TEST(PayloadReadingTest, ReadsNoMapOutOfOverwrittenMemory) {
  TestPayload payload;
  twr_put_text(payload.get(), "a", "1");
  for (std::uint32_t at = 0; at < payload->size; ++at) {
    for (const int scribble : {0x00, 0xC0, 0xC1, 0xDF, 0xFF}) {
      const auto byte = static_cast<unsigned char>(scribble);
      const unsigned char before = std::exchange(payload->bytes[at], byte);
      const std::optional<ValueMap> map = mapOf(payload);
      EXPECT_FALSE(map && *map == (ValueMap{{"a", "1"}}));
      payload->bytes[at] = before;
    }
  }
  payload->entries = 0xFFFFFFFFU;
  EXPECT_FALSE(mapOf(payload));
}

}  // namespace
}  // namespace tonewerk
