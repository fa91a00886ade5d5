// SPDX-License-Identifier: Apache-2.0
//
// What no bus lets through, but another kind of bus might: messages whose bodies are not what their
// signatures say. Here the test writes the bytes itself.
#include "platform/linux/DbusArguments.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <gtest/gtest.h>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <systemd/sd-bus.h>
#include <utility>

#include "platform/linux/DbusInterface.h"
#include "platform/linux/FileDescriptor.h"
#include "platform/linux/MessagingRig.h"
#include "platform/linux/RpcLimits.h"
#include "platform/linux/SdBus.h"
#include "platform/linux/Utf8.h"

namespace tonewerk {
namespace {

// Bytes as messages have them, little-endian.
class Bytes {
 public:
  const std::string& text() const { return text_; }
  std::size_t size() const { return text_.size(); }

  Bytes& align(std::size_t to) {
    while (text_.size() % to != 0) text_ += '\0';
    return *this;
  }
  Bytes& byte(std::uint8_t value) {
    text_ += static_cast<char>(value);
    return *this;
  }
  Bytes& number(std::uint32_t value) { return align(4).raw(value); }
  Bytes& real(double value) { return align(8).raw(value); }
  Bytes& string(std::string_view text) {
    number(static_cast<std::uint32_t>(text.size()));
    text_ += text;
    return byte(0);
  }
  Bytes& signature(std::string_view text) {
    byte(static_cast<std::uint8_t>(text.size()));
    text_ += text;
    return byte(0);
  }
  // Puts the length of what has come since `begin` into the number before it.
  void setLength(std::size_t at, std::size_t begin) {
    const auto length = static_cast<std::uint32_t>(text_.size() - begin);
    text_.replace(at, sizeof(length), reinterpret_cast<const char*>(&length), sizeof(length));
  }

 private:
  template <typename T>
  Bytes& raw(T value) {
    text_.append(reinterpret_cast<const char*>(&value), sizeof(value));
    return *this;
  }

  std::string text_;
};

std::string messageOf(std::string_view signature, const std::string& body) {
  Bytes message;
  message.byte('l').byte(1).byte(1).byte(1);  // a call that expects no reply
  message.number(static_cast<std::uint32_t>(body.size())).number(1).number(0);
  const std::size_t begin = message.size();
  message.byte(1).signature("o").string("/a");
  message.align(8).byte(3).signature("s").string("Call");
  message.align(8).byte(8).signature("g").signature(signature);
  message.setLength(begin - 4, begin);
  return message.align(8).text() + body;
}

// A map of a text, a number, a date, an array and a map.
std::string mapBody() {
  Bytes body;
  body.number(0).align(8);
  const std::size_t begin = body.size();
  body.string("text").signature("s").string("Gr\xC3\xBC\xC3\x9F");
  body.align(8).string("number").signature("d").real(0.5);
  body.align(8).string("date").signature("(d)").real(1763634000.5);
  body.align(8).string("array").signature("ai").number(8).number(1).number(2);
  body.align(8).string("map").signature("a{sv}").align(4);
  const std::size_t length = body.size();
  body.number(0).align(8);
  const std::size_t inner = body.size();
  body.string("inner").signature("as").number(13).string("a").string("");
  body.setLength(length, inner);
  body.setLength(0, begin);
  return body.text();
}

// Reads what comes in at one end of a socket as the daemon does.
class ReadingEnd {
 public:
  ReadingEnd() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends.data()), 0);
    writing_.reset(ends[1]);
    sd_bus* bus = nullptr;
    EXPECT_GE(sd_bus_new(&bus), 0);
    bus_.reset(bus);
    EXPECT_GE(sd_bus_set_fd(bus, ends[0], ends[0]), 0);
    EXPECT_GE(sd_bus_set_server(bus, 1, sd_id128_t{}), 0);
    EXPECT_GE(sd_bus_set_anonymous(bus, 1), 0);
    EXPECT_GE(sd_bus_add_filter(bus, nullptr, take, this), 0);
    EXPECT_GE(sd_bus_start(bus), 0);
    using namespace std::string_literals;
    write("\0AUTH ANONYMOUS\r\nBEGIN\r\n"s);
    while (sd_bus_is_ready(bus) == 0 && sd_bus_process(bus, nullptr) >= 0) {
    }
    EXPECT_GT(sd_bus_is_ready(bus), 0);
  }

  // What came of a message; none when the library did not take it for one, which ends the connection.
  std::optional<DbusArguments> read(const std::string& message) {
    read_.reset();
    write(message);
    while (!read_ && sd_bus_process(bus_.get(), nullptr) > 0) {
    }
    return std::exchange(read_, std::nullopt);
  }

 private:
  void write(const std::string& bytes) const {
    EXPECT_EQ(::send(writing_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL),
              static_cast<ssize_t>(bytes.size()));
  }

  static int take(sd_bus_message* call, void* data, sd_bus_error*) {
    static const DbusInterface interface(rigInterface());
    auto& end = *static_cast<ReadingEnd*>(data);
    const DbusInterface::Entry& entry = *interface.find("TakeMap");
    end.read_ = readDbusArguments(call, entry, interface.methodOf(entry), end.texts_);
    return 1;
  }

  FileDescriptor writing_;
  RpcTexts texts_;
  std::optional<DbusArguments> read_;
  Bus bus_;
};

