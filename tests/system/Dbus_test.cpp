// SPDX-License-Identifier: Apache-2.0
//
// Tests the daemon with and without D-Bus.
#include <cctype>
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <unistd.h>

#include "platform/linux/dbus/DbusCaller.h"
#include "platform/linux/dbus/DbusValues.h"
#include "platform/linux/dbus/ForeignDbusCaller.h"
#include "platform/linux/dbus/PrivateBus.h"
#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAre;

const DbusNames kNames{"com.orvane.tonewerk.reporting", "/com/orvane/tonewerk/reporting",
                       "com.orvane.tonewerk.TWReportingServiceProtocol"};
constexpr std::int64_t kSession = 77;
constexpr int kLongFormAudio = 7;

class DbusTest : public DaemonTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(bus.isRunning()) << "dbus-daemon does not run";
    daemon.setEnvironment("DBUS_SESSION_BUS_ADDRESS", bus.address());
    ASSERT_TRUE(daemon.start());
    ASSERT_TRUE(waitForLogLine("serving com.orvane.tonewerk.reporting on D-Bus"));
  }

  DbusCaller newCaller() const { return DbusCaller(bus.address(), kNames); }
  // Creates the session, of long-form audio, without starting it.
  static void create(DbusCaller& caller) {
    EXPECT_TRUE(caller.ask("CreateReportingSession", "x", kSession).boolean());
    EXPECT_TRUE(caller.ask("SetServiceType", "qx", kLongFormAudio, kSession).boolean());
  }
  // Returns when the session is started. The start itself is answered later.
  static void start(DbusCaller& caller) {
    caller.send(caller.newCall("StartReportingSessionForID", "x", kSession));
    EXPECT_THAT(caller.ask("GetAllReporters").int64List(), Not(IsEmpty()));
  }

  PrivateBus bus;
};

TEST_F(DbusTest, EveryRequestIsAnswered) {
  DbusCaller caller = newCaller();
  create(caller);
  EXPECT_TRUE(caller.ask("SetConfiguration", "a{sv}x", 1, "HostApplicationDisplayID", "s", "player", kSession)
                  .boolean());
  start(caller);
  EXPECT_EQ(caller.ask("GetServiceNameForReporterID", "x", kSession).uint16(), kLongFormAudio);
  const DbusReceived sent = caller.ask("SendMessage", "a{sv}uqax", 1, "volume", "d", 0.5, 2, 5, 1, kSession);
  EXPECT_EQ(sent.error, "") << sent.text;
  EXPECT_EQ(sent.signature(), "");
  const DbusReceived validity = caller.ask("ReporterIDValid", "x", kSession);
  ASSERT_EQ(validity.signature(), "a{sv}") << validity.text;
  EXPECT_EQ(readMap(validity.message.get()),
            (ValueMap{{"reporterID", kSession}, {"serviceType", kLongFormAudio}}));
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), ElementsAre(kSession));
  EXPECT_TRUE(caller.ask("StopReportingSessionForID", "x", kSession).boolean());
  EXPECT_TRUE(caller.ask("DestroyReportingSession", "x", kSession).boolean());
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), IsEmpty());
}

