// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusArguments.h"

#include <cerrno>
#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <systemd/sd-bus.h>
#include <utility>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {
namespace {

// The depth of an argument on the socket: inside a frame and its list of arguments.
constexpr std::size_t kArgumentDepth = 3;
// Bytes that a text, an array or a map takes in addition to its content.
constexpr std::size_t kHeaderBytes = 4;

// The next complete type of a message.
struct NextType {
  char kind = '\0';  // zero at the end
  std::string contents;

  std::string text() const {
    if (kind == SD_BUS_TYPE_ARRAY) return "a" + contents;
    if (kind == SD_BUS_TYPE_STRUCT) return "(" + contents + ")";
    return {kind};
  }
};

// Removes one type from the front of `types`. If the type is not allowed, says why, as a text that follows
// "argument 1 (message) "; else null. Does not check what a variant holds.
const char* problemOfType(std::string_view& types) {
  const char kind = types.empty() ? '\0' : types.front();
  types.remove_prefix(types.empty() ? 0 : 1);
  switch (kind) {
    case SD_BUS_TYPE_ARRAY:
      if (!types.starts_with('{')) return problemOfType(types);
      if (!types.starts_with("{s")) return "has a key that is not text";
      types.remove_prefix(2);
      if (const char* problem = problemOfType(types)) return problem;
      types.remove_prefix(types.empty() ? 0 : 1);  // the brace
      return nullptr;
    case SD_BUS_TYPE_STRUCT_BEGIN:
      if (!types.starts_with("d)")) return "holds a struct other than a date";
      types.remove_prefix(2);
      return nullptr;
    case SD_BUS_TYPE_UNIX_FD:
      return "holds a file descriptor";
    default:
      return nullptr;
  }
}

// Why the library refuses a text of that kind, as a text that follows "argument 1 (message) ". The library
// accepts the same strings as isText(). Its error does not say whether a text is malformed or cut off.
const char* problemOfText(char kind) {
  switch (kind) {
    case SD_BUS_TYPE_OBJECT_PATH:
      return "holds a malformed object path";
    case SD_BUS_TYPE_SIGNATURE:
      return "holds a malformed signature";
    default:
      return "holds text that is not UTF-8 or has a noncharacter";
  }
}

// Reads values until the first one that is wrong. problem() then says what is wrong, as a text that follows
// "argument 1 (message) ", and all values read after it are meaningless.
class ValueReader {
 public:
  ValueReader(sd_bus_message* message, RpcStrings& texts) : message_(message), texts_(texts) {}

  const char* problem() const { return problem_; }
  bool isOverLimit() const { return isOverLimit_; }
  std::size_t bytes() const { return bytes_; }

  bool next(NextType& type) {
    const char* contents = nullptr;
    const int result = sd_bus_message_peek_type(message_, &type.kind, &contents);
    if (result < 0) return malformed();
    if (result == 0) type.kind = '\0';
    type.contents = contents == nullptr ? "" : contents;
    return true;
  }

  Argument argument(ParameterType type) {
    switch (type) {
      case ParameterType::kInt64:
        return Value(basic<std::int64_t>(SD_BUS_TYPE_INT64));
      case ParameterType::kUInt32:
        return Value(std::int64_t{basic<std::uint32_t>(SD_BUS_TYPE_UINT32)});
      case ParameterType::kUInt16:
        return Value(std::int64_t{basic<std::uint16_t>(SD_BUS_TYPE_UINT16)});
      case ParameterType::kMap:
        return map("{sv}", kArgumentDepth);
      case ParameterType::kInt64ListOrNone:
        return int64List();
    }
    return std::nullopt;
  }

 private:
  bool fail(const char* what, bool isOverLimit = false) {
    if (problem_ == nullptr) {
      problem_ = what;
      isOverLimit_ = isOverLimit;
    }
    return false;
  }
  bool malformed() { return fail("is malformed"); }
  bool hasFailed() const { return problem_ != nullptr; }

  bool count(std::size_t bytes) {
    bytes_ += bytes;
    return bytes_ <= kMaxFrameBytes || fail("makes the message longer than 1048576 bytes", true);
  }

