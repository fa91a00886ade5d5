// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>

#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "protocol/RequestSet.h"

struct sd_bus_message;

namespace tonewerk {

// A call's arguments, or the problem with them in a text that names the argument.
struct DbusArguments {
  Arguments arguments;
  std::size_t wireBytes = 0;  // approximate; of what has been read
  std::optional<ReplyError> problem;
};

// Reads a call's arguments. A variant may hold booleans, integers of all widths, doubles, texts, object paths
// and signatures (as texts), dates (a struct of one double), arrays, and dictionaries with text keys. It may
// not hold other structs, file descriptors, or directly another variant. Of equal keys the last one counts.
//
// The limits are those of a frame on the socket: kMaxFrameBytes and kMaxFrameDepth. Beyond them the problem
// has the code kOverLimit.
//
// `texts` are the caches of the bus's thread.
[[nodiscard]] DbusArguments readDbusArguments(sd_bus_message* call, const DbusInterface::Entry& entry,
                                              const Method& method, RpcStrings& texts);

}  // namespace tonewerk
