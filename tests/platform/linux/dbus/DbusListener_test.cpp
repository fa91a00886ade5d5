// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusListener.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <future>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/dbus/DbusCaller.h"
#include "platform/linux/dbus/DbusValues.h"
#include "platform/linux/dbus/ForeignDbusCaller.h"
#include "platform/linux/dbus/PrivateBus.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

const DbusNames kNames{"com.example.rig", "/com/example/rig", "com.example.Rig"};

class DbusListenerTest : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(bus.isRunning()) << "dbus-daemon does not run";
    startListener(bus.address());
    ASSERT_TRUE(waitForName());
  }

  void startListener(const std::string& address) {
    listener = std::make_unique<DbusListener>(kNames, rigInterface(), address, category, accounts);
    listener->setDelegate(delegate);
    listener->resume();
  }

  // Waits until a process has the name, or until none has it.
  [[nodiscard]] bool waitForName(bool isOwned = true) const {
    DbusCaller asker(bus.address(),
                     {"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus"});
    return waitFor(asker,
                   [&] { return asker.ask("NameHasOwner", "s", kNames.name.c_str()).boolean() == isOwned; });
  }
  // Polls `condition` at least every 10 ms.
  [[nodiscard]] static bool waitFor(DbusCaller& caller, const std::function<bool()>& condition) {
    const auto end = std::chrono::steady_clock::now() + kPatience;
    while (!condition()) {
      if (std::chrono::steady_clock::now() >= end) return false;
      sd_bus_wait(caller.bus(), 10'000);  // microseconds
    }
    return true;
  }

  [[nodiscard]] static bool isServed(DbusCaller& caller) {
    const DbusReceived answer = caller.ask("TakeInt64", "x", std::int64_t{1});
    return answer.error.empty() && answer.message != nullptr;
  }
  // Calls `member` with a map of one text of `size` characters.
  static DbusReceived askWithText(DbusCaller& caller, const char* member, std::size_t size) {
    const BusMessage call = caller.newCall(member);
    appendMap(call.get(), {{"text", std::string(size, 'x')}});
    return caller.ask(call);
  }
  [[nodiscard]] bool waitForLines(std::size_t count) const {
    const auto end = std::chrono::steady_clock::now() + kPatience;
    while (log.linesOf("twrs").size() < count) {
      if (std::chrono::steady_clock::now() >= end) return false;
      std::this_thread::yield();
    }
    return true;
  }
  std::vector<std::string> errorLines() const { return log.textsOf("twrs", LogLevel::kError); }

  PrivateBus bus;
  MemoryLog log;
  LogCategory category{log, "com.example", "twrs"};
  TestAccounts accounts;
  MessagingRecord record;
  RigDelegate delegate{record};
  std::unique_ptr<DbusListener> listener;
};

TEST_F(DbusListenerTest, TakesEveryKindOfValueThatAVariantMayHold) {
  DbusCaller caller(bus.address(), kNames);
  const DbusReceived answer = caller.ask(
      "TakeMap", "a{sv}", 19, "y", "y", 255, "n", "n", -32768, "q", "q", 65535, "i", "i", INT32_MIN, "u", "u",
      UINT32_MAX, "x", "x", INT64_MIN, "t", "t", std::uint64_t{7}, "T", "t", UINT64_MAX, "b", "b", 1, "d",
      "d", 0.25, "s", "s", "Gr\xC3\xBC\xC3\x9F", "o", "o", "/a/b", "g", "g", "a{sv}", "date", "(d)",
      1763634000.5, "ai", "ai", 2, 1, -2, "as", "as", 1, "one", "a{si}", "a{si}", 1, "inner", 3, "a{sv}",
      "a{sv}", 1, "inner", "av", 2, "s", "x", "d", 1.5, "none", "ax", 0);
  ASSERT_EQ(answer.error, "") << answer.text;
  ASSERT_THAT(record.requests(), SizeIs(1));
  const ValueMap expected{{"y", 255},
                          {"n", -32768},
                          {"q", 65535},
                          {"i", INT32_MIN},
                          {"u", std::int64_t{UINT32_MAX}},
                          {"x", INT64_MIN},
                          {"t", 7},
                          {"T", UINT64_MAX},
                          {"b", true},
                          {"d", 0.25},
                          {"s", "Gr\xC3\xBC\xC3\x9F"},
                          {"o", "/a/b"},
                          {"g", "a{sv}"},
                          {"date", Date{1763634000.5}},
                          {"ai", ValueArray{1, -2}},
                          {"as", ValueArray{"one"}},
                          {"a{si}", ValueMap{{"inner", 3}}},
                          {"a{sv}", ValueMap{{"inner", ValueArray{"x", 1.5}}}},
                          {"none", ValueArray{}}};
  const ValueMap taken = *record.requests()[0].arguments[0]->asMap();
  EXPECT_EQ(taken, expected) << taken.text();
  // An integer has the kind that the socket's reader gives it.
  EXPECT_EQ(taken.find("t")->kind(), Value::Kind::kInteger);
  EXPECT_EQ(taken.find("T")->kind(), Value::Kind::kUnsigned);
}

