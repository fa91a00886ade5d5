// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/SdBus.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <system_error>
#include <systemd/sd-bus.h>

namespace tonewerk {
namespace {

// An idle process wakes up at this interval for nothing. In milliseconds it fits into poll()'s int.
constexpr std::chrono::microseconds kLongestWait = std::chrono::hours(24);

// The same address as the library's default.
std::string systemBusAddress() {
  const char* address = ::secure_getenv("DBUS_SYSTEM_BUS_ADDRESS");
  return address == nullptr ? "unix:path=/run/dbus/system_bus_socket" : address;
}

// Does not accept file descriptors, so the bus refuses messages that contain some. Held messages could
// otherwise use up this process's descriptors.
int startAt(sd_bus* bus, const std::string& address) {
  if (const int result = sd_bus_set_address(bus, address.c_str()); result < 0) return result;
  if (const int result = sd_bus_set_bus_client(bus, 1); result < 0) return result;
  if (const int result = sd_bus_negotiate_fds(bus, 0); result < 0) return result;
  return sd_bus_start(bus);
}

}  // namespace

void BusCloser::operator()(sd_bus* bus) const { sd_bus_close_unref(bus); }
void BusMessageReleaser::operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
void BusSlotReleaser::operator()(sd_bus_slot* slot) const { sd_bus_slot_unref(slot); }

Bus openBus(const std::string& address, std::string& problem) {
  sd_bus* made = nullptr;
  int result = sd_bus_new(&made);
  Bus bus(made);
  if (result >= 0) result = startAt(made, address.empty() ? systemBusAddress() : address);
  if (result >= 0) return bus;
  problem = std::generic_category().message(-result);
  return nullptr;
}

std::chrono::milliseconds timeToNextBusWork(sd_bus* bus) {
  std::uint64_t until = 0;
  std::chrono::microseconds left = kLongestWait;
  if (sd_bus_get_timeout(bus, &until) >= 0 && until < static_cast<std::uint64_t>(INT64_MAX)) {
    const auto now = std::chrono::duration_cast<std::chrono::microseconds>(
        std::chrono::steady_clock::now().time_since_epoch());
    left =
        std::clamp(std::chrono::microseconds(until) - now, std::chrono::microseconds::zero(), kLongestWait);
  }
  return std::chrono::ceil<std::chrono::milliseconds>(left);
}

}  // namespace tonewerk