  template <typename T>
  T basic(char kind) {
    T value{};
    if (!count(sizeof(T))) return value;
    if (sd_bus_message_read_basic(message_, kind, &value) <= 0) malformed();
    return value;
  }

  std::string_view text(char kind) {
    const char* text = nullptr;
    const int result = sd_bus_message_read_basic(message_, kind, &text);
    if (result <= 0 || text == nullptr) {
      result == -EBADMSG ? fail(problemOfText(kind)) : malformed();
      return {};
    }
    const std::string_view view(text);
    count(kHeaderBytes + view.size() + 1);
    return view;
  }

  SharedString shared(StringInterner& cache, std::string_view text) {
    std::optional<SharedString> found = cache.find(text);
    if (!found) malformed();
    return found ? std::move(*found) : SharedString();
  }

  // Checks the type and not only the values, because there may be none.
  bool isAllowed(std::string_view types) {
    if (types.starts_with(SD_BUS_TYPE_VARIANT)) return fail("holds a variant in a variant");
    const char* problem = problemOfType(types);
    return problem == nullptr || fail(problem);
  }

  bool enter(char kind, const std::string& contents) {
    return sd_bus_message_enter_container(message_, kind, contents.c_str()) > 0 || malformed();
  }
  bool leave() { return !hasFailed() && (sd_bus_message_exit_container(message_) >= 0 || malformed()); }
  bool isWithinDepth(std::size_t depth) {
    return depth <= kMaxFrameDepth || fail("is nested deeper than 32", true);
  }
  // True while the array that was entered last has more elements.
  bool hasMore() {
    if (hasFailed()) return false;
    const int atEnd = sd_bus_message_at_end(message_, 0);
    if (atEnd < 0) return malformed();
    return atEnd == 0;
  }

  // `depth` is the depth that the value has if it is an array or a map.
  Value value(std::size_t depth) {
    NextType type;
    if (!next(type)) return {};
    if (type.kind != SD_BUS_TYPE_VARIANT) return plain(type, depth);
    if (!count(kHeaderBytes) || !isAllowed(type.contents) || !enter(SD_BUS_TYPE_VARIANT, type.contents))
      return {};
    NextType content;
    if (!next(content)) return {};
    Value inner = plain(content, depth);
    leave();
    return inner;
  }

  Value plain(const NextType& type, std::size_t depth) {
    switch (type.kind) {
      case SD_BUS_TYPE_BOOLEAN:
        return Value(basic<int>(SD_BUS_TYPE_BOOLEAN) != 0);
      case SD_BUS_TYPE_BYTE:
        return Value(std::int64_t{basic<std::uint8_t>(SD_BUS_TYPE_BYTE)});
      case SD_BUS_TYPE_INT16:
        return Value(std::int64_t{basic<std::int16_t>(SD_BUS_TYPE_INT16)});
      case SD_BUS_TYPE_UINT16:
        return Value(std::int64_t{basic<std::uint16_t>(SD_BUS_TYPE_UINT16)});
      case SD_BUS_TYPE_INT32:
        return Value(std::int64_t{basic<std::int32_t>(SD_BUS_TYPE_INT32)});
      case SD_BUS_TYPE_UINT32:
        return Value(std::int64_t{basic<std::uint32_t>(SD_BUS_TYPE_UINT32)});
      case SD_BUS_TYPE_INT64:
        return Value(basic<std::int64_t>(SD_BUS_TYPE_INT64));
      case SD_BUS_TYPE_UINT64:
        return unsignedInteger(basic<std::uint64_t>(SD_BUS_TYPE_UINT64));
      case SD_BUS_TYPE_DOUBLE:
        return Value(basic<double>(SD_BUS_TYPE_DOUBLE));
      case SD_BUS_TYPE_STRING:
      case SD_BUS_TYPE_OBJECT_PATH:
      case SD_BUS_TYPE_SIGNATURE:
        return Value(shared(texts_.values, text(type.kind)));
      case SD_BUS_TYPE_STRUCT:
        return date(type.contents);
      case SD_BUS_TYPE_ARRAY:
        if (type.contents.starts_with('{')) return map(type.contents, depth);
        return array(type.contents, depth);
      default:
        malformed();
        return {};
    }
  }