TEST_F(DbusTest, EveryRequestMayComeInTheOtherByteOrder) {
  ForeignDbusCaller caller(bus.address(), kNames);
  const auto body = [] { return ForeignDbusCaller::body(); };
  const auto ofSession = [&](const char* member) {
    return caller.ask(member, "x", body().number64(kSession));
  };
  const auto done = [](const ForeignDbusCaller::Answer& answer) {
    return answer.error.empty() ? answer.number<std::uint32_t>() == 1
                                : (ADD_FAILURE() << answer.text(), false);
  };
  EXPECT_TRUE(done(ofSession("CreateReportingSession")));
  EXPECT_TRUE(done(caller.ask("SetServiceType", "qx", body().number16(kLongFormAudio).number64(kSession))));
  const auto name = [](DbusBytes& map) { map.entry("HostApplicationDisplayID", "s").string("player"); };
  EXPECT_TRUE(done(caller.ask("SetConfiguration", "a{sv}x", body().array(8, name).number64(kSession))));
  EXPECT_EQ(ofSession("GetServiceNameForReporterID").number<std::uint16_t>(), kLongFormAudio);
  EXPECT_EQ(ofSession("ReporterIDValid").signature, "a{sv}");
  EXPECT_EQ(caller.ask("GetAllReporters").body.size(), 16U);  // a padded length and an identifier
  caller.send("StartReportingSessionForID", "x", body().number64(kSession));

  const auto content = [](std::uint32_t place) {
    return [place](DbusBytes& map) {
      map.entry("place", "i").number32(place);
      map.entry("levels", "ad").array(8, [](DbusBytes& levels) { levels.real(0.5).real(-60); });
      map.entry("route", "a{sa{sv}}").array(8, [](DbusBytes& route) {
        route.align(8).string("port").array(8,
                                            [](DbusBytes& port) { port.entry("number", "x").number64(2); });
      });
    };
  };
  const auto nobody = [](DbusBytes&) {};
  const auto session = [](DbusBytes& identifiers) { identifiers.number64(kSession).number64(4711); };
  for (std::uint32_t place = 0; place < 2; ++place) {
    DbusBytes message = body();
    message.array(8, content(place)).number32(5).number16(5);
    place == 0 ? message.array(8, nobody) : message.array(8, session);
    const ForeignDbusCaller::Answer sent = caller.ask("SendMessage", "a{sv}uqax", message);
    EXPECT_EQ(sent.error, "") << sent.text();
  }
  EXPECT_TRUE(done(ofSession("StopReportingSessionForID")));
  EXPECT_TRUE(done(ofSession("DestroyReportingSession")));

  const RecordedEvents recorded(daemon.storePath());
  const char* event = "com.orvane.tonewerk.Output.Setup";
  ASSERT_TRUE(waitUntil([&] { return recorded.named(event).size() >= 2; }));
  const std::vector<nlohmann::json> events = recorded.named(event);
  ASSERT_THAT(events, SizeIs(2));
  for (std::uint32_t place = 0; place < 2; ++place) {
    EXPECT_EQ(events[place].at("place"), place);
    EXPECT_EQ(events[place].at("levels"), nlohmann::json::array({0.5, -60.0}));
    EXPECT_EQ(events[place].at("route").at("port").at("number"), 2);
  }
  const ForeignDbusCaller::Answer killed = caller.ask("KillService");
  EXPECT_EQ(killed.error, "org.freedesktop.DBus.Error.NoReply");
  EXPECT_EQ(daemon.process().wait(), 2);
}

TEST_F(DbusTest, AStartIsAnsweredAtTheStopBeforeTheStopItself) {
  DbusCaller caller = newCaller();
  create(caller);
  start(caller);
  EXPECT_THAT(caller.received(), IsEmpty());
  caller.send(caller.newCall("StopReportingSessionForID", "x", kSession));
  ASSERT_TRUE(caller.waitForReceived(2));
  std::uint64_t first = 0;
  std::uint64_t second = 0;
  ASSERT_GE(sd_bus_message_get_reply_cookie(caller.received()[0].message.get(), &first), 0);
  ASSERT_GE(sd_bus_message_get_reply_cookie(caller.received()[1].message.get(), &second), 0);
  EXPECT_LT(first, second);  // the start was sent first
  EXPECT_TRUE(caller.received()[0].boolean());
  EXPECT_TRUE(caller.received()[1].boolean());
}

TEST_F(DbusTest, ASecondStartIsNeverAnswered) {
  DbusCaller caller = newCaller();
  create(caller);
  start(caller);
  start(caller);
  caller.send(caller.newCall("StopReportingSessionForID", "x", kSession));
  ASSERT_TRUE(caller.waitForReceived(2));
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), ElementsAre(kSession));
  EXPECT_THAT(caller.received(), SizeIs(2));
}

TEST_F(DbusTest, TheServiceTypeOfSessionZeroIsAnsweredOnce) {
  DbusCaller caller = newCaller();
  caller.send(caller.newCall("GetServiceNameForReporterID", "x", std::int64_t{0}));
  ASSERT_TRUE(caller.waitForReceived(1));
  EXPECT_EQ(caller.received()[0].uint16(), 65'535);
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), IsEmpty());
  EXPECT_THAT(caller.received(), SizeIs(1));
  EXPECT_EQ(logLinesWith("cannot answer"), 0U);
}

TEST_F(DbusTest, SessionsAreTheSameOnBothWays) {
  DbusCaller caller = newCaller();
  DaemonClient client = connect();
  create(caller);
  client.create(78);
  EXPECT_EQ(client.serviceType(kSession), kLongFormAudio);
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), UnorderedElementsAre(kSession, 78));
}

