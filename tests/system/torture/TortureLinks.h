// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cctype>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "platform/linux/dbus/DbusCaller.h"
#include "support/OtherUser.h"
#include "support/client/ReportingClient.h"
#include "system/support/ChildProcess.h"
#include "values/Value.h"

namespace tonewerk {

// A client's way to a daemon that may be killed at any time. One thread. Every request that the daemon
// refuses is a test failure; one that it does not answer is none.
class TortureLink {
 public:
  virtual ~TortureLink() = default;

  // Connects, and ends the earlier connection. False when no daemon is there.
  [[nodiscard]] virtual bool connect() = 0;
  // Sends a request. `answered` is called before waitForAll() returns, if the daemon answers.
  virtual void request(std::string_view method, const Arguments& arguments,
                       std::function<void()> answered) = 0;
  // Sends a request that nobody waits for.
  virtual void notify(std::string_view method, const Arguments& arguments) = 0;
  // Waits until all requests are answered. False when the daemon is gone before.
  [[nodiscard]] virtual bool waitForAll() = 0;

  [[nodiscard]] bool ask(std::string_view method, const Arguments& arguments) {
    bool isAnswered = false;
    request(method, arguments, [&isAnswered] { isAnswered = true; });
    return waitForAll() && isAnswered;
  }

 protected:
  // Runs `work` as `user`, who may be the own one.
  static void runAs(std::uint32_t user, const std::function<void()>& work) {
    user == ::geteuid() ? work() : runAsUser(user, work);
  }
};

// The daemon's own socket.
class SocketLink final : public TortureLink {
 public:
  SocketLink(std::string socketPath, std::uint32_t user) : socketPath_(std::move(socketPath)), user_(user) {}

  [[nodiscard]] bool connect() override {
    waiting_ = 0;
    bool isConnected = false;
    // The kernel tells the daemon the user that the connecting thread has at that time.
    runAs(user_, [&] { isConnected = !client_.connect({socketPath_}); });
    return isConnected;
  }
  void request(std::string_view method, const Arguments& arguments, std::function<void()> answered) override {
    ++waiting_;
    // What fails shows in waitForAll().
    (void)client_.request(
        method, arguments,
        [this, name = std::string(method), answered = std::move(answered)](const Answer& answer) {
          --waiting_;
          EXPECT_FALSE(answer.error) << name << " is refused: " << answer.error->message;
          answered();
        });
  }
  void notify(std::string_view method, const Arguments& arguments) override {
    (void)client_.notify(method, arguments);
  }
  [[nodiscard]] bool waitForAll() override {
    while (waiting_ > 0) {
      const std::error_code error = client_.processAnswers(kSystemTimeout);
      EXPECT_NE(error, std::errc::timed_out) << "no answer in time";
      if (error) return false;
    }
    return client_.isConnected();
  }

 private:
  const std::string socketPath_;
  const std::uint32_t user_;
  ReportingClient client_;
  std::size_t waiting_ = 0;
};

// D-Bus. A bus lets in only users of the system's user database.
class BusLink final : public TortureLink {
 public:
  BusLink(std::string address, std::uint32_t user) : address_(std::move(address)), user_(user) {}

  [[nodiscard]] bool connect() override {
    isThere_ = true;
    // The first call is made on the same thread, because only then the bus has accepted the caller.
    runAs(user_, [&] {
      caller_ = std::make_unique<DbusCaller>(address_, names());
      caller_->uniqueName();
    });
    return ask("getAllReporters", {});
  }
  void request(std::string_view method, const Arguments& arguments, std::function<void()> answered) override {
    if (!isThere_) return;
    const DbusReceived received = caller_->ask(callOf(method, arguments));
    if (received.error.empty()) return answered();
    isThere_ = false;
    EXPECT_TRUE(received.error.starts_with("org.freedesktop.DBus.Error."))
        << method << " is refused: " << received.text;
  }
  void notify(std::string_view method, const Arguments& arguments) override {
    if (isThere_) caller_->sendWithoutAnswer(callOf(method, arguments));
  }
  [[nodiscard]] bool waitForAll() override { return isThere_; }

 private:
  static DbusNames names() {
    return {"com.orvane.tonewerk.reporting", "/com/orvane/tonewerk/reporting",
            "com.orvane.tonewerk.TWReportingServiceProtocol"};
  }

  BusMessage callOf(std::string_view method, const Arguments& arguments) {
    std::string member(method);
    member[0] = static_cast<char>(std::toupper(static_cast<unsigned char>(member[0])));
    BusMessage call = caller_->newCall(member.c_str());
    const bool hasServiceFirst = method == "setServiceType";
    for (std::size_t at = 0; at < arguments.size(); ++at) {
      const Argument& argument = arguments[at];
      if (!argument || argument->asArray() != nullptr) {
        appendList(call.get(), argument);
      } else if (argument->asMap() != nullptr) {
        appendMap(call.get(), *argument->asMap());
      } else if (method == "sendMessage" && at == 1) {
        sd_bus_message_append(call.get(), "u", static_cast<std::uint32_t>(argument->integer()));
      } else if (method == "sendMessage" || (hasServiceFirst && at == 0)) {
        sd_bus_message_append(call.get(), "q", static_cast<std::uint16_t>(argument->integer()));
      } else {
        sd_bus_message_append(call.get(), "x", argument->integer());
      }
    }
    return call;
  }
  static void appendList(sd_bus_message* call, const Argument& list) {
    sd_bus_message_open_container(call, 'a', "x");
    if (list) {
      for (const Value& value : *list->asArray()) sd_bus_message_append(call, "x", value.integer());
    }
    sd_bus_message_close_container(call);
  }
  static void appendMap(sd_bus_message* call, const ValueMap& map) {
    sd_bus_message_open_container(call, 'a', "{sv}");
    for (const ValueMap::Entry& entry : map) {
      const std::string key(entry.key.string());
      if (entry.value.asBoolean() != nullptr) {
        sd_bus_message_append(call, "{sv}", key.c_str(), "b", static_cast<int>(*entry.value.asBoolean()));
      } else if (entry.value.asDouble() != nullptr) {
        sd_bus_message_append(call, "{sv}", key.c_str(), "d", *entry.value.asDouble());
      } else if (entry.value.asInteger() != nullptr) {
        sd_bus_message_append(call, "{sv}", key.c_str(), "x", *entry.value.asInteger());
      } else {
        sd_bus_message_append(call, "{sv}", key.c_str(), "s", entry.value.text().c_str());
      }
    }
    sd_bus_message_close_container(call);
  }

  const std::string address_;
  const std::uint32_t user_;
  std::unique_ptr<DbusCaller> caller_;
  bool isThere_ = false;
};

}  // namespace tonewerk
