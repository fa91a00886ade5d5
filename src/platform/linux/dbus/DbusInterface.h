// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "protocol/RequestSet.h"

struct sd_bus_vtable;

namespace tonewerk {

// An exported interface as D-Bus shows it: its methods in upper camel case with the signatures of their
// parameters and results. Methods for the daemon's owner alone are not among them.
//
//   kInt64 x   kUInt32 u   kUInt16 q   kMap a{sv}   kInt64ListOrNone ax (an empty one is none)
//   kBoolean b   kUInt16 q   kMap a{sv}   kInt64List ax   kAny v   kNone and kNever nothing
class DbusInterface {
 public:
  struct Entry {
    std::string member;     // its name on the bus
    std::size_t place = 0;  // among the methods of the exported interface
    std::string signature;
    std::string result;
    std::string names;  // of the parameters and the result, each with a zero byte at its end
  };

  // `methods` outlives it.
  explicit DbusInterface(const RequestSet& methods);
  DbusInterface(const DbusInterface&) = delete;
  DbusInterface& operator=(const DbusInterface&) = delete;
  ~DbusInterface();

  // Null when there is none.
  const Entry* find(std::string_view member) const;
  const Method& methodOf(const Entry& entry) const { return methods_.methods[entry.place]; }

  // For introspection, as long as this lives. Calls are not taken by it: what it names as their handler takes
  // none.
  const sd_bus_vtable* vtable() const { return vtable_.data(); }

 private:
  const RequestSet& methods_;
  std::vector<Entry> entries_;
  std::vector<sd_bus_vtable> vtable_;
};

std::string_view dbusSignatureOf(ParameterType type);
std::string_view dbusSignatureOf(ResultType type);

}  // namespace tonewerk