// Text is UTF-8, dates are numbers, nothing is deeper than it may be.
void expectSound(const Value& value, std::size_t depth) {
  ASSERT_LE(depth, kMostFrameDepth);
  const SharedString* text = value.asString();
  EXPECT_TRUE(text == nullptr || isUtf8(*text));
  const Date* date = value.asDate();
  EXPECT_TRUE(date == nullptr || std::isfinite(date->seconds));
  if (const ValueArray* array = value.asArray()) {
    for (const Value& element : *array) expectSound(element, depth + 1);
  }
  if (const ValueMap* map = value.asMap()) {
    for (const ValueMapEntry& entry : *map) {
      EXPECT_TRUE(isUtf8(entry.key));
      expectSound(entry.value, depth + 1);
    }
  }
}

TEST(DbusArgumentsTest, ReadsWhatTheTestWrites) {
  ReadingEnd end;
  const std::optional<DbusArguments> read = end.read(messageOf("a{sv}", mapBody()));
  ASSERT_TRUE(read);
  ASSERT_FALSE(read->problem) << read->problem->message;
  const ValueMap expected{{"text", "Gr\xC3\xBC\xC3\x9F"},
                          {"number", 0.5},
                          {"date", Date{1763634000.5}},
                          {"array", ValueArray{1, 2}},
                          {"map", ValueMap{{"inner", ValueArray{"a", ""}}}}};
  EXPECT_EQ(*read->arguments.at(0)->asMap(), expected) << read->arguments.at(0)->text();
}

TEST(DbusArgumentsTest, RefusesABodyThatIsNotWhatItsSignatureSays) {
  std::string body = mapBody();
  body[body.find("Gr\xC3")] = '\xFF';
  ReadingEnd end;
  const std::optional<DbusArguments> read = end.read(messageOf("a{sv}", body));
  ASSERT_TRUE(read && read->problem);
  EXPECT_EQ(*read->problem, messagingError(kInvalidArguments, "TakeMap: argument 1 (map) is malformed"));
}

TEST(DbusArgumentsTest, SurvivesWhateverABodyHolds) {
  constexpr int kMessages = 20'000;
  const std::string whole = mapBody();
  std::mt19937 random(1);  // the same every time
  const auto below = [&random](std::size_t most) { return static_cast<std::size_t>(random()) % most; };
  std::optional<ReadingEnd> end(std::in_place);
  int taken = 0;
  int refused = 0;
  for (int at = 0; at < kMessages; ++at) {
    std::string body = whole;
    for (std::size_t changes = 1 + below(3); changes > 0; --changes) {
      // Mostly letters that are types, and small lengths.
      constexpr std::string_view kBytes("ybnqiuxtdsogavh(){}\0\1\2\3\4\10\20\377", 27);
      body[below(body.size())] = kBytes[below(kBytes.size())];
    }
    if (below(8) == 0) body.resize(below(body.size()));
    const std::optional<DbusArguments> read = end->read(messageOf("a{sv}", body));
    if (!read) {
      end.emplace();
    } else if (read->problem) {
      ++refused;
      ASSERT_EQ(read->problem->domain, kMessagingErrorDomain);
      ASSERT_TRUE(read->problem->message.starts_with("TakeMap")) << read->problem->message;
    } else {
      ++taken;
      expectSound(*read->arguments.at(0), 3);
    }
  }
  EXPECT_GT(taken, 0);
  EXPECT_GT(refused, 0);
}

}  // namespace
}  // namespace tonewerk
