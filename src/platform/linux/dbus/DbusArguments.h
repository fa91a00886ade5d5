// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>

#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "protocol/RequestSet.h"

struct sd_bus_message;

namespace tonewerk {

// What a call brought, or what is wrong with it in words that name the argument.
struct DbusArguments {
  Arguments arguments;
  std::size_t wireBytes = 0;  // about; of what has been read
  std::optional<ReplyError> problem;
};

// Reads a call's arguments. What a variant may hold: booleans, integers of all widths, doubles, texts, object
// paths and signatures (as texts), dates (a struct of one double), arrays, dictionaries with text keys. Not:
// other structs, file descriptors, a variant that is nothing but another variant's content. A key given
// twice: the last wins.
//
// The bounds are those of a frame on the socket: so many bytes, so many arrays and maps inside each other.
// Past them the problem is "over a limit".
//
// `texts` are those the bus's thread shares.
[[nodiscard]] DbusArguments readDbusArguments(sd_bus_message* call, const DbusInterface::Entry& entry,
                                              const Method& method, RpcStrings& texts);

}  // namespace tonewerk
