// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/linux/dbus/SdBus.h"
#include "protocol/RequestSet.h"

namespace tonewerk {

// An error in D-Bus's form.
struct DbusError {
  std::string name;
  std::string message;
};

// Errors of the messaging layer get D-Bus's standard names, any other error "<domain>.Error.Code<code>".
DbusError dbusErrorOf(const ReplyError& error);

// Makes the answer to `call`, ready to be sent. Null when the library cannot make it. `result` is none for
// kNone. Integers become x, unsigned ones t, arrays av, maps a{sv} and dates (d). A text is cut at a zero
// byte, which D-Bus cannot carry.
[[nodiscard]] BusMessage makeDbusAnswer(sd_bus_message* call, ResultType type,
                                        const std::optional<ReplyError>& error,
                                        const std::optional<Value>& result);

}  // namespace tonewerk