TEST_F(DbusListenerTest, TakesDoublesThatAreNotFinite) {
  DbusCaller caller(bus.address(), kNames);
  const DbusReceived answer =
      caller.ask("TakeMap", "a{sv}", 2, "nan", "d", std::numeric_limits<double>::quiet_NaN(), "infinite", "d",
                 std::numeric_limits<double>::infinity());
  ASSERT_EQ(answer.error, "") << answer.text;
  const ValueMap taken = *record.requests().at(0).arguments[0]->asMap();
  EXPECT_EQ(taken.text("nan"), "nan");
  EXPECT_EQ(taken.text("infinite"), "inf");
}

TEST_F(DbusListenerTest, TakesTheLastValueOfAKeyThatIsGivenTwice) {
  DbusCaller caller(bus.address(), kNames);
  ASSERT_EQ(caller.ask("TakeMap", "a{sv}", 2, "key", "i", 1, "key", "i", 2).error, "");
  EXPECT_EQ(*record.requests().at(0).arguments[0]->asMap(), (ValueMap{{"key", 2}}));
}

TEST_F(DbusListenerTest, TakesIntegersToTheirEndsAndAnEmptyListAsNone) {
  DbusCaller caller(bus.address(), kNames);
  caller.ask("TakeInt64", "x", INT64_MIN);
  caller.ask("TakeUInt32", "u", UINT32_MAX);
  caller.ask("TakeUInt16", "q", 65535);
  caller.ask("TakeList", "ax", 2, INT64_MAX, INT64_MIN);
  caller.ask("TakeList", "ax", 0);
  const std::vector<ReceivedRequest> requests = record.requests();
  ASSERT_THAT(requests, SizeIs(5));
  EXPECT_EQ(requests[0].arguments[0], Value(INT64_MIN));
  EXPECT_EQ(requests[1].arguments[0], Value(UINT32_MAX));
  EXPECT_EQ(requests[2].arguments[0], Value(65535));
  EXPECT_EQ(requests[3].arguments[0], Value(ValueArray{INT64_MAX, INT64_MIN}));
  EXPECT_EQ(requests[4].arguments[0], std::nullopt);
}

TEST_F(DbusListenerTest, TakesEmptyArraysAndMapsOfWhatAVariantMayHold) {
  DbusCaller caller(bus.address(), kNames);
  const DbusReceived answer =
      caller.ask("TakeMap", "a{sv}", 6, "bytes", "ay", 0, "dates", "a(d)", 0, "variants", "av", 0, "lists",
                 "aa{sad}", 0, "maps", "a{sa{sv}}", 0, "paths", "ao", 0);
  ASSERT_EQ(answer.error, "") << answer.text;
  EXPECT_EQ(*record.requests().at(0).arguments[0]->asMap(), (ValueMap{{"bytes", ValueArray()},
                                                                      {"dates", ValueArray()},
                                                                      {"variants", ValueArray()},
                                                                      {"lists", ValueArray()},
                                                                      {"maps", ValueMap()},
                                                                      {"paths", ValueArray()}}));
}

