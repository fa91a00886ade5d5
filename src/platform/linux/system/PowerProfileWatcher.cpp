// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/PowerProfileWatcher.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <poll.h>
#include <string_view>
#include <sys/eventfd.h>
#include <systemd/sd-bus.h>
#include <unistd.h>

#include "platform/linux/dbus/SdBus.h"
#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {
namespace {

constexpr std::chrono::minutes kReconnectInterval{1};

// A bus name of the service; the interface has the same name.
struct ServiceName {
  const char* name;
  const char* path;
};

constexpr std::array<ServiceName, 2> kServices = {{
    {"org.freedesktop.UPower.PowerProfiles", "/org/freedesktop/UPower/PowerProfiles"},
    {"net.hadess.PowerProfiles", "/net/hadess/PowerProfiles"},
}};

// Waits for `other` or the timeout, and returns true. Returns false when `stop` becomes readable.
bool waitFor(int stop, const pollfd& other, std::chrono::milliseconds timeout) {
  std::array<pollfd, 2> waited = {pollfd{stop, POLLIN, 0}, other};
  poll(waited.data(), waited.size(), static_cast<int>(timeout.count()));
  return waited[0].revents == 0;
}

// One connection to the bus, from its opening to its loss.
class Watch {
 public:
  Watch(const std::string& address, PowerProfileWatcher::ChangeHandler& handler)
      : handler_(handler), bus_(openBus(address, problem_)) {
    for (std::size_t at = 0; at < kServices.size(); ++at) services_[at] = {this, at, false};
  }
  Watch(const Watch&) = delete;
  Watch& operator=(const Watch&) = delete;
  // Without a connection the profile is unknown, which counts as false.
  ~Watch() {
    for (Service& service : services_) note(service, false);
  }

  // Follows the profile. Returns true when the connection is lost, and false when `stop` becomes readable.
  bool follow(int stop) {
    if (bus_ == nullptr || !subscribe()) return true;
    for (;;) {
      const int processed = sd_bus_process(bus_.get(), nullptr);
      if (processed < 0) return true;
      if (processed > 0) continue;
      const int events = sd_bus_get_events(bus_.get());
      if (events < 0) return true;
      const pollfd busEvents{sd_bus_get_fd(bus_.get()), static_cast<short>(events), 0};
      if (!waitFor(stop, busEvents, timeToNextBusWork(bus_.get()))) return false;
    }
  }

 private:
  struct Service {
    Watch* watch = nullptr;
    std::size_t place = 0;
    bool isPowerSaver = false;
  };

  bool subscribe() {
    for (Service& service : services_) {
      const ServiceName& name = kServices[service.place];
      const std::string owner =
          std::string(
              "type='signal',sender='org.freedesktop.DBus',interface='org.freedesktop.DBus',"
              "member='NameOwnerChanged',arg0='") +
          name.name + "'";
      const auto ask = [](sd_bus_message*, void* data, sd_bus_error*) {
        static_cast<Service*>(data)->watch->ask(*static_cast<Service*>(data));
        return 0;
      };
      // The signals are subscribed to before the profile is asked for, so that no change is missed. After a
      // signal the profile is asked for again, because the signal need not contain the new value.
      if (sd_bus_add_match_async(bus_.get(), nullptr, owner.c_str(), ask, nullptr, &service) < 0 ||
          sd_bus_match_signal_async(bus_.get(), nullptr, name.name, name.path,
                                    "org.freedesktop.DBus.Properties", "PropertiesChanged", ask, nullptr,
                                    &service) < 0) {
        return false;
      }
      ask(nullptr, &service, nullptr);
    }
    return true;
  }

  void ask(Service& service) {
    const ServiceName& name = kServices[service.place];
    sd_bus_message* made = nullptr;
    if (sd_bus_message_new_method_call(bus_.get(), &made, name.name, name.path,
                                       "org.freedesktop.DBus.Properties", "Get") < 0) {
      return;
    }
    const BusMessage question(made);
    sd_bus_message_set_auto_start(question.get(), 0);
    if (sd_bus_message_append(question.get(), "ss", name.name, "ActiveProfile") < 0) return;
    const auto answered = [](sd_bus_message* answer, void* data, sd_bus_error*) {
      const char* profile = nullptr;
      // An error means that the service is not running.
      const bool isKnown = sd_bus_message_is_method_error(answer, nullptr) == 0 &&
                           sd_bus_message_read(answer, "v", "s", &profile) >= 0 && profile != nullptr;
      auto& asked = *static_cast<Service*>(data);
      asked.watch->note(asked, isKnown && std::string_view(profile) == "power-saver");
      return 0;
    };
    sd_bus_call_async(bus_.get(), nullptr, question.get(), answered, &service, 0);
  }

  bool isPowerSaver() const {
    return std::any_of(services_.begin(), services_.end(), [](const Service& s) { return s.isPowerSaver; });
  }

  void note(Service& service, bool isPowerSaverNow) {
    const bool before = isPowerSaver();
    service.isPowerSaver = isPowerSaverNow;
    if (isPowerSaver() != before) handler_(isPowerSaver());
  }

  PowerProfileWatcher::ChangeHandler& handler_;
  std::array<Service, kServices.size()> services_;
  std::string problem_;  // not used, because the bus is opened again after a problem
  Bus bus_;              // last: its callbacks use services_
};

void watch(int stop, const std::string& address, PowerProfileWatcher::ChangeHandler& handler) {
  nameThisThread("power-profile");
  const pollfd nothing{-1, 0, 0};
  for (;;) {
    if (!Watch(address, handler).follow(stop)) return;
    if (!waitFor(stop, nothing, kReconnectInterval)) return;
  }
}

}  // namespace

PowerProfileWatcher::PowerProfileWatcher(ChangeHandler handler, std::string busAddress)
    : stop_(eventfd(0, EFD_CLOEXEC)) {
  if (!stop_) return;  // the thread could not be ended
  thread_ = std::thread([stop = stop_.get(), changed = std::move(handler),
                         address = std::move(busAddress)]() mutable { watch(stop, address, changed); });
}

PowerProfileWatcher::~PowerProfileWatcher() {
  if (!thread_.joinable()) return;
  eventfd_write(stop_.get(), 1);
  thread_.join();
}

}  // namespace tonewerk
