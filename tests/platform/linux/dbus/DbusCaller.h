// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <systemd/sd-bus.h>
#include <utility>
#include <vector>

#include "platform/linux/dbus/DbusService.h"
#include "platform/linux/dbus/SdBus.h"
#include "values/Value.h"

namespace tonewerk {

// The answer to a call.
struct DbusReceived {
  std::string error;  // its name; empty without
  std::string text;   // the error's message
  BusMessage message;

  std::string signature() const {
    return message == nullptr ? "" : sd_bus_message_get_signature(message.get(), 1);
  }
  // Read the first value of the message.
  bool boolean() const {
    int value = 0;
    EXPECT_GT(sd_bus_message_read(message.get(), "b", &value), 0) << error << ": " << text;
    return value != 0;
  }
  std::uint16_t uint16() const {
    std::uint16_t value = 0;
    EXPECT_GT(sd_bus_message_read(message.get(), "q", &value), 0) << error << ": " << text;
    return value;
  }
  std::vector<std::int64_t> int64List() const {
    std::vector<std::int64_t> values;
    EXPECT_GT(sd_bus_message_enter_container(message.get(), 'a', "x"), 0) << error << ": " << text;
    for (std::int64_t value = 0; sd_bus_message_read(message.get(), "x", &value) > 0;)
      values.push_back(value);
    return values;
  }
};

// Calls the service as another process on the bus would. Works on the test's own thread.
class DbusCaller {
 public:
  static constexpr std::chrono::microseconds kTimeout = std::chrono::seconds(30);

  DbusCaller(const std::string& address, DbusNames names) : names_(std::move(names)) {
    sd_bus* bus = nullptr;
    EXPECT_GE(sd_bus_new(&bus), 0);
    bus_.reset(bus);
    EXPECT_GE(sd_bus_set_address(bus, address.c_str()), 0);
    EXPECT_GE(sd_bus_set_bus_client(bus, 1), 0);
    EXPECT_GE(sd_bus_start(bus), 0);
  }

  sd_bus* bus() { return bus_.get(); }
  std::string uniqueName() {
    const char* name = nullptr;
    EXPECT_GE(sd_bus_get_unique_name(bus_.get(), &name), 0);
    return name == nullptr ? "" : name;
  }

  BusMessage newCall(const char* member) {
    return newCall(names_.name, names_.path, names_.interface.c_str(), member);
  }
  BusMessage newCall(const std::string& name, const std::string& path, const char* interface,
                     const char* member) {
    sd_bus_message* made = nullptr;
    EXPECT_GE(
        sd_bus_message_new_method_call(bus_.get(), &made, name.c_str(), path.c_str(), interface, member), 0);
    return BusMessage(made);
  }
  // `types` and `body` are as in sd_bus_message_append().
  template <typename... Body>
  BusMessage newCall(const char* member, const char* types, Body... body) {
    BusMessage call = newCall(member);
    EXPECT_GE(sd_bus_message_append(call.get(), types, body...), 0) << member;
    return call;
  }

  DbusReceived ask(const BusMessage& call) {
    sd_bus_error error{};
    sd_bus_message* answer = nullptr;
    sd_bus_call(bus_.get(), call.get(), static_cast<std::uint64_t>(kTimeout.count()), &error, &answer);
    DbusReceived received{error.name == nullptr ? "" : error.name,
                          error.message == nullptr ? "" : error.message, BusMessage(answer)};
    sd_bus_error_free(&error);
    return received;
  }
  template <typename... Body>
  DbusReceived ask(const char* member, const char* types, Body... body) {
    return ask(newCall(member, types, body...));
  }
  DbusReceived ask(const char* member) { return ask(newCall(member)); }

  // Does not wait. The answer goes to received().
  void send(const BusMessage& call) {
    EXPECT_GE(sd_bus_call_async(bus_.get(), nullptr, call.get(), receive, this,
                                static_cast<std::uint64_t>(kTimeout.count())),
              0);
  }
  void sendWithoutAnswer(const BusMessage& call) {
    EXPECT_GE(sd_bus_message_set_expect_reply(call.get(), 0), 0);
    EXPECT_GE(sd_bus_send(bus_.get(), call.get(), nullptr), 0);
  }

  const std::vector<DbusReceived>& received() const { return received_; }
  // Counts the answers that are already there.
  [[nodiscard]] bool waitForReceived(std::size_t count) {
    const auto end = std::chrono::steady_clock::now() + kTimeout;
    while (received_.size() < count && std::chrono::steady_clock::now() < end) {
      const int result = sd_bus_process(bus_.get(), nullptr);
      if (result < 0) return false;
      if (result == 0) sd_bus_wait(bus_.get(), 100'000);  // microseconds
    }
    return received_.size() >= count;
  }

  // Sends what is still unsent first.
  void disconnect() {
    if (bus_ == nullptr) return;
    sd_bus_flush(bus_.get());
    bus_ = nullptr;
  }

 private:
  static int receive(sd_bus_message* answer, void* caller, sd_bus_error*) {
    const sd_bus_error* error = sd_bus_message_get_error(answer);
    static_cast<DbusCaller*>(caller)->received_.push_back(
        {error == nullptr ? "" : error->name,
         error == nullptr || error->message == nullptr ? "" : error->message,
         BusMessage(sd_bus_message_ref(answer))});
    return 0;
  }

  const DbusNames names_;
  std::vector<DbusReceived> received_;
  Bus bus_;
};

}  // namespace tonewerk