// The library cannot read arrays of the other byte order in one piece.
TEST_F(DbusListenerTest, TakesMessagesInTheOtherByteOrder) {
  ForeignDbusCaller caller(bus.address(), kNames);
  const auto body = [] { return ForeignDbusCaller::body(); };
  EXPECT_EQ(caller.ask("TakeList", "ax", body().array(8, [](DbusBytes&) {})).error, "");
  const auto list = [](DbusBytes& numbers) { numbers.number64(INT64_MIN).number64(77).number64(INT64_MAX); };
  EXPECT_EQ(caller.ask("TakeList", "ax", body().array(8, list)).error, "");
  EXPECT_EQ(caller.ask("TakeUInt32", "u", body().number32(0x01020304)).error, "");
  EXPECT_EQ(caller.ask("TakeUInt16", "q", body().number16(0x0102)).error, "");
  const auto map = [](DbusBytes& entries) {
    entries.entry("text", "s").string("Gr\xC3\xBC\xC3\x9F");
    entries.entry("date", "(d)").real(1763634000.5);
    entries.entry("numbers", "ad").array(8, [](DbusBytes& numbers) { numbers.real(0.5).real(-1e300); });
    entries.entry("integers", "aq").array(2, [](DbusBytes& numbers) { numbers.number16(1).number16(999); });
    entries.entry("inner", "a{sa{sax}}").array(8, [](DbusBytes& outer) {
      outer.align(8).string("one").array(8, [](DbusBytes& inner) {
        inner.align(8).string("two").array(8, [](DbusBytes& numbers) { numbers.number64(-3); });
      });
    });
  };
  EXPECT_EQ(caller.ask("TakeTwo", "a{sv}x", body().array(8, map).number64(-77)).error, "");

  const std::vector<ReceivedRequest> requests = record.requests();
  ASSERT_THAT(requests, SizeIs(5));
  EXPECT_EQ(requests[0].arguments[0], std::nullopt);
  EXPECT_EQ(requests[1].arguments[0], Value(ValueArray{INT64_MIN, 77, INT64_MAX}));
  EXPECT_EQ(requests[2].arguments[0], Value(0x01020304));
  EXPECT_EQ(requests[3].arguments[0], Value(0x0102));
  const ValueMap taken = *requests[4].arguments[0]->asMap();
  EXPECT_EQ(taken, (ValueMap{{"text", "Gr\xC3\xBC\xC3\x9F"},
                             {"date", Date{1763634000.5}},
                             {"numbers", ValueArray{0.5, -1e300}},
                             {"integers", ValueArray{1, 999}},
                             {"inner", ValueMap{{"one", ValueMap{{"two", ValueArray{-3}}}}}}}))
      << taken.text();
  EXPECT_EQ(requests[4].arguments[1], Value(-77));

  const ForeignDbusCaller::Answer answer = caller.ask("TakeInt64", "t", body().number64(1));
  EXPECT_EQ(answer.error, SD_BUS_ERROR_INVALID_ARGS);
  EXPECT_EQ(answer.text(), "TakeInt64: argument 1 (number) must be of the type x, not t");
}

struct WrongCall {
  const char* member;
  std::function<void(sd_bus_message*)> fill;
  const char* text;
};

template <typename... Body>
std::function<void(sd_bus_message*)> body(const char* types, Body... values) {
  return [=](sd_bus_message* call) { EXPECT_GE(sd_bus_message_append(call, types, values...), 0); };
}

TEST_F(DbusListenerTest, RefusesWrongArgumentsAndNamesThem) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const double infinity = std::numeric_limits<double>::infinity();
  const std::vector<WrongCall> calls = {
      {"TakeInt64", [](sd_bus_message*) {}, "TakeInt64 takes 1 arguments (x), not 0"},
      {"TakeTwo", body("a{sv}", 0), "TakeTwo takes 2 arguments (a{sv}x), not 1"},
      {"TakeInt64", body("xx", std::int64_t{1}, std::int64_t{2}),
       "TakeInt64 takes 1 arguments (x), not more"},
      {"TakeInt64", body("t", std::uint64_t{1}),
       "TakeInt64: argument 1 (number) must be of the type x, not t"},
      {"TakeInt64", body("v", "x", std::int64_t{1}),
       "TakeInt64: argument 1 (number) must be of the type x, not v"},
      {"TakeUInt16", body("u", 1), "TakeUInt16: argument 1 (number) must be of the type q, not u"},
      {"TakeUInt32", body("d", 1.0), "TakeUInt32: argument 1 (number) must be of the type u, not d"},
      {"TakeMap", body("a{ss}", 0), "TakeMap: argument 1 (map) must be of the type a{sv}, not a{ss}"},
      {"TakeMap", body("(d)", 1.0), "TakeMap: argument 1 (map) must be of the type a{sv}, not (d)"},
      {"TakeList", body("av", 0), "TakeList: argument 1 (list) must be of the type ax, not av"},
      {"TakeMap", body("a{sv}", 1, "a", "(dd)", 1.0, 2.0),
       "TakeMap: argument 1 (map) holds a struct other than a date"},
      {"TakeMap", body("a{sv}", 1, "a", "(s)", "x"),
       "TakeMap: argument 1 (map) holds a struct other than a date"},
      {"TakeMap", body("a{sv}", 1, "a", "(d)", nan), "TakeMap: argument 1 (map) holds a malformed date"},
      {"TakeMap", body("a{sv}", 1, "a", "(d)", infinity), "TakeMap: argument 1 (map) holds a malformed date"},
      {"TakeMap", body("a{sv}", 1, "a", "v", "i", 1),
       "TakeMap: argument 1 (map) holds a variant in a variant"},
      {"TakeMap", body("a{sv}", 1, "a", "a{iv}", 0), "TakeMap: argument 1 (map) has a key that is not text"},
      {"TakeMap", body("a{sv}", 1, "a", "a{ov}", 0), "TakeMap: argument 1 (map) has a key that is not text"},
      // Their types are refused although they are empty.
      {"TakeMap", body("a{sv}", 1, "a", "a(ss)", 0),
       "TakeMap: argument 1 (map) holds a struct other than a date"},
      {"TakeMap", body("a{sv}", 1, "a", "ah", 0), "TakeMap: argument 1 (map) holds a file descriptor"},
      {"TakeMap", body("a{sv}", 1, "a", "a{is}", 0), "TakeMap: argument 1 (map) has a key that is not text"},
      {"TakeMap", body("a{sv}", 1, "a", "a{sh}", 0), "TakeMap: argument 1 (map) holds a file descriptor"},
      {"TakeMap", body("a{sv}", 1, "a", "aaa(dd)", 0),
       "TakeMap: argument 1 (map) holds a struct other than a date"},
      {"TakeMap", body("a{sv}", 1, "a", "a{sa{ya(d)}}", 0),
       "TakeMap: argument 1 (map) has a key that is not text"},
      {"TakeMap", body("a{sv}", 1, "a", "av", 1, "a(s)", 0),
       "TakeMap: argument 1 (map) holds a struct other than a date"},
      {"TakeMap", body("a{sv}", 1, "a", "av", 1, "v", "i", 1),
       "TakeMap: argument 1 (map) holds a variant in a variant"},
      {"TakeTwo", body("a{sv}x", 1, "a", "a(ss)", 0, std::int64_t{1}),
       "TakeTwo: argument 1 (map) holds a struct other than a date"},
  };
  DbusCaller caller(bus.address(), kNames);
  for (const WrongCall& wrong : calls) {
    const BusMessage call = caller.newCall(wrong.member);
    wrong.fill(call.get());
    const DbusReceived answer = caller.ask(call);
    EXPECT_EQ(answer.error, SD_BUS_ERROR_INVALID_ARGS);
    EXPECT_EQ(answer.text, wrong.text);
  }
  EXPECT_THAT(record.requests(), IsEmpty());
  EXPECT_TRUE(isServed(caller));
}

