// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>
#include <string>

struct sd_bus;
struct sd_bus_message;
struct sd_bus_slot;

namespace tonewerk {

// Owners of the D-Bus library's objects. Neither they nor what hangs on one bus connection may be used, or
// let go, on two threads at once.
struct BusCloser {
  void operator()(sd_bus* bus) const;
};
struct BusMessageReleaser {
  void operator()(sd_bus_message* message) const;
};
struct BusSlotReleaser {
  void operator()(sd_bus_slot* slot) const;
};
using Bus = std::unique_ptr<sd_bus, BusCloser>;
using BusMessage = std::unique_ptr<sd_bus_message, BusMessageReleaser>;
using BusSlot = std::unique_ptr<sd_bus_slot, BusSlotReleaser>;

// Begins to connect to the bus at this D-Bus address, the system's bus when it is empty. Does not wait for
// it: that nobody answers shows when the bus is processed. Null, and why in `problem`, when it cannot even
// begin.
[[nodiscard]] Bus openBus(const std::string& address, std::string& problem);

// How long the bus can be left alone, unless its descriptor becomes ready before: at most a minute.
std::chrono::milliseconds timeToNextBusWork(sd_bus* bus);

}  // namespace tonewerk
