// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/SdBus.h"

#include <algorithm>
#include <cstdint>
#include <system_error>
#include <systemd/sd-bus.h>

namespace tonewerk {
namespace {

constexpr std::chrono::microseconds kLongestWait = std::chrono::minutes(1);

int startAt(sd_bus* bus, const std::string& address) {
  if (const int result = sd_bus_set_address(bus, address.c_str()); result < 0) return result;
  if (const int result = sd_bus_set_bus_client(bus, 1); result < 0) return result;
  return sd_bus_start(bus);
}

int open(const std::string& address, Bus& opened) {
  sd_bus* bus = nullptr;
  if (address.empty()) {
    const int result = sd_bus_open_system(&bus);
    opened.reset(bus);
    return result;
  }
  if (const int result = sd_bus_new(&bus); result < 0) return result;
  opened.reset(bus);
  return startAt(bus, address);
}

}  // namespace

void BusCloser::operator()(sd_bus* bus) const { sd_bus_close_unref(bus); }
void BusMessageReleaser::operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
void BusSlotReleaser::operator()(sd_bus_slot* slot) const { sd_bus_slot_unref(slot); }

Bus openBus(const std::string& address, std::string& problem) {
  Bus bus;
  const int result = open(address, bus);
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