TEST_F(DbusTest, TheSessionsOfANameThatVanishesStop) {
  DaemonClient client = connect();
  {
    DbusCaller caller = newCaller();
    create(caller);
    start(caller);
    caller.disconnect();
  }
  EXPECT_TRUE(waitForLogLine("stop called. reporterID=77"));
  EXPECT_TRUE(waitUntil([&] { return client.allReporters().empty(); }));
  const char* uptime = "com.orvane.tonewerk.twreportingclientuptime";
  const auto recorded = [&] { return RecordedEvents(daemon.storePath()).named(uptime); };
  ASSERT_TRUE(waitUntil([&] { return !recorded().empty(); }));
  EXPECT_TRUE(recorded().at(0).at("processName").is_string());
  EXPECT_GE(recorded().at(0).at("seconds").get<double>(), 0.0);
}

TEST_F(DbusTest, WrongCallsAreRefusedAndChangeNothing) {
  DbusCaller caller = newCaller();
  const DbusReceived wrongType = caller.ask("CreateReportingSession", "s", "77");
  EXPECT_EQ(wrongType.error, SD_BUS_ERROR_INVALID_ARGS);
  EXPECT_EQ(wrongType.text, "CreateReportingSession: argument 1 (reporterID) must be of the type x, not s");
  const DbusReceived wrongValue = caller.ask("SendMessage", "a{sv}uqax", 1, "a", "(ii)", 1, 2, 2, 5, 0);
  EXPECT_EQ(wrongValue.error, SD_BUS_ERROR_INVALID_ARGS);
  EXPECT_EQ(wrongValue.text, "SendMessage: argument 1 (message) holds a struct other than a date");
  EXPECT_EQ(caller.ask("Nonsense").error, SD_BUS_ERROR_UNKNOWN_METHOD);
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), IsEmpty());
}

TEST_F(DbusTest, OneSessionTooManyIsOverTheLimit) {
  constexpr std::int64_t kMaxSessions = 4096;
  DbusCaller caller = newCaller();
  for (std::int64_t at = 1; at < kMaxSessions; ++at) {
    caller.sendWithoutAnswer(caller.newCall("CreateReportingSession", "x", at));
    // No more pending requests than the limit.
    if (at % 256 != 0) continue;
    EXPECT_THAT(caller.ask("GetAllReporters").int64List(), SizeIs(static_cast<std::size_t>(at)));
  }
  EXPECT_TRUE(caller.ask("CreateReportingSession", "x", kMaxSessions).boolean());
  const DbusReceived refused = caller.ask("CreateReportingSession", "x", kMaxSessions + 1);
  EXPECT_EQ(refused.error, SD_BUS_ERROR_LIMITS_EXCEEDED);
  EXPECT_EQ(refused.text, "the connection holds 4096 sessions, the most there may be");
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), SizeIs(4096));
}

TEST_F(DbusTest, EveryMethodIsDescribedAndNoneForTheOwnerAlone) {
  DbusCaller caller = newCaller();
  const DbusReceived answer = caller.ask(
      caller.newCall(kNames.name, kNames.path, "org.freedesktop.DBus.Introspectable", "Introspect"));
  const char* text = "";
  ASSERT_GT(sd_bus_message_read(answer.message.get(), "s", &text), 0) << answer.text;
  const std::string description(text);
  const auto begin =
      description.find(" <interface name=\"com.orvane.tonewerk.TWReportingServiceProtocol\">\n");
  ASSERT_NE(begin, std::string::npos) << description;
  const auto in = [](const char* type, const char* name) {
    return std::string("   <arg type=\"") + type + "\" name=\"" + name + "\" direction=\"in\"/>\n";
  };
  const auto out = [](const char* type, const char* name) {
    return std::string("   <arg type=\"") + type + "\" name=\"" + name + "\" direction=\"out\"/>\n";
  };
  const auto method = [](const char* name, const std::string& parts) {
    return std::string("  <method name=\"") + name + "\">\n" + parts + "  </method>\n";
  };
  const std::string session = in("x", "reporterID");
  const std::string success = out("b", "success");
  const std::string expected =
      method("CreateReportingSession", session + success) +
      method("SetServiceType", in("q", "serviceType") + session + success) +
      method("GetServiceNameForReporterID", session + out("q", "serviceType")) +
      method("SetConfiguration", in("a{sv}", "configuration") + session + success) +
      method("StartReportingSessionForID", session + success) +
      method("SendMessage",
             in("a{sv}", "message") + in("u", "category") + in("q", "type") + in("ax", "reporterIDs")) +
      method("StopReportingSessionForID", session + success) +
      method("DestroyReportingSession", session + success) +
      method("ReporterIDValid", session + out("a{sv}", "validity")) +
      method("GetAllReporters", out("ax", "reporterIDs")) +
      method("KillService",
             "   <annotation name=\"org.freedesktop.DBus.Method.NoReply\" value=\"true\"/>\n") +
      method("Observe", success);
  const auto first = description.find('\n', begin) + 1;
  EXPECT_EQ(description.substr(first, description.find(" </interface>", first) - first), expected);
}

