// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusAnswer.h"

#include <cstdint>
#include <string_view>
#include <systemd/sd-bus.h>

namespace tonewerk {
namespace {

// The signature of a value's content in a variant.
const char* signatureOf(const Value& value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return "b";
    case Value::Kind::kInteger:
      return "x";
    case Value::Kind::kUnsigned:
      return "t";
    case Value::Kind::kDouble:
      return "d";
    case Value::Kind::kString:
      return "s";
    case Value::Kind::kDate:
      return "(d)";
    case Value::Kind::kArray:
      return "av";
    case Value::Kind::kMap:
      return "a{sv}";
  }
  return "";
}

// Appends values to a message. Each function returns false when the library refuses a value.
class Appender {
 public:
  explicit Appender(sd_bus_message* message) : message_(message) {}

  bool result(ResultType type, const std::optional<Value>& result) {
    if (!result) return true;
    switch (type) {
      case ResultType::kNone:
      case ResultType::kNever:
        return true;
      case ResultType::kBoolean:
        return boolean(result->boolean());
      case ResultType::kUInt16: {
        const auto number = static_cast<std::uint16_t>(result->integer());
        return basic(SD_BUS_TYPE_UINT16, &number);
      }
      case ResultType::kMap:
        return result->asMap() != nullptr && map(*result->asMap());
      case ResultType::kInt64List:
        return result->asArray() != nullptr && int64List(*result->asArray());
      case ResultType::kAny:
        return variant(*result);
    }
    return false;
  }

 private:
  bool basic(char kind, const void* value) { return sd_bus_message_append_basic(message_, kind, value) >= 0; }
  bool open(char kind, const char* contents) {
    return sd_bus_message_open_container(message_, kind, contents) >= 0;
  }
  bool close() { return sd_bus_message_close_container(message_) >= 0; }

  bool boolean(bool value) {
    const int number = value ? 1 : 0;
    return basic(SD_BUS_TYPE_BOOLEAN, &number);
  }
  bool text(std::string_view text) { return basic(SD_BUS_TYPE_STRING, std::string(text).c_str()); }

  bool variant(const Value& value) {
    return open(SD_BUS_TYPE_VARIANT, signatureOf(value)) && content(value) && close();
  }

  bool content(const Value& value) {
    switch (value.kind()) {
      case Value::Kind::kBoolean:
        return boolean(*value.asBoolean());
      case Value::Kind::kInteger:
        return basic(SD_BUS_TYPE_INT64, value.asInteger());
      case Value::Kind::kUnsigned:
        return basic(SD_BUS_TYPE_UINT64, value.asUnsigned());
      case Value::Kind::kDouble:
        return basic(SD_BUS_TYPE_DOUBLE, value.asDouble());
      case Value::Kind::kString:
        return text(*value.asString());
      case Value::Kind::kDate:
        return open(SD_BUS_TYPE_STRUCT, "d") && basic(SD_BUS_TYPE_DOUBLE, &value.asDate()->seconds) &&
               close();
      case Value::Kind::kArray:
        return array(*value.asArray());
      case Value::Kind::kMap:
        return map(*value.asMap());
    }
    return false;
  }

  bool array(const ValueArray& array) {
    bool isFine = open(SD_BUS_TYPE_ARRAY, "v");
    for (const Value& element : array) isFine = isFine && variant(element);
    return isFine && close();
  }

  bool map(const ValueMap& map) {
    bool isFine = open(SD_BUS_TYPE_ARRAY, "{sv}");
    for (const ValueMapEntry& entry : map) {
      isFine =
          isFine && open(SD_BUS_TYPE_DICT_ENTRY, "sv") && text(entry.key) && variant(entry.value) && close();
    }
    return isFine && close();
  }

  bool int64List(const ValueArray& list) {
    bool isFine = open(SD_BUS_TYPE_ARRAY, "x");
    for (const Value& element : list) {
      const std::int64_t number = element.integer();
      isFine = isFine && basic(SD_BUS_TYPE_INT64, &number);
    }
    return isFine && close();
  }

  sd_bus_message* const message_;
};

BusMessage makeError(sd_bus_message* call, const ReplyError& error) {
  const DbusError named = dbusErrorOf(error);
  const sd_bus_error given{named.name.c_str(), named.message.c_str(), 0};
  sd_bus_message* made = nullptr;
  sd_bus_message_new_method_error(call, &made, &given);
  return BusMessage(made);
}

std::string_view standardNameOf(std::int64_t code) {
  switch (code) {
    case kUnknownMethod:
      return SD_BUS_ERROR_UNKNOWN_METHOD;
    case kInvalidArguments:
      return SD_BUS_ERROR_INVALID_ARGS;
    case kOverLimit:
      return SD_BUS_ERROR_LIMITS_EXCEEDED;
    case kNotPermitted:
      return SD_BUS_ERROR_ACCESS_DENIED;
    default:
      return SD_BUS_ERROR_FAILED;
  }
}

std::string nameOf(const ReplyError& error) {
  if (error.domain == kMessagingErrorDomain) return std::string(standardNameOf(error.code));
  std::string name = error.domain + ".Error.Code" + std::to_string(error.code);
  return sd_bus_interface_name_is_valid(name.c_str()) > 0 ? name : SD_BUS_ERROR_FAILED;
}

}  // namespace

DbusError dbusErrorOf(const ReplyError& error) {
  std::string message = error.message;
  if (message.empty()) message = error.domain + ", code " + std::to_string(error.code);
  return {nameOf(error), std::move(message)};
}

BusMessage makeDbusAnswer(sd_bus_message* call, ResultType type, const std::optional<ReplyError>& error,
                          const std::optional<Value>& result) {
  if (error) return makeError(call, *error);
  sd_bus_message* made = nullptr;
  if (sd_bus_message_new_method_return(call, &made) < 0) return nullptr;
  BusMessage answer(made);
  if (Appender(made).result(type, result)) return answer;
  return makeError(call, {std::string(kMessagingErrorDomain), 0, "the answer does not fit into a message"});
}

}  // namespace tonewerk