  // Unsigned only when the value does not fit into a signed integer, as on the socket.
  static Value unsignedInteger(std::uint64_t number) {
    constexpr auto kMaxSigned = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
    return number > kMaxSigned ? Value(number) : Value(static_cast<std::int64_t>(number));
  }

  Value date(const std::string& contents) {
    if (!enter(SD_BUS_TYPE_STRUCT, contents)) return {};
    const auto seconds = basic<double>(SD_BUS_TYPE_DOUBLE);
    leave();
    if (!std::isfinite(seconds)) fail("holds a malformed date");
    return Value(Date{seconds});
  }

  // `contents` is the dictionary's entry type in braces.
  Value map(const std::string& contents, std::size_t depth) {
    ValueMap map;
    if (!isWithinDepth(depth) || !count(kHeaderBytes) || !enter(SD_BUS_TYPE_ARRAY, contents)) return {};
    const std::string entry = contents.substr(1, contents.size() - 2);
    while (hasMore() && enter(SD_BUS_TYPE_DICT_ENTRY, entry)) {
      SharedString key = shared(texts_.keys, text(SD_BUS_TYPE_STRING));
      if (hasFailed()) break;
      map.set(std::move(key), value(depth + 1));
      leave();
    }
    leave();
    return Value(std::move(map));
  }

  Value array(const std::string& contents, std::size_t depth) {
    if (!isWithinDepth(depth) || !count(kHeaderBytes) || !enter(SD_BUS_TYPE_ARRAY, contents)) return {};
    std::vector<Value> values;
    while (hasMore()) values.push_back(value(depth + 1));
    leave();
    return Value(ValueArray(std::move(values)));
  }

  // None when the list is empty, because D-Bus has no nil. Reads each element by itself, because the library
  // reads an array in one piece only if it is in this machine's byte order.
  Argument int64List() {
    if (!count(kHeaderBytes) || !enter(SD_BUS_TYPE_ARRAY, "x")) return std::nullopt;
    std::vector<Value> values;
    while (hasMore()) values.emplace_back(basic<std::int64_t>(SD_BUS_TYPE_INT64));
    if (!leave() || values.empty()) return std::nullopt;
    return Value(ValueArray(std::move(values)));
  }

  sd_bus_message* const message_;
  RpcStrings& texts_;
  std::size_t bytes_ = 0;
  const char* problem_ = nullptr;
  bool isOverLimit_ = false;
};

std::string argumentText(const DbusInterface::Entry& entry, const Method& method, std::size_t place) {
  return entry.member + ": argument " + std::to_string(place + 1) + " (" +
         std::string(method.parameters[place].name) + ") ";
}

std::string countText(const DbusInterface::Entry& entry, const Method& method) {
  return entry.member + " takes " + std::to_string(method.parameters.size()) + " arguments (" +
         entry.signature + "), not ";
}

}  // namespace

DbusArguments readDbusArguments(sd_bus_message* call, const DbusInterface::Entry& entry, const Method& method,
                                RpcStrings& texts) {
  ValueReader reader(call, texts);
  DbusArguments read;
  const auto refuse = [&read](std::int64_t code, std::string message) {
    read.problem = messagingError(code, std::move(message));
  };
  for (std::size_t place = 0; place < method.parameters.size() && !read.problem; ++place) {
    const ParameterType wanted = method.parameters[place].type;
    NextType given;
    if (reader.next(given) && given.kind == '\0') {
      refuse(kInvalidArguments, countText(entry, method) + std::to_string(place));
    } else if (reader.problem() == nullptr && given.text() != dbusSignatureOf(wanted)) {
      refuse(kInvalidArguments, argumentText(entry, method, place) + "must be of the type " +
                                    std::string(dbusSignatureOf(wanted)) + ", not " + given.text());
    } else if (reader.problem() == nullptr) {
      read.arguments.push_back(reader.argument(wanted));
    }
    if (reader.problem() != nullptr) {
      refuse(reader.isOverLimit() ? kOverLimit : kInvalidArguments,
             argumentText(entry, method, place) + reader.problem());
    }
  }
  NextType extra;
  if (!read.problem && (!reader.next(extra) || extra.kind != '\0')) {
    refuse(kInvalidArguments, countText(entry, method) + "more");
  }
  read.wireBytes = reader.bytes();
  return read;
}

}  // namespace tonewerk