TEST_F(DbusTest, TheKillRequestEndsTheDaemonUnanswered) {
  DbusCaller caller = newCaller();
  const DbusReceived answer = caller.ask("KillService");
  EXPECT_EQ(answer.error, SD_BUS_ERROR_NO_REPLY);  // sent by the bus, because the daemon is gone
  EXPECT_EQ(daemon.process().wait(), 2);
  EXPECT_EQ(logLinesWith("DESTROYING SERVICE"), 1U);
}

TEST_F(DbusTest, AnEndInOrderStopsTheSessionsOfTheBus) {
  DbusCaller caller = newCaller();
  create(caller);
  start(caller);
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_EQ(logLinesWith("stop called. reporterID=77"), 1U);
}

TEST_F(DbusTest, TheSocketIsServedWhenTheBusGoesAndTheBusWhenItComesBack) {
  DaemonClient client = connect();
  DbusCaller leaving = newCaller();
  create(leaving);
  bus.stop();
  EXPECT_TRUE(waitForLogLine("D-Bus is gone: "));
  EXPECT_TRUE(waitUntil([&] { return client.allReporters().empty(); }));
  client.create(78);
  bus.start();
  EXPECT_TRUE(waitUntil([&] { return logLinesWith("serving com.orvane.tonewerk.reporting on D-Bus") == 2; }));
  DbusCaller caller = newCaller();
  EXPECT_THAT(caller.ask("GetAllReporters").int64List(), ElementsAre(78));
}

class SystemDbusTest : public DaemonTest {};

TEST_F(SystemDbusTest, WithoutASessionsBusTheSystemsIsServed) {
  const PrivateBus system;
  daemon.setEnvironment("DBUS_SYSTEM_BUS_ADDRESS", system.address());
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(waitForLogLine("serving com.orvane.tonewerk.reporting on D-Bus"));
  DbusCaller caller(system.address(), kNames);
  EXPECT_TRUE(caller.ask("CreateReportingSession", "x", kSession).boolean());
}

class NoDbusTest : public RunningDaemonTest {};

TEST_F(NoDbusTest, TheLackOfABusIsSaidOnceAndHarmsNothing) {
  ASSERT_TRUE(waitForLogLine("no D-Bus to serve on: "));
  DaemonClient client = connect();
  client.create(kSession);
  EXPECT_THAT(client.allReporters(), ElementsAre(kSession));
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_EQ(logLinesWith("D-Bus"), 1U);
  EXPECT_EQ(logLinesWith("D-Bus", " info "), 1U);
}

// Paths of the files that are installed for buses.

std::string packaged(const std::string& name) { return std::string(TONEWERK_DBUS_FILES) + "/" + name; }

std::string replaced(std::string text, const std::string& what, const std::string& with) {
  const auto at = text.find(what);
  EXPECT_NE(at, std::string::npos) << what;
  return at == std::string::npos ? text : text.replace(at, what.size(), with);
}

class DbusActivationTest : public DaemonTest {};

