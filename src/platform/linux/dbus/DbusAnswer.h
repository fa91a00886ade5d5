// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/linux/dbus/SdBus.h"
#include "protocol/RequestSet.h"

namespace tonewerk {

// An error as D-Bus knows them.
struct DbusError {
  std::string name;
  std::string message;
};

// The messaging layer's own have D-Bus's standard names; any other is "<domain>.Error.Code<code>".
DbusError dbusErrorOf(const ReplyError& error);

// The answer to `call`, ready to be sent; null when the library cannot make it. `result` is none for kNone.
// Integers are x, or t where they are unsigned; arrays av; maps a{sv}; dates (d); a text ends at a zero byte,
// which D-Bus cannot carry.
[[nodiscard]] BusMessage makeDbusAnswer(sd_bus_message* call, ResultType type,
                                        const std::optional<ReplyError>& error,
                                        const std::optional<Value>& result);

}  // namespace tonewerk
