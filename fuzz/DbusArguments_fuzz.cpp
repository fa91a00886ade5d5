// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a call on the bus: a method, the byte order, a signature with its length, and the body.
// The D-Bus library gets the bytes through a socket, as from a bus. Arguments that are accepted are those
// that the request allows, and can be sent back.
#include <array>
#include <bit>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <systemd/sd-bus.h>

#include "FuzzInput.h"
#include "platform/linux/dbus/DbusAnswer.h"
#include "platform/linux/dbus/DbusArguments.h"
#include "platform/linux/dbus/DbusBytes.h"
#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/dbus/SdBus.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "protocol/Requests.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// One for each list of parameter types.
constexpr std::array kMembers = {"CreateReportingSession", "SetServiceType", "SetConfiguration",
                                 "SendMessage", "GetAllReporters"};

void expectSound(const Value& value, std::size_t depth) {
  expect(depth <= kMaxFrameDepth + 1);  // a plain value in the deepest array is one deeper
  if (const SharedString* text = value.asString()) expect(isUtf8(*text));
  if (const Date* date = value.asDate()) expect(std::isfinite(date->seconds));
  if (const ValueArray* array = value.asArray()) {
    for (const Value& element : *array) expectSound(element, depth + 1);
  }
  if (const ValueMap* map = value.asMap()) {
    for (const ValueMapEntry& entry : *map) {
      expect(isUtf8(entry.key));
      expectSound(entry.value, depth + 1);
    }
  }
}

void take(sd_bus_message* call, const DbusInterface::Entry& entry, const Method& method) {
  RpcStrings texts;
  const DbusArguments read = readDbusArguments(call, entry, method, texts);
  if (read.problem) {
    expect(!read.problem->message.empty() && isUtf8(read.problem->message));
    expect(makeDbusAnswer(call, ResultType::kNone, read.problem, std::nullopt) != nullptr);
    return;
  }
  expect(!problemWith(method, read.arguments));
  for (const Argument& argument : read.arguments) {
    if (!argument) continue;
    constexpr std::size_t kArgumentDepth = 3;
    expectSound(*argument, kArgumentDepth);
    expect(makeDbusAnswer(call, ResultType::kAny, std::nullopt, argument) != nullptr);
  }
}

// The bus's end of a connection with one client.
class BusEnd {
 public:
  explicit BusEnd(const char* member) : entry_(*interface().find(member)) {
    std::array<int, 2> ends{};
    expect(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends.data()) == 0);
    writing_.reset(ends[1]);
    sd_bus* bus = nullptr;
    expect(sd_bus_new(&bus) >= 0);
    bus_.reset(bus);
    expect(sd_bus_set_fd(bus, ends[0], ends[0]) >= 0 && sd_bus_set_server(bus, 1, sd_id128_t{}) >= 0);
    expect(sd_bus_set_anonymous(bus, 1) >= 0 && sd_bus_add_filter(bus, nullptr, received, this) >= 0);
    expect(sd_bus_start(bus) >= 0);
    using namespace std::string_literals;
    write("\0AUTH ANONYMOUS\r\nBEGIN\r\n"s);
    while (sd_bus_is_ready(bus) == 0 && sd_bus_process(bus, nullptr) >= 0) {
    }
    expect(sd_bus_is_ready(bus) > 0);
  }

  void read(const std::string& message) {
    write(message);
    while (sd_bus_process(bus_.get(), nullptr) > 0) {
    }
  }

 private:
  static const DbusInterface& interface() {
    static const DbusInterface interface(requests::all());
    return interface;
  }
  static int received(sd_bus_message* call, void* data, sd_bus_error*) {
    const auto& bus = *static_cast<const BusEnd*>(data);
    take(call, bus.entry_, interface().methodOf(bus.entry_));
    return 1;
  }
  void write(const std::string& bytes) const {
    expect(::send(writing_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL) ==
           static_cast<ssize_t>(bytes.size()));
  }

  const DbusInterface::Entry& entry_;
  FileDescriptor writing_;
  Bus bus_;
};

void read(FuzzInput input) {
  const char* member = kMembers[input.below(kMembers.size())];
  const std::endian order = input.below(2) == 0 ? std::endian::little : std::endian::big;
  const std::string signature(input.shortText());
  BusEnd(member).read(
      dbusCallOf({"/a", member, "", ""}, signature, std::string(input.rest()), order, 1, true));
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({data, size});
  return 0;
}
