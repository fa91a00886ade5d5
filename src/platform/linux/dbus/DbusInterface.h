// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "protocol/RequestSet.h"

struct sd_bus_vtable;

namespace tonewerk {

// Describes a request set for D-Bus: its methods in upper camel case, with the signatures of their
// parameters and results. It leaves out the methods that are for the socket only.
//
//   kInt64 x   kUInt32 u   kUInt16 q   kMap a{sv}   kInt64ListOrNone ax (an empty one is none)
//   kBoolean b   kUInt16 q   kMap a{sv}   kInt64List ax   kAny v   kNone and kNever nothing
class DbusInterface {
 public:
  struct Entry {
    std::string member;     // its name on the bus
    std::size_t index = 0;  // in the methods of the request set
    std::string signature;
    std::string result;
    std::string names;  // of the parameters and the result, each with a zero byte at its end
  };

  // `methods` outlives the interface.
  explicit DbusInterface(const RequestSet& methods);
  DbusInterface(const DbusInterface&) = delete;
  DbusInterface& operator=(const DbusInterface&) = delete;
  ~DbusInterface();

  // Null when the interface has no such member.
  const Entry* find(std::string_view member) const;
  const Method& methodOf(const Entry& entry) const { return methodAt(entry.index); }
  const Method& methodAt(std::size_t index) const { return methods_.methods[index]; }

  // For introspection. Valid as long as this object. The handlers in it refuse every call, so calls need
  // another handler.
  const sd_bus_vtable* vtable() const { return vtable_.data(); }

 private:
  const RequestSet& methods_;
  std::vector<Entry> entries_;
  std::vector<sd_bus_vtable> vtable_;
};

std::string_view dbusSignatureOf(ParameterType type);
std::string_view dbusSignatureOf(ResultType type);

}  // namespace tonewerk