// A call whose map holds `arrays` arrays nested inside each other.
BusMessage nestedCall(DbusCaller& caller, int arrays) {
  BusMessage call = caller.newCall("TakeMap");
  EXPECT_GE(sd_bus_message_open_container(call.get(), 'a', "{sv}"), 0);
  EXPECT_GE(sd_bus_message_open_container(call.get(), 'e', "sv"), 0);
  EXPECT_GE(sd_bus_message_append(call.get(), "s", "deep"), 0);
  for (int at = 0; at < arrays; ++at) {
    EXPECT_GE(sd_bus_message_open_container(call.get(), 'v', "av"), 0);
    EXPECT_GE(sd_bus_message_open_container(call.get(), 'a', "v"), 0);
  }
  for (int at = 0; at < 2 * arrays + 2; ++at) EXPECT_GE(sd_bus_message_close_container(call.get()), 0);
  return call;
}

TEST_F(DbusListenerTest, TakesValuesAsDeepAsTheSocketDoesAndNoDeeper) {
  DbusCaller caller(bus.address(), kNames);
  constexpr int kMaxArrays = 29;  // the map is as deep as a frame's third container, of 32
  EXPECT_EQ(caller.ask(nestedCall(caller, kMaxArrays)).error, "");
  const DbusReceived answer = caller.ask(nestedCall(caller, kMaxArrays + 1));
  EXPECT_EQ(answer.error, SD_BUS_ERROR_LIMITS_EXCEEDED) << answer.text;
  EXPECT_EQ(answer.text, "TakeMap: argument 1 (map) is nested deeper than 32");
  EXPECT_TRUE(isServed(caller));
}

TEST_F(DbusListenerTest, TakesMessagesOfAMegabyteAndNoLongerOnes) {
  constexpr std::size_t kMegabyte = std::size_t{1} << 20;
  DbusCaller caller(bus.address(), kNames);
  EXPECT_EQ(askWithText(caller, "TakeMap", kMegabyte - 64).error, "");
  const DbusReceived answer = askWithText(caller, "TakeMap", kMegabyte);
  EXPECT_EQ(answer.error, SD_BUS_ERROR_LIMITS_EXCEEDED);
  EXPECT_EQ(answer.text, "TakeMap: argument 1 (map) makes the message longer than 1048576 bytes");

  const std::vector<std::int64_t> numbers(kMegabyte / sizeof(std::int64_t) + 1);
  const BusMessage call = caller.newCall("TakeList");
  ASSERT_GE(
      sd_bus_message_append_array(call.get(), 'x', numbers.data(), numbers.size() * sizeof(std::int64_t)), 0);
  EXPECT_EQ(caller.ask(call).error, SD_BUS_ERROR_LIMITS_EXCEEDED);
  EXPECT_TRUE(isServed(caller));
}

