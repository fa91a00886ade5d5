// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <gtest/gtest.h>
#include <string>
#include <systemd/sd-bus.h>
#include <utility>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Write and read values in messages, for tests that do not test the encoding.

inline void appendMap(sd_bus_message* message, const ValueMap& map);

inline void appendVariant(sd_bus_message* message, const Value& value) {
  const auto append = [message](const char* type, auto plain) {
    EXPECT_GE(sd_bus_message_append(message, "v", type, plain), 0);
  };
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return append("b", *value.asBoolean() ? 1 : 0);
    case Value::Kind::kInteger:
      return append("x", *value.asInteger());
    case Value::Kind::kUnsigned:
      return append("t", *value.asUnsigned());
    case Value::Kind::kDouble:
      return append("d", *value.asDouble());
    case Value::Kind::kString:
      return append("s", value.asString()->string().c_str());
    case Value::Kind::kDate:
      return append("(d)", value.asDate()->seconds);
    case Value::Kind::kArray:
      EXPECT_GE(sd_bus_message_open_container(message, 'v', "av"), 0);
      EXPECT_GE(sd_bus_message_open_container(message, 'a', "v"), 0);
      for (const Value& element : *value.asArray()) appendVariant(message, element);
      EXPECT_GE(sd_bus_message_close_container(message), 0);
      EXPECT_GE(sd_bus_message_close_container(message), 0);
      return;
    case Value::Kind::kMap:
      EXPECT_GE(sd_bus_message_open_container(message, 'v', "a{sv}"), 0);
      appendMap(message, *value.asMap());
      EXPECT_GE(sd_bus_message_close_container(message), 0);
      return;
  }
}

inline void appendMap(sd_bus_message* message, const ValueMap& map) {
  EXPECT_GE(sd_bus_message_open_container(message, 'a', "{sv}"), 0);
  for (const ValueMapEntry& entry : map) {
    EXPECT_GE(sd_bus_message_open_container(message, 'e', "sv"), 0);
    EXPECT_GE(sd_bus_message_append(message, "s", entry.key.string().c_str()), 0);
    appendVariant(message, entry.value);
    EXPECT_GE(sd_bus_message_close_container(message), 0);
  }
  EXPECT_GE(sd_bus_message_close_container(message), 0);
}

inline ValueMap readMap(sd_bus_message* message);

inline Value readVariant(sd_bus_message* message) {
  const char* contents = nullptr;
  char kind = '\0';
  EXPECT_GT(sd_bus_message_peek_type(message, &kind, &contents), 0);
  const std::string type = contents == nullptr ? "" : contents;
  const auto read = [&](auto plain) {
    EXPECT_GT(sd_bus_message_read(message, "v", type.c_str(), &plain), 0);
    return plain;
  };
  if (type == "b") return Value(read(int{0}) != 0);
  if (type == "x") return Value(read(std::int64_t{0}));
  if (type == "t") return Value(read(std::uint64_t{0}));
  if (type == "d") return Value(read(0.0));
  if (type == "(d)") return Value(Date{read(0.0)});
  if (type == "s") return Value(read(static_cast<const char*>(nullptr)));
  EXPECT_GT(sd_bus_message_enter_container(message, 'v', type.c_str()), 0);
  Value value;
  if (type == "a{sv}") {
    value = Value(readMap(message));
  } else {
    EXPECT_EQ(type, "av");
    std::vector<Value> values;
    EXPECT_GE(sd_bus_message_enter_container(message, 'a', "v"), 0);
    while (sd_bus_message_at_end(message, 0) == 0) values.push_back(readVariant(message));
    EXPECT_GE(sd_bus_message_exit_container(message), 0);
    value = Value(ValueArray(std::move(values)));
  }
  EXPECT_GE(sd_bus_message_exit_container(message), 0);
  return value;
}

inline ValueMap readMap(sd_bus_message* message) {
  ValueMap map;
  EXPECT_GE(sd_bus_message_enter_container(message, 'a', "{sv}"), 0);
  while (sd_bus_message_enter_container(message, 'e', "sv") > 0) {
    const char* key = "";
    EXPECT_GT(sd_bus_message_read(message, "s", &key), 0);
    const std::string text = key;
    map.set(text, readVariant(message));
    EXPECT_GE(sd_bus_message_exit_container(message), 0);
  }
  EXPECT_GE(sd_bus_message_exit_container(message), 0);
  return map;
}

}  // namespace tonewerk
