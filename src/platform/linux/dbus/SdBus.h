// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>
#include <string>

struct sd_bus;
struct sd_bus_message;
struct sd_bus_slot;

namespace tonewerk {

// Own the D-Bus library's objects. The objects of one bus connection may not be used or destroyed on two
// threads at once.
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

// Starts to connect to the bus at this D-Bus address; an empty address means the system's bus. Does not wait
// for the connection: if the bus does not answer, processing it fails later. Null, with the reason in
// `problem`, when it cannot start.
[[nodiscard]] Bus openBus(const std::string& address, std::string& problem);

// How long the bus needs no processing, unless its descriptor becomes ready earlier. At most a day.
std::chrono::milliseconds timeToNextBusWork(sd_bus* bus);

}  // namespace tonewerk
