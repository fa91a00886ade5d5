// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusInterface.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <systemd/sd-bus.h>

namespace tonewerk {
namespace {

std::string memberOf(std::string_view method) {
  std::string member(method);
  if (!member.empty() && member[0] >= 'a' && member[0] <= 'z')
    member[0] = static_cast<char>(member[0] - 'a' + 'A');
  return member;
}

DbusInterface::Entry entryOf(const Method& method, std::size_t index) {
  DbusInterface::Entry entry;
  entry.member = memberOf(method.name);
  entry.index = index;
  entry.result = dbusSignatureOf(method.result.type);
  for (const Parameter& parameter : method.parameters) {
    entry.signature += dbusSignatureOf(parameter.type);
    entry.names += parameter.name;
    entry.names += '\0';
  }
  if (!entry.result.empty()) {
    entry.names += method.result.name;
    entry.names += '\0';
  }
  return entry;
}

// Never called for a real call, because the object's handler takes calls before the library reads the table.
int refuse(sd_bus_message*, void*, sd_bus_error*) { return -EINVAL; }

// Any user may call: the bus's policy decides who may send.
constexpr std::uint64_t kAnswered = SD_BUS_VTABLE_UNPRIVILEGED;
constexpr std::uint64_t kUnanswered = SD_BUS_VTABLE_UNPRIVILEGED | SD_BUS_VTABLE_METHOD_NO_REPLY;

sd_bus_vtable rowOf(const DbusInterface::Entry& entry, bool isAnswered) {
  return SD_BUS_METHOD_WITH_NAMES(entry.member.c_str(), entry.signature.c_str(), entry.names.c_str(),
                                  entry.result.c_str(), , refuse, (isAnswered ? kAnswered : kUnanswered));
}

}  // namespace

std::string_view dbusSignatureOf(ParameterType type) {
  switch (type) {
    case ParameterType::kInt64:
      return "x";
    case ParameterType::kUInt32:
      return "u";
    case ParameterType::kUInt16:
      return "q";
    case ParameterType::kMap:
      return "a{sv}";
    case ParameterType::kInt64ListOrNone:
      return "ax";
  }
  return "";
}

std::string_view dbusSignatureOf(ResultType type) {
  switch (type) {
    case ResultType::kBoolean:
      return "b";
    case ResultType::kUInt16:
      return "q";
    case ResultType::kMap:
      return "a{sv}";
    case ResultType::kInt64List:
      return "ax";
    case ResultType::kAny:
      return "v";
    case ResultType::kNone:
    case ResultType::kNever:
      return "";
  }
  return "";
}

DbusInterface::DbusInterface(const RequestSet& methods) : methods_(methods) {
  entries_.reserve(methods.methods.size());
  for (std::size_t index = 0; index < methods.methods.size(); ++index) {
    const Method& method = methods.methods[index];
    if (!method.isForSocketOnly) entries_.push_back(entryOf(method, index));
  }
  vtable_.push_back(SD_BUS_VTABLE_START(0));
  for (const Entry& entry : entries_) {
    vtable_.push_back(rowOf(entry, methodOf(entry).result.type != ResultType::kNever));
  }
  vtable_.push_back(SD_BUS_VTABLE_END);
}

DbusInterface::~DbusInterface() = default;

const DbusInterface::Entry* DbusInterface::find(std::string_view member) const {
  const auto found = std::find_if(entries_.begin(), entries_.end(),
                                  [&](const Entry& entry) { return entry.member == member; });
  return found == entries_.end() ? nullptr : &*found;
}

}  // namespace tonewerk