// Otherwise a few thousand held calls with descriptors could use up the daemon's descriptors.
TEST_F(DbusListenerTest, TakesNoFileDescriptors) {
  DbusCaller caller(bus.address(), kNames);
  const DbusReceived answer = caller.ask("TakeMap", "a{sv}", 1, "a", "h", STDERR_FILENO);
  EXPECT_EQ(answer.error, SD_BUS_ERROR_NOT_SUPPORTED) << answer.text;
  EXPECT_THAT(record.requests(), IsEmpty());
  EXPECT_TRUE(isServed(caller));
}

TEST_F(DbusListenerTest, SendsLongAnswers) {
  const std::string text(900'000, 'x');
  DbusCaller caller(bus.address(), kNames);
  const BusMessage call = caller.newCall("Echo");
  appendMap(call.get(), {{"text", text}});
  const DbusReceived answer = caller.ask(call);
  ASSERT_EQ(answer.signature(), "v") << answer.text;
  EXPECT_EQ(readVariant(answer.message.get()), Value(ValueMap{{"text", text}}));
  EXPECT_TRUE(isServed(caller));
}

TEST_F(DbusListenerTest, MakesOneConnectionForEachUniqueNameAndReportsItsProcess) {
  DbusCaller first(bus.address(), kNames);
  DbusCaller second(bus.address(), kNames);
  ASSERT_TRUE(isServed(first));
  EXPECT_EQ(delegate.lastProcessIdentifier, ::getpid());
  EXPECT_EQ(delegate.lastUserIdentifier, ::getuid());
  ASSERT_TRUE(isServed(first));
  ASSERT_TRUE(isServed(second));
  EXPECT_THAT(record.events(), ElementsAre("accepted", "accepted"));
}

TEST_F(DbusListenerTest, EndsTheConnectionOfANameThatVanishesAndNoOther) {
  DbusCaller staying(bus.address(), kNames);
  DbusCaller leaving(bus.address(), kNames);
  ASSERT_TRUE(isServed(staying) && isServed(leaving));
  leaving.disconnect();
  ASSERT_TRUE(record.waitForEvents(5));
  EXPECT_THAT(record.events(),
              ElementsAre("accepted", "accepted", "interrupted", "invalidated", "object gone"));
  EXPECT_TRUE(isServed(staying));
}

// Some programs send a call and do not wait. They are gone before the bus is asked for their credentials.
TEST_F(DbusListenerTest, CarriesOutTheRequestsOfAClientThatIsGone) {
  DbusCaller caller(bus.address(), kNames);
  caller.sendWithoutAnswer(caller.newCall("TakeInt64", "x", std::int64_t{5}));
  caller.disconnect();
  ASSERT_TRUE(record.waitForEvents(4));
  EXPECT_THAT(record.requests(), SizeIs(1));
  EXPECT_THAT(record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
}

TEST_F(DbusListenerTest, AnswersACallOnlyOnce) {
  DbusCaller caller(bus.address(), kNames);
  caller.send(caller.newCall("AnswerTwice"));
  caller.send(caller.newCall("TakeInt64", "x", std::int64_t{1}));
  ASSERT_TRUE(caller.waitForReceived(2));
  EXPECT_EQ(readVariant(caller.received()[0].message.get()), Value(1));
  EXPECT_EQ(caller.received()[1].signature(), "");
  // A second answer would have come before this one.
  ASSERT_TRUE(isServed(caller));
  EXPECT_THAT(caller.received(), SizeIs(2));
  EXPECT_THAT(errorLines(), IsEmpty());
}

TEST_F(DbusListenerTest, RefusesUnknownMethodsAndObjectsWithStandardErrors) {
  DbusCaller caller(bus.address(), kNames);
  const auto errorOf = [&](const std::string& path, const char* interface, const char* member) {
    return caller.ask(caller.newCall(kNames.name, path, interface, member)).error;
  };
  EXPECT_EQ(errorOf(kNames.path, kNames.interface.c_str(), "NoSuchMethod"), SD_BUS_ERROR_UNKNOWN_METHOD);
  EXPECT_EQ(errorOf(kNames.path, kNames.interface.c_str(), "takeInt64"), SD_BUS_ERROR_UNKNOWN_METHOD);
  EXPECT_EQ(errorOf(kNames.path, kNames.interface.c_str(), "Watch"), SD_BUS_ERROR_UNKNOWN_METHOD);
  EXPECT_EQ(errorOf(kNames.path, "com.example.Other", "TakeInt64"), SD_BUS_ERROR_UNKNOWN_METHOD);
  EXPECT_EQ(errorOf("/com/example", kNames.interface.c_str(), "TakeInt64"), SD_BUS_ERROR_UNKNOWN_OBJECT);
  EXPECT_EQ(errorOf("/", kNames.interface.c_str(), "TakeInt64"), SD_BUS_ERROR_UNKNOWN_OBJECT);
  EXPECT_TRUE(isServed(caller));
}

TEST_F(DbusListenerTest, TakesCallsThatNameNoInterface) {
  DbusCaller caller(bus.address(), kNames);
  const BusMessage call = caller.newCall(kNames.name, kNames.path, nullptr, "TakeInt64");
  ASSERT_GE(sd_bus_message_append(call.get(), "x", std::int64_t{5}), 0);
  EXPECT_EQ(caller.ask(call).error, "");
  EXPECT_THAT(record.requests(), SizeIs(1));
  const DbusReceived answer = caller.ask(caller.newCall(kNames.name, kNames.path, nullptr, "NoSuchMethod"));
  EXPECT_EQ(answer.error, SD_BUS_ERROR_UNKNOWN_METHOD);
  EXPECT_TRUE(isServed(caller));
}

TEST_F(DbusListenerTest, RefusesARejectedClientWithoutAskingTheDelegateAgain) {
  delegate.rejectsClients = true;
  DbusCaller caller(bus.address(), kNames);
  for (int at = 0; at < 2; ++at) {
    EXPECT_EQ(caller.ask("TakeInt64", "x", std::int64_t{1}).error, SD_BUS_ERROR_ACCESS_DENIED);
  }
  EXPECT_THAT(record.events(), ElementsAre("turned away"));
}

TEST_F(DbusListenerTest, DescribesItsMethodsForIntrospection) {
  DbusCaller caller(bus.address(), kNames);
  const DbusReceived answer = caller.ask(
      caller.newCall(kNames.name, kNames.path, "org.freedesktop.DBus.Introspectable", "Introspect"));
  const char* text = "";
  ASSERT_GT(sd_bus_message_read(answer.message.get(), "s", &text), 0);
  EXPECT_THAT(text, HasSubstr(" <interface name=\"com.example.Rig\">\n"));
  EXPECT_THAT(text, HasSubstr("  <method name=\"TakeTwo\">\n"
                              "   <arg type=\"a{sv}\" name=\"map\" direction=\"in\"/>\n"
                              "   <arg type=\"x\" name=\"number\" direction=\"in\"/>\n"
                              "  </method>\n"));
  EXPECT_THAT(text, HasSubstr("  <method name=\"TakeList\">\n"
                              "   <arg type=\"ax\" name=\"list\" direction=\"in\"/>\n"
                              "  </method>\n"));
  EXPECT_THAT(text, HasSubstr("  <method name=\"Echo\">\n"
                              "   <arg type=\"a{sv}\" name=\"map\" direction=\"in\"/>\n"
                              "   <arg type=\"v\" name=\"answer\" direction=\"out\"/>\n"
                              "  </method>\n"));
  EXPECT_THAT(text, testing::Not(HasSubstr("Watch")));
}

TEST_F(DbusListenerTest, RefusesRequestsOfAClientPastTheBoundUntilSomeHaveFinished) {
  DbusCaller busy(bus.address(), kNames);
  DbusCaller other(bus.address(), kNames);
  for (std::size_t at = 0; at < kMaxUnfinishedRequests; ++at) {
    busy.send(busy.newCall("Hold", "x", static_cast<std::int64_t>(at)));
  }
  ASSERT_GE(sd_bus_flush(busy.bus()), 0);
  ASSERT_TRUE(record.waitForHeld(kMaxUnfinishedRequests));
  const DbusReceived answer = busy.ask("TakeInt64", "x", std::int64_t{1});
  EXPECT_EQ(answer.error, SD_BUS_ERROR_LIMITS_EXCEEDED);
  EXPECT_EQ(answer.text, "too many requests of this client are under way");
  EXPECT_TRUE(isServed(other));

  auto held = record.takeHeld();
  held.pop_back();  // one is enough
  EXPECT_TRUE(isServed(busy));
}

TEST_F(DbusListenerTest, DoesNotCountAHeldAnswerAsUnfinished) {
  DbusCaller caller(bus.address(), kNames);
  for (std::size_t at = 0; at <= kMaxUnfinishedRequests; ++at) {
    caller.send(caller.newCall("HoldReply", "x", static_cast<std::int64_t>(at)));
  }
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  ASSERT_TRUE(record.waitForHeld(kMaxUnfinishedRequests + 1));
  EXPECT_TRUE(isServed(caller));
  for (auto& [reply, token] : record.takeHeld()) reply(std::nullopt, Value(true));
  EXPECT_TRUE(caller.waitForReceived(kMaxUnfinishedRequests + 1));
}

TEST_F(DbusListenerTest, RefusesRequestsWhoseBytesWouldPassTheBound) {
  constexpr std::size_t kTextBytes = 900'000;  // each held as a message and as a value
  DbusCaller caller(bus.address(), kNames);
  for (std::size_t at = 0; at < 3; ++at) {
    const BusMessage call = caller.newCall("HoldMap");
    appendMap(call.get(), {{"text", std::string(kTextBytes, 'x')}});
    caller.send(call);
  }
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  ASSERT_TRUE(record.waitForHeld(3));
  EXPECT_EQ(caller.ask("TakeInt64", "x", std::int64_t{1}).error, SD_BUS_ERROR_LIMITS_EXCEEDED);
  record.takeHeld().clear();
  EXPECT_TRUE(isServed(caller));
}

TEST_F(DbusListenerTest, RefusesAClientBeyondItsUsersShareUntilAnotherHasGone) {
  const std::size_t kShare = accounts->totals().total(Resource::kBusConnections) / 2;
  std::vector<std::unique_ptr<DbusCaller>> callers;
  for (std::size_t at = 0; at < kShare; ++at) {
    callers.push_back(std::make_unique<DbusCaller>(bus.address(), kNames));
    ASSERT_TRUE(isServed(*callers.back()));
  }
  DbusCaller late(bus.address(), kNames);
  for (int time = 0; time < 2; ++time) {
    const DbusReceived answer = late.ask("TakeInt64", "x", std::int64_t{1});
    EXPECT_EQ(answer.error, SD_BUS_ERROR_LIMITS_EXCEEDED);
    EXPECT_EQ(answer.text, "the user has too many clients");
  }
  EXPECT_EQ(accounts->of(::geteuid())->held(Resource::kBusConnections), kShare);
  callers.pop_back();
  ASSERT_TRUE(record.waitForEvents(kShare + 2));
  EXPECT_TRUE(isServed(late));
}

TEST_F(DbusListenerTest, RefusesAClientBeyondTheBoundOfAllUsers) {
  // Other users hold all places but one.
  const auto other = accounts->of(::geteuid() + 1);
  const std::uint64_t most = accounts->totals().total(Resource::kBusConnections) - 1;
  other->charge(Resource::kBusConnections, most);
  DbusCaller first(bus.address(), kNames);
  EXPECT_TRUE(isServed(first));
  DbusCaller second(bus.address(), kNames);
  EXPECT_EQ(second.ask("TakeInt64", "x", std::int64_t{1}).error, SD_BUS_ERROR_LIMITS_EXCEEDED);
  other->give(Resource::kBusConnections, most);
  EXPECT_TRUE(isServed(second));
}

TEST_F(DbusListenerTest, AnswersFromManyThreadsAtOnce) {
  constexpr std::size_t kCalls = 400;
  constexpr std::size_t kThreads = 4;
  DbusCaller caller(bus.address(), kNames);
  for (std::size_t at = 0; at < kCalls; ++at) caller.send(caller.newCall("Hold", "x", std::int64_t{1}));
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  ASSERT_TRUE(record.waitForHeld(kCalls));
  auto held = record.takeHeld();
  std::vector<std::thread> threads;
  for (std::size_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&held, thread] {
      for (std::size_t at = thread; at < kCalls; at += kThreads) {
        // Half of them are answered, the others destroyed without an answer.
        if (at % 8 < kThreads) held[at].first(std::nullopt, Value(static_cast<std::int64_t>(at)));
        held[at] = {};
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_TRUE(caller.waitForReceived(kCalls / 2));
  EXPECT_TRUE(isServed(caller));
  EXPECT_THAT(caller.received(), SizeIs(kCalls / 2));
}

TEST_F(DbusListenerTest, EndsEveryConnectionWhenTheBusGoesAndServesAgainWhenItComesBack) {
  {
    DbusCaller caller(bus.address(), kNames);
    ASSERT_TRUE(isServed(caller));
    bus.stop();
    ASSERT_TRUE(record.waitForEvents(4));
    EXPECT_THAT(record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
  }
  bus.start();
  ASSERT_TRUE(waitForName());
  DbusCaller again(bus.address(), kNames);
  EXPECT_TRUE(isServed(again));
  EXPECT_THAT(errorLines(), ElementsAre(HasSubstr("D-Bus is gone: ")));
}

TEST_F(DbusListenerTest, DropsAnswersWhenTheBusIsGone) {
  DbusCaller caller(bus.address(), kNames);
  caller.send(caller.newCall("Hold", "x", std::int64_t{1}));
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  ASSERT_TRUE(record.waitForHeld(1));
  auto held = record.takeHeld();
  bus.stop();
  ASSERT_TRUE(record.waitForEvents(4));
  held[0].first(std::nullopt, Value(1));
  held.clear();
  listener->shutDown();
  EXPECT_THAT(record.events(), SizeIs(4));
}

TEST_F(DbusListenerTest, ShutsDownWhileTheBusDoesNotRead) {
  constexpr std::size_t kCalls = 1000;
  DbusCaller caller(bus.address(), kNames);
  for (std::size_t at = 0; at < kCalls; ++at) caller.send(caller.newCall("Hold", "x", std::int64_t{1}));
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  ASSERT_TRUE(record.waitForHeld(kCalls));
  bus.freeze();
  for (auto& [reply, token] : record.takeHeld()) reply(std::nullopt, Value(std::string(1000, 'x')));
  listener->shutDown();
  EXPECT_THAT(record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
}

// Starts a bus, but no listener.
class StartingDbusListenerTest : public DbusListenerTest {
 protected:
  void SetUp() override { ASSERT_TRUE(bus.isRunning()) << "dbus-daemon does not run"; }
};

TEST_F(StartingDbusListenerTest, LogsOnceThatThereIsNoBusAndServesWhenThereIsOne) {
  bus.stop();
  startListener(bus.address());
  ASSERT_TRUE(waitForLines(1));
  bus.start();
  ASSERT_TRUE(waitForName() && waitForLines(2));
  const std::vector<MemoryLog::Line> lines = log.linesOf("twrs");
  ASSERT_THAT(lines, SizeIs(2));
  EXPECT_EQ(lines[0].level, LogLevel::kInfo);
  EXPECT_THAT(lines[0].text(), HasSubstr("no D-Bus to serve on: "));
  EXPECT_EQ(lines[1].text(), "serving com.example.rig on D-Bus");
}

TEST_F(StartingDbusListenerTest, WaitsForANameThatAnotherProcessHas) {
  auto other = std::make_unique<DbusCaller>(bus.address(), kNames);
  ASSERT_GE(sd_bus_request_name(other->bus(), kNames.name.c_str(), 0), 0);
  startListener(bus.address());
  ASSERT_TRUE(waitForLines(1));
  EXPECT_THAT(errorLines(), ElementsAre("com.example.rig is taken by another on D-Bus; waiting for it"));
  other = nullptr;
  ASSERT_TRUE(waitForLines(2));
  DbusCaller caller(bus.address(), kNames);
  EXPECT_TRUE(isServed(caller));
}

TEST_F(StartingDbusListenerTest, DoesNothingForAMalformedAddress) {
  startListener("nonsense");
  ASSERT_TRUE(waitForLines(1));
  listener->shutDown();
  EXPECT_THAT(log.textsOf("twrs"), ElementsAre(HasSubstr("no D-Bus to serve on: ")));
}

TEST_F(StartingDbusListenerTest, LogsOnceThatTheBusDoesNotGiveItTheName) {
  PrivateBus strict("<policy context=\"mandatory\"><deny own=\"com.example.rig\"/></policy>");
  ASSERT_TRUE(strict.isRunning());
  startListener(strict.address());
  ASSERT_TRUE(waitForLines(1));
  listener->shutDown();
  EXPECT_THAT(errorLines(), ElementsAre(HasSubstr("D-Bus refuses com.example.rig: ")));
}

// Turns clients away, after waiting for `mayGoOn`.
class HangingDelegate final : public MessagingListenerDelegate {
 public:
  bool listenerShouldAcceptNewConnection(MessagingConnection& /*connection*/) override {
    asked.set_value();
    mayGoOn.get_future().wait();
    return false;
  }

  std::promise<void> asked;
  std::promise<void> mayGoOn;
};

TEST_F(DbusListenerTest, ItsHeartbeatRestsBetweenEventsAndStandsStillInAHandlerThatHangs) {
  listener->shutDown();
  ASSERT_TRUE(waitForName(false));
  HangingDelegate hanging;
  listener = std::make_unique<DbusListener>(kNames, rigInterface(), bus.address(), category, accounts);
  listener->setDelegate(hanging);
  listener->resume();
  ASSERT_TRUE(waitForName());
  const auto heartbeat = listener->heartbeat();
  while (heartbeat->read().isWorking) std::this_thread::yield();

  DbusCaller caller(bus.address(), kNames);
  caller.send(caller.newCall("TakeInt64", "x", std::int64_t{1}));
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  hanging.asked.get_future().wait();
  const std::uint64_t before = heartbeat->read().beats;
  EXPECT_TRUE(heartbeat->read().isWorking);
  caller.send(caller.newCall("TakeInt64", "x", std::int64_t{2}));
  ASSERT_GE(sd_bus_flush(caller.bus()), 0);
  EXPECT_EQ(heartbeat->read().beats, before);

  hanging.mayGoOn.set_value();
  while (heartbeat->read().isWorking) std::this_thread::yield();
  EXPECT_GT(heartbeat->read().beats, before);
  listener->shutDown();
}

TEST_F(DbusListenerTest, ItsHeartbeatRestsWithoutABus) {
  listener->shutDown();
  startListener("unix:path=/nowhere/bus");
  const auto heartbeat = listener->heartbeat();
  while (heartbeat->read().beats < 2 || heartbeat->read().isWorking) std::this_thread::yield();
  EXPECT_FALSE(heartbeat->read().isWorking);
}

}  // namespace
}  // namespace tonewerk
