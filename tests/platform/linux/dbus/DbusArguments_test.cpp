// SPDX-License-Identifier: Apache-2.0
//
// Tests messages whose bodies do not match their signatures. The usual bus does not forward them, but another
// one might, so the tests write the bytes themselves.
#include "platform/linux/dbus/DbusArguments.h"

#include <array>
#include <bit>
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

#include "platform/linux/dbus/DbusBytes.h"
#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/dbus/SdBus.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

std::string messageOf(std::string_view signature, const std::string& body,
                      std::endian order = std::endian::little) {
  return dbusCallOf({"/a", "Call", "", ""}, signature, body, order, 1, false);
}

// A map of a text, a number, a date, an array and a map.
std::string mapBody(std::endian order = std::endian::little) {
  DbusBytes body(order);
  body.array(8, [](DbusBytes& map) {
    map.entry("text", "s").string("Gr\xC3\xBC\xC3\x9F");
    map.entry("number", "d").real(0.5);
    map.entry("date", "(d)").real(1763634000.5);
    map.entry("array", "ai").array(4, [](DbusBytes& array) { array.number32(1).number32(2); });
    map.entry("map", "a{sv}").array(8, [](DbusBytes& inner) {
      inner.entry("inner", "as").array(4, [](DbusBytes& array) { array.string("a").string(""); });
    });
  });
  return body.text();
}

// Reads messages from one end of a socket pair, as the daemon does.
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

  // The arguments of a message. None when the library does not accept it as a message, which ends the
  // connection.
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
  RpcStrings texts_;
  std::optional<DbusArguments> read_;
  Bus bus_;
};

// Expects that texts are UTF-8, dates are finite and nothing is nested too deep.
void expectSound(const Value& value, std::size_t depth) {
  ASSERT_LE(depth, kMaxFrameDepth);
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

class DbusArgumentsOrderTest : public testing::TestWithParam<std::endian> {};

TEST_P(DbusArgumentsOrderTest, ReadsAMapInEitherByteOrder) {
  ReadingEnd end;
  const std::optional<DbusArguments> read = end.read(messageOf("a{sv}", mapBody(GetParam()), GetParam()));
  ASSERT_TRUE(read);
  ASSERT_FALSE(read->problem) << read->problem->message;
  const ValueMap expected{{"text", "Gr\xC3\xBC\xC3\x9F"},
                          {"number", 0.5},
                          {"date", Date{1763634000.5}},
                          {"array", ValueArray{1, 2}},
                          {"map", ValueMap{{"inner", ValueArray{"a", ""}}}}};
  EXPECT_EQ(*read->arguments.at(0)->asMap(), expected) << read->arguments.at(0)->text();
}

INSTANTIATE_TEST_SUITE_P(All, DbusArgumentsOrderTest, testing::Values(std::endian::little, std::endian::big),
                         [](const auto& tested) {
                           return tested.param == std::endian::native ? "ThisMachines" : "TheOther";
                         });

// On D-Bus the library decides which bytes are text, on the socket isText().
TEST(DbusArgumentsTest, RefusesTheTextsThatTheSocketRefuses) {
  for (const char* text : {"\xFF", "\xED\xA0\x80", "\xEF\xBF\xBE", "\xEF\xBF\xBF", "\xEF\xB7\x90",
                           "\xEF\xB7\xAF", "\xF0\x9F\xBF\xBE", "\xF4\x8F\xBF\xBF"}) {
    DbusBytes body;
    body.array(8, [&](DbusBytes& map) { map.entry("text", "s").string(text); });
    const std::optional<DbusArguments> read = ReadingEnd().read(messageOf("a{sv}", body.text()));
    ASSERT_TRUE(read && read->problem) << text;
    EXPECT_EQ(*read->problem, messagingError(kInvalidArguments,
                                             "TakeMap: argument 1 (map) holds text that is not UTF-8 or has "
                                             "a noncharacter"));
    EXPECT_FALSE(isText(text));
  }
}

// The error once called these text that is not UTF-8, too.
TEST(DbusArgumentsTest, NamesAPathOrASignatureThatIsMalformed) {
  DbusBytes path;
  path.array(8, [](DbusBytes& map) { map.entry("path", "o").string("no/path"); });
  DbusBytes cutPath;
  cutPath.array(8, [](DbusBytes& map) { map.entry("path", "o").number32(1000); });
  DbusBytes signature;
  signature.array(8, [](DbusBytes& map) { map.entry("signature", "g").signature("(i"); });
  DbusBytes cutSignature;
  cutSignature.array(8, [](DbusBytes& map) { map.entry("signature", "g").byte(100); });
  const std::string argument = "TakeMap: argument 1 (map) ";
  for (const auto& [body, what] : {std::pair(path, "object path"),
                                   {cutPath, "object path"},
                                   {signature, "signature"},
                                   {cutSignature, "signature"}}) {
    const std::optional<DbusArguments> read = ReadingEnd().read(messageOf("a{sv}", body.text()));
    ASSERT_TRUE(read && read->problem) << what;
    EXPECT_EQ(*read->problem, messagingError(kInvalidArguments, argument + "holds a malformed " + what));
  }
}

TEST(DbusArgumentsTest, TakesTheNeighboursOfThoseTexts) {
  for (const char* text : {"\xEF\xBF\xBD", "\xEF\xB7\x8F", "\xEF\xB7\xB0", "\xF0\x9F\xBF\xBD",
                           "\xF0\x90\x80\x80", "\xEE\xBF\xBF"}) {
    DbusBytes body;
    body.array(8, [&](DbusBytes& map) { map.entry("text", "s").string(text); });
    const std::optional<DbusArguments> read = ReadingEnd().read(messageOf("a{sv}", body.text()));
    ASSERT_TRUE(read && !read->problem) << text;
    EXPECT_EQ(read->arguments.at(0)->asMap()->text("text"), text);
    EXPECT_TRUE(isText(text));
  }
}

TEST(DbusArgumentsTest, SurvivesRandomChangesToABody) {
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
      // Most of these bytes are type codes or small lengths.
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
