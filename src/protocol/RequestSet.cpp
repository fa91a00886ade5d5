// SPDX-License-Identifier: Apache-2.0
#include "protocol/RequestSet.h"

#include <limits>

namespace tonewerk {
namespace {

constexpr std::uint64_t kMaxInt64 = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());

// Returns whether `value` is an integer, signed or unsigned, in [minimum, maximum].
bool isIntegerWithin(const Value& value, std::int64_t minimum, std::uint64_t maximum) {
  if (const std::int64_t* integer = value.asInteger()) {
    return *integer >= minimum && (*integer < 0 || static_cast<std::uint64_t>(*integer) <= maximum);
  }
  const std::uint64_t* number = value.asUnsigned();
  return number != nullptr && *number <= maximum;
}

bool isInt64(const Value& value) {
  return isIntegerWithin(value, std::numeric_limits<std::int64_t>::min(), kMaxInt64);
}

bool isInt64List(const Value& value) {
  const ValueArray* list = value.asArray();
  if (list == nullptr) return false;
  for (const Value& element : *list) {
    if (!isInt64(element)) return false;
  }
  return true;
}

bool suits(ParameterType type, const Argument& argument) {
  if (!argument) return type == ParameterType::kInt64ListOrNone;
  switch (type) {
    case ParameterType::kInt64:
      return isInt64(*argument);
    case ParameterType::kUInt32:
      return isIntegerWithin(*argument, 0, std::numeric_limits<std::uint32_t>::max());
    case ParameterType::kUInt16:
      return isIntegerWithin(*argument, 0, std::numeric_limits<std::uint16_t>::max());
    case ParameterType::kMap:
      return argument->asMap() != nullptr;
    case ParameterType::kInt64ListOrNone:
      return isInt64List(*argument);
  }
  return false;
}

std::string_view descriptionOf(ParameterType type) {
  switch (type) {
    case ParameterType::kInt64:
      return "a signed 64-bit integer";
    case ParameterType::kUInt32:
      return "an integer from 0 to 4294967295";
    case ParameterType::kUInt16:
      return "an integer from 0 to 65535";
    case ParameterType::kMap:
      return "a map";
    case ParameterType::kInt64ListOrNone:
      return "a list of signed 64-bit integers or nil";
  }
  return "";
}

}  // namespace

std::optional<std::size_t> RequestSet::find(std::string_view name) const {
  for (std::size_t at = 0; at < methods.size(); ++at) {
    if (methods[at].name == name) return at;
  }
  return std::nullopt;
}

std::optional<std::string> problemWith(const Method& method, const Arguments& arguments) {
  const std::size_t wanted = method.parameters.size();
  if (arguments.size() != wanted) {
    return std::string(method.name) + " takes " + std::to_string(wanted) + " arguments, not " +
           std::to_string(arguments.size());
  }
  for (std::size_t at = 0; at < wanted; ++at) {
    const Parameter& parameter = method.parameters[at];
    if (suits(parameter.type, arguments[at])) continue;
    return std::string(method.name) + ": argument " + std::to_string(at + 1) + " (" +
           std::string(parameter.name) + ") must be " + std::string(descriptionOf(parameter.type));
  }
  return std::nullopt;
}

ReplyError messagingError(std::int64_t code, std::string message) {
  return ReplyError{std::string(kMessagingErrorDomain), code, std::move(message)};
}

std::optional<ReplyError> problemWithCaller(const Method& method, bool isTrusted) {
  if (!method.forTrusted || isTrusted) return std::nullopt;
  return messagingError(kNotPermitted,
                        "not permitted: " + std::string(method.name) + " is for trusted users");
}

}  // namespace tonewerk