// The bus starts the daemon at the first call and passes it an environment.
TEST_F(DbusActivationTest, ABusStartsTheDaemonWhichOpensItsSocketToo) {
  const TemporaryDirectory services;
  const std::string file = replaced(textOfFile(packaged("session/com.orvane.tonewerk.reporting.service")),
                                    "/usr/bin/twreportingd", services.path("start"));
  std::ofstream(services.path("com.orvane.tonewerk.reporting.service")) << file;
  std::ofstream start(services.path("start"));
  start << "#!/bin/sh\nexport TONEWERK_LOG=info DBUS_SYSTEM_BUS_ADDRESS=unix:path=/nonexistent/bus";
  for (const char* directory : {DaemonProcess::kRuntime, DaemonProcess::kState, DaemonProcess::kLogs,
                                DaemonProcess::kConfiguration}) {
    std::string variable = directory;
    for (char& letter : variable) letter = static_cast<char>(std::toupper(letter));
    start << ' ' << variable << "_DIRECTORY='" << daemon.path(directory) << "'";
  }
  start << "\nexec '" << TONEWERK_DAEMON_PATH << "' 2>>'" << services.path("log") << "'\n" << std::flush;
  start.close();
  std::filesystem::permissions(services.path("start"), std::filesystem::perms::owner_all);

  PrivateBus bus("<servicedir>" + services.path() + "</servicedir>");
  DbusCaller caller(bus.address(), kNames);
  EXPECT_TRUE(caller.ask("CreateReportingSession", "x", kSession).boolean());
  {
    DaemonClient client = connect();
    EXPECT_THAT(client.allReporters(), ElementsAre(kSession));
  }
  EXPECT_EQ(caller.ask("KillService").error, SD_BUS_ERROR_NO_REPLY);
  EXPECT_TRUE(waitUntil([&] { return !daemon.accepts(); }));
  expectNoSanitizerReport(textOfFile(services.path("log")));
}

TEST(DbusFilesTest, TheSystemsBusStartsTheUnitAndNothingElse) {
  const std::string file = textOfFile(packaged("system/com.orvane.tonewerk.reporting.service"));
  EXPECT_THAT(file, HasSubstr("\n[D-BUS Service]\nName=com.orvane.tonewerk.reporting\n"));
  EXPECT_THAT(file, HasSubstr("\nUser=tonewerk\n"));
  EXPECT_THAT(file, HasSubstr("\nSystemdService=twreportingd.service\n"));
}

// Runs a bus that allows nothing by default, as a system bus does, with the installed policy. The user of
// this process takes the place of the user `tonewerk`, which need not exist here.
class DbusPolicyTest : public ::testing::Test {
 protected:
  static std::string elements(const std::string& directory, const std::string& user) {
    std::string policy = textOfFile(packaged("com.orvane.tonewerk.reporting.conf"));
    policy = replaced(policy, "user=\"root\"", "user=\"bin\"");
    policy = replaced(policy, "user=\"tonewerk\"", "user=\"" + user + "\"");
    policy = replaced(policy, "group=\"audio\"", "group=\"bin\"");
    std::ofstream(directory + "/policy.conf") << policy << std::flush;
    return "<policy context=\"default\"><deny own=\"*\"/><deny send_type=\"method_call\"/>"
           "<allow send_destination=\"org.freedesktop.DBus\"/></policy><include>" +
           directory + "/policy.conf</include>";
  }
  static std::string ownUser() { return std::to_string(::getuid()); }

  const TemporaryDirectory directory;
};

TEST_F(DbusPolicyTest, TheServicesUserMayHaveTheNameAndCallIt) {
  const PrivateBus bus(elements(directory.path(), ownUser()));
  ASSERT_TRUE(bus.isRunning());
  DbusCaller owner(bus.address(), kNames);
  EXPECT_GE(sd_bus_request_name(owner.bus(), kNames.name.c_str(), 0), 0);
  EXPECT_EQ(sd_bus_request_name(owner.bus(), "com.orvane.tonewerk.other", 0), -EACCES);

  DbusCaller caller(bus.address(), kNames);
  caller.send(caller.newCall("GetAllReporters"));
  EXPECT_TRUE(waitUntil([&] {
    sd_bus_process(owner.bus(), nullptr);
    sd_bus_process(caller.bus(), nullptr);
    return !caller.received().empty();
  }));
  // The call arrived: this test's owner of the name has no such object.
  EXPECT_EQ(caller.received().at(0).error, SD_BUS_ERROR_UNKNOWN_OBJECT);
}

TEST_F(DbusPolicyTest, OthersMayNotHaveTheName) {
  const PrivateBus bus(elements(directory.path(), "daemon"));
  ASSERT_TRUE(bus.isRunning());
  DbusCaller other(bus.address(), kNames);
  EXPECT_EQ(sd_bus_request_name(other.bus(), kNames.name.c_str(), 0), -EACCES);
}

}  // namespace
}  // namespace tonewerk
